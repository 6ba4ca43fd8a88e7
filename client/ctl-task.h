// The commands below "ferrixctl task", each group in a file of its own.
#pragma once

#include <CLI/CLI.hpp>

struct Ctl;

void AddTaskListCommands(CLI::App& group, const Ctl& ctl);    // list, show
void AddTaskAddCommand(CLI::App& group, const Ctl& ctl);      // add
void AddTaskSetCommand(CLI::App& group, const Ctl& ctl);      // set
void AddTaskTriggerCommand(CLI::App& group, const Ctl& ctl);  // trigger
void AddTaskFilterCommands(CLI::App& group, const Ctl& ctl);  // filter show, filter set
void AddTaskControlCommands(CLI::App& group,
                            const Ctl& ctl);                // run, cancel, enable, disable, remove
void AddTaskWatchCommand(CLI::App& group, const Ctl& ctl);  // watch

// The argument that names a task.
void AddTaskArgument(CLI::App& command, std::string& id_or_name);
