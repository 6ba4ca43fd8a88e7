#include <optional>

#include "client/box-admin.h"
#include "client/command.h"
#include "client/ctl-task.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/task-options.h"
#include "client/timetable.h"

namespace {

constexpr int64_t NO_SCHEDULE = -1;

struct TriggerOptions {
    std::string task;
    std::optional<bool> runs_on_plug_in;
    std::optional<bool> ejects;
    std::string time;
    std::vector<std::string> days;
    bool has_no_timetable = false;
};

// The daemon takes the timetable with every change, so that of now has to be sent again.
Timetable NewTimetable(const TriggerOptions& options, const PObject& task) {
    if (!options.time.empty()) return MakeTimetable(options.time, options.days);
    if (options.has_no_timetable || task["schedule_id"].AsInt64() == NO_SCHEDULE) return {};
    if (const auto present = ReadTimetable(task["schedule_id"].AsInt64())) return *present;
    throw CommandError(EXIT_USAGE,
                       "the timetable of now cannot be read, and is sent with each change: say it "
                       "with --at and --days, or --no-timetable");
}

void CheckOptions(const TriggerOptions& options, const PObject& task) {
    if (!options.runs_on_plug_in && !options.ejects && options.time.empty() &&
        options.days.empty() && !options.has_no_timetable) {
        throw CommandError(EXIT_USAGE,
                           "say what to change; \"ferrixctl task trigger --help\" tells "
                           "what there is");
    }
    if (!options.days.empty() && options.time.empty()) {
        throw CommandError(EXIT_USAGE, "--days needs the time of the day: --at 02:30");
    }
    if (!options.time.empty() && task["schedule_id"].AsInt64() == NO_SCHEDULE) {
        throw CommandError(EXIT_REFUSED,
                           task["is_default_task"].AsBool()
                               ? "a task that comes with the box cannot have a timetable"
                               : "this task cannot have a timetable, as none could be made when it "
                                 "was added: remove the task and add it again");
    }
}

void SetTrigger(const Ctl& ctl, const TriggerOptions& options) {
    const PObject task = ctl.daemon.FindTask(options.task);
    CheckOptions(options, task);
    const Timetable timetable = NewTimetable(options, task);
    PObject request;
    request["task_id"] = task["id"].AsUInt64();
    // Always both: the daemon's live record forgets the one that is not sent.
    request["run_when_plug_in"] =
        options.runs_on_plug_in.value_or(task["run_when_plug_in"].AsBool());
    request["eject_when_task_done"] =
        options.ejects.value_or(task["eject_when_task_done"].AsBool());
    request["schedule_enabled"] = timetable.is_enabled;
    request["schedule_json_str"] = ScheduleText(timetable);
    (void)ctl.daemon.Ask("set_trigger_time_setting", std::move(request));
}

}  // namespace

void AddTaskTriggerCommand(CLI::App& group, const Ctl& ctl) {
    const auto options = std::make_shared<TriggerOptions>();
    CLI::App* command =
        AddCommand(group, "trigger", "Sets what makes a task run, and what follows a run.",
                   "ferrixctl task trigger Camera --on-plug-in --eject\n"
                   "ferrixctl task trigger Backup --at 02:30 --days mon-fri\n"
                   "ferrixctl task trigger Backup --no-timetable");
    AddTaskArgument(*command, options->task);
    AddSwitch(*command, "--on-plug-in", "--not-on-plug-in", options->runs_on_plug_in,
              "Runs when the device is plugged in", "Does not run by itself then");
    AddSwitch(*command, "--eject", "--no-eject", options->ejects,
              "Ejects the device after each run", "Leaves the device in place");
    CLI::Option* time =
        command->add_option("--at", options->time, "Runs at this time of the day: \"02:30\"");
    command->add_option("--days", options->days, "On these days only: \"mon-fri\", \"sat,sun\"")
        ->delimiter(',');
    command->add_flag("--no-timetable", options->has_no_timetable, "Runs at no fixed time")
        ->excludes(time);
    command->callback([options, &ctl] { SetTrigger(ctl, *options); });
}
