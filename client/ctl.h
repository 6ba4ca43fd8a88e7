// ferrixctl: what its commands share, and where they are put together.
#pragma once

#include <CLI/CLI.hpp>
#include <memory>

#include "client/daemon-client.h"
#include "client/terminal.h"

struct Ctl {
    DaemonClient daemon;
    Terminal output;
};

// All commands, ready to be run. `ctl` has to outlive the result.
[[nodiscard]] std::unique_ptr<CLI::App> MakeCtlProgram(const Ctl& ctl);

// One group of commands each, in a file of its own.
void AddServiceCommands(CLI::App& program);
void AddDeviceCommands(CLI::App& program, const Ctl& ctl);
void AddTaskCommands(CLI::App& program, const Ctl& ctl);
void AddButtonCommand(CLI::App& program, const Ctl& ctl);
void AddSettingCommands(CLI::App& program, const Ctl& ctl);
void AddLogCommand(CLI::App& program, const Ctl& ctl);
void AddShareCommands(CLI::App& program, const Ctl& ctl);
void AddHookCommand(CLI::App& program, const Ctl& ctl);
