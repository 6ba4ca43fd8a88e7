#include <iostream>

#include "client/command.h"
#include "client/ctl-task.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/task-text.h"

namespace {

// A command that takes a task and nothing else, and answers with nothing.
void AddSimpleCommand(CLI::App& group, const Ctl& ctl, const char* name, const char* action,
                      const std::string& description, bool for_default_tasks = false) {
    const auto task = std::make_shared<std::string>();
    CLI::App* command =
        AddCommand(group, name, description, std::string("ferrixctl task ") + name + " 3");
    AddTaskArgument(*command, *task);
    command->callback([task, action, for_default_tasks, &ctl] {
        const PObject found = ctl.daemon.FindTask(*task);
        // The daemon takes this for done, and does nothing: the person shall know.
        if (for_default_tasks && !found["is_default_task"].AsBool()) {
            throw CommandError(EXIT_USAGE, "task " + TaskLabel(found) +
                                               " is one of your own: only the tasks that come with "
                                               "the box are switched on and off");
        }
        (void)ctl.daemon.AskAbout(action, found["id"].AsUInt64());
    });
}

}  // namespace

void AddTaskControlCommands(CLI::App& group, const Ctl& ctl) {
    AddSimpleCommand(group, ctl, "run", "run_task",
                     "Runs a task now, after those that wait already. Its device has to be plugged "
                     "in. The command does not wait for the end: see \"ferrixctl task watch\".");
    AddSimpleCommand(group, ctl, "cancel", "cancel_task",
                     "Breaks a run off. What was copied whole stays.");
    AddSimpleCommand(group, ctl, "enable", "enable_task",
                     "Switches on a task that comes with the box.", true);
    AddSimpleCommand(group, ctl, "disable", "disable_task",
                     "Switches off a task that comes with the box.", true);
    AddSimpleCommand(group, ctl, "remove", "remove_task",
                     "Removes a task. What it has copied stays.");
}
