#include <json/value.h>

#include <iostream>

#include "client/box-admin.h"
#include "client/command.h"
#include "client/ctl-task.h"
#include "client/ctl.h"
#include "client/json-output.h"
#include "client/outcome-text.h"
#include "client/table.h"
#include "client/task-text.h"
#include "client/text.h"
#include "client/timetable.h"
#include "db/task-info.h"

namespace {

void ListTasks(const Ctl& ctl, bool as_json) {
    const PObject::array_type tasks = ctl.daemon.Tasks();
    if (as_json) {
        Json::Value list(Json::arrayValue);
        for (const PObject& task : tasks) list.append(ToJson(task));
        return PrintJson(list);
    }
    if (tasks.empty()) {
        std::cout << "There are no tasks. \"ferrixctl task add --help\" tells how to make one.\n";
        return;
    }
    Table table({"ID", "NAME", "STATUS", "STRATEGY", "FROM", "TO", "LAST DONE"});
    for (const PObject& task : tasks) {
        table.Add({std::to_string(task["id"].AsUInt64()), Printable(task["task_name"].StringView()),
                   StatusCell(task), StrategyText(task["copy_strategy"].AsInt32()),
                   SourceText(task), DestinationText(task),
                   TimeText(task["latest_finish_time"].AsUInt32())});
    }
    std::cout << table.Text(ctl.output);
}

// A yes or no that stands in the daemon's description.
struct Switch {
    const char* key;
    const char* text;
};

constexpr Switch SWITCHES[] = {
    {"keep_dir_structure",    "keeps the folders of the source"              },
    {"smart_create_date_dir", "files go into folders by date"                },
    {"rename_photo_video",    "pictures and videos are renamed by their time"},
    {"remove_src_file",       "files are moved: they leave the source"       },
    {"run_when_plug_in",      "runs when the device is plugged in"           },
    {"eject_when_task_done",  "ejects the device after a run"                },
    {"is_default_task",       "comes with the box"                           },
};

void ShowTask(const Ctl& ctl, const PObject& task, bool as_json) {
    const std::optional<Timetable> timetable = ReadTimetable(task["schedule_id"].AsInt64());
    if (as_json) {
        Json::Value answer = ToJson(task);
        answer["timetable"] = timetable ? TimetableJson(*timetable) : Json::Value();
        return PrintJson(answer);
    }
    const int error = task["error_code"].AsInt32();
    const Table::Cell status = StatusCell(task);
    const auto line = [](const char* name, const std::string& value) {
        if (!value.empty()) std::cout << Padded(name, 16) << value << '\n';
    };
    line("Task", TaskLabel(task));
    line("Status", ctl.output.Paint(status.colour, status.text) +
                       (error == 0 ? "" : ": " + OutcomeText(error)));
    line("File in hand", Printable(task["copy_file_path"].StringView()));
    line("Kind", TaskTypeText(task["type"].AsInt32()));
    line("Strategy", StrategyText(task["copy_strategy"].AsInt32()));
    line("From", SourceText(task));
    line("To", DestinationText(task));
    line("Device", DeviceText(task));
    line("Uuid", Printable(task["uuid"].StringView()));
    line("Plugged in", task["is_usb_mounted"].AsBool() ? "yes" : "no");
    line("Share", task["is_hub_mounted"].AsBool() ? "reachable" : "not reachable");
    line("Last done", TimeText(task["latest_finish_time"].AsUInt32()));
    line("Timetable", timetable ? TimetableText(*timetable) : "");
    if (task["copy_strategy"].AsInt32() == COPY_STRATEGY_INCREMENTAL) {
        line("On conflict", ConflictPolicyText(task["conflict_policy"].AsInt32()));
    }
    if (task["copy_strategy"].AsInt32() == COPY_STRATEGY_VERSION) {
        line("Versions kept", task["enable_rotation"].AsBool()
                                  ? std::to_string(task["max_version_count"].AsUInt64()) + ", " +
                                        RotationPolicyText(task["rotation_policy"].AsInt32())
                                  : "all");
    }
    const char* name = "Options";
    for (const Switch& option : SWITCHES) {
        if (!task[option.key].AsBool()) continue;
        line(name, option.text);
        name = "";
    }
}

}  // namespace

void AddTaskListCommands(CLI::App& group, const Ctl& ctl) {
    struct Options {
        std::string task;
        bool as_json = false;
    };
    const auto list_options = std::make_shared<Options>();
    CLI::App* list = AddCommand(group, "list", "Lists all tasks.", "ferrixctl task list");
    AddJsonOption(*list, list_options->as_json);
    list->callback([list_options, &ctl] { ListTasks(ctl, list_options->as_json); });

    const auto show_options = std::make_shared<Options>();
    CLI::App* show = AddCommand(group, "show", "Shows one task with all its settings.",
                                "ferrixctl task show Camera");
    AddTaskArgument(*show, show_options->task);
    AddJsonOption(*show, show_options->as_json);
    show->callback([show_options, &ctl] {
        ShowTask(ctl, ctl.daemon.FindTask(show_options->task), show_options->as_json);
    });
}
