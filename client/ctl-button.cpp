#include "client/command.h"
#include "client/ctl.h"

void AddButtonCommand(CLI::App& program, const Ctl& ctl) {
    CLI::App* command = AddCommand(
        program, "button",
        "Presses the copy button: every task whose device is plugged in and whose share is "
        "reachable runs.",
        "ferrixctl button");
    command->callback([&ctl] { ctl.daemon.SendHook("post_ferrix", "ferrix_hook", {}); });
}
