#include "client/ctl-task.h"

#include "client/command.h"
#include "client/ctl.h"

void AddTaskArgument(CLI::App& command, std::string& id_or_name) {
    command.add_option("TASK", id_or_name, "The task's id or name")->required();
}

void AddTaskCommands(CLI::App& program, const Ctl& ctl) {
    CLI::App* group =
        AddCommandGroup(program, "task",
                        "Tasks: what is copied between a device and a share. A device has one at "
                        "most.",
                        "ferrixctl task list\n"
                        "ferrixctl task add --to photos/inbox --name Camera\n"
                        "ferrixctl task run Camera");
    AddTaskListCommands(*group, ctl);
    AddTaskAddCommand(*group, ctl);
    AddTaskSetCommand(*group, ctl);
    AddTaskTriggerCommand(*group, ctl);
    AddTaskFilterCommands(*group, ctl);
    AddTaskControlCommands(*group, ctl);
    AddTaskWatchCommand(*group, ctl);
}
