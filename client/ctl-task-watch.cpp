#include <json/value.h>
#include <unistd.h>

#include <chrono>
#include <ctime>
#include <iostream>
#include <map>
#include <optional>
#include <thread>

#include "client/command.h"
#include "client/ctl-task.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/json-output.h"
#include "client/run-watcher.h"
#include "client/task-text.h"
#include "client/text.h"

namespace {

constexpr auto LOOK_EVERY = std::chrono::milliseconds(500);

std::string Count(uint64_t files) {
    return std::to_string(files) + (files == 1 ? " file" : " files");
}

std::string ProgressText(const TaskLook& look) {
    if (!look.has_progress) return "";
    std::string text = Count(look.files) + ", " + SizeText(look.bytes);
    if (look.is_active) text += ", " + SizeText(look.bytes_per_second) + "/s";
    return text + (look.is_active ? ", " : " in ") + DurationText(look.seconds);
}

Json::Value LookJson(const TaskLook& look) {
    Json::Value json;
    json["task_id"] = static_cast<Json::UInt64>(look.task["id"].AsUInt64());
    json["task_name"] = JsonText(look.task["task_name"].StringView());
    json["task_status"] = JsonText(look.task["task_status"].StringView());
    json["copy_file_path"] = JsonText(look.task["copy_file_path"].StringView());
    json["files"] = static_cast<Json::UInt64>(look.files);
    json["bytes"] = static_cast<Json::UInt64>(look.bytes);
    json["bytes_per_second"] = static_cast<Json::UInt64>(look.bytes_per_second);
    json["seconds"] = static_cast<Json::UInt64>(look.seconds);
    return json;
}

// Draws each look over the one before.
class Screen {
public:
    explicit Screen(const Terminal& terminal) : m_terminal(terminal) {}

    void Show(const std::vector<TaskLook>& looks) {
        std::string text;
        size_t lines = 0;
        const auto line = [&](const std::string& content) {
            text += "\033[2K" + content + '\n';
            ++lines;
        };
        const size_t columns = m_terminal.Columns() - 1;
        for (const TaskLook& look : looks) {
            const Table::Cell status = StatusCell(look.task);
            const std::string label = Shortened(TaskLabel(look.task), columns / 3);
            // A line that wraps would be counted as one.
            const size_t taken = DisplayWidth(label) + DisplayWidth(status.text) + 4;
            line(label + "  " + m_terminal.Paint(status.colour, status.text) + "  " +
                 Shortened(ProgressText(look), columns > taken ? columns - taken : 0));
            line("  " +
                 Shortened(Printable(look.task["copy_file_path"].StringView()), columns - 2));
        }
        if (looks.empty()) line("No task runs.");
        // What the last look needed more is wiped.
        const std::string up = m_lines == 0 ? "" : "\033[" + std::to_string(m_lines) + "A";
        std::cout << up << text << "\033[J" << std::flush;
        m_lines = lines;
    }

private:
    const Terminal& m_terminal;
    size_t m_lines = 0;
};

// Writes a line for each change.
class Lines {
public:
    explicit Lines(bool as_json) : m_as_json(as_json) {}

    void Show(const std::vector<TaskLook>& looks) {
        for (const TaskLook& look : looks) {
            const std::string status = look.task["task_status"].AsString();
            std::string change = status + '\n' + look.task["copy_file_path"].AsString() + '\n' +
                                 std::to_string(look.files);
            std::string& known = m_known[look.task["id"].AsUInt64()];
            if (known == change) continue;
            known = std::move(change);
            if (m_as_json) {
                std::cout << JsonLine(LookJson(look)) << std::endl;
                continue;
            }
            std::string line =
                TimeText(time(nullptr)) + "  " + TaskLabel(look.task) + "  " + status;
            const std::string progress = ProgressText(look);
            const std::string file = Printable(look.task["copy_file_path"].StringView());
            if (!progress.empty()) line += "  " + progress;
            if (!file.empty()) line += "  " + file;
            std::cout << line << std::endl;
        }
    }

private:
    bool m_as_json;
    std::map<uint64_t, std::string> m_known;  // by task id
};

void Watch(const Ctl& ctl, const std::string& task, bool as_json) {
    std::optional<uint64_t> task_id;
    if (!task.empty()) task_id = ctl.daemon.FindTask(task)["id"].AsUInt64();
    RunWatcher watcher(task_id);
    Screen screen(ctl.output);
    Lines lines(as_json);
    while (true) {
        // The tasks first: a run that ends in between shows its numbers, not those of the next.
        const PObject::array_type tasks = ctl.daemon.Tasks();
        watcher.Update(tasks, ctl.daemon.Ask("get_task_progress"), time(nullptr));
        if (task_id && watcher.Looks().empty()) {
            throw CommandError(EXIT_REFUSED, "the task has been removed");
        }
        if (ctl.output.CanRedraw() && !as_json) {
            screen.Show(watcher.Looks());
        } else {
            lines.Show(watcher.Looks());
        }
        if (!std::cout) return;  // nobody reads any more
        if (watcher.HasEnded()) break;
        std::this_thread::sleep_for(LOOK_EVERY);
    }
    if (watcher.HasFailed()) {
        throw CommandError(EXIT_REFUSED,
                           "the run did not end well, or was cancelled before it began; "
                           "\"ferrixctl log\" tells more");
    }
}

}  // namespace

void AddTaskWatchCommand(CLI::App& group, const Ctl& ctl) {
    struct Options {
        std::string task;
        bool as_json = false;
    };
    const auto options = std::make_shared<Options>();
    CLI::App* command = AddCommand(
        group, "watch",
        "Follows a run: status, files and bytes done, rate, time, and the file in hand; on a "
        "terminal "
        "in place, else a line for each change. It waits for a run if none is under way, ends with "
        "it, and ends with 0 only if it was successful. Without a task it follows whatever runs, "
        "and ends with 0 only if all of that was.",
        "ferrixctl task watch Camera\n"
        "ferrixctl task watch --json | jq .files");
    command->add_option("TASK", options->task, "The task's id or name");
    AddJsonOption(*command, options->as_json);
    command->callback([options, &ctl] { Watch(ctl, options->task, options->as_json); });
}
