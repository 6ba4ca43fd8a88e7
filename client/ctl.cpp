#include "client/ctl.h"

#include "client/command.h"

std::unique_ptr<CLI::App> MakeCtlProgram(const Ctl& ctl) {
    auto program = std::make_unique<CLI::App>(
        "Runs the copy service of this box, and tells what it does.", "ferrixctl");
    program->footer(
        "Example:\n"
        "  ferrixctl service start\n"
        "  ferrixctl device list\n"
        "  ferrixctl task add --to photos/inbox --name Camera\n"
        "  ferrixctl task watch");
    program->require_subcommand(1);
    AddServiceCommands(*program);
    AddDeviceCommands(*program, ctl);
    AddTaskCommands(*program, ctl);
    AddButtonCommand(*program, ctl);
    AddSettingCommands(*program, ctl);
    AddLogCommand(*program, ctl);
    AddShareCommands(*program, ctl);
    AddHookCommand(*program, ctl);
    return program;
}
