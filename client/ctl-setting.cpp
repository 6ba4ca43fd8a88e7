#include <iostream>

#include "client/command.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/json-output.h"
#include "platform/global-setting.h"

namespace {

void SetBeepSetting(const Ctl& ctl, bool is_on) {
    // The file first: it is what lasts, and it can be written while the daemon does not run.
    if (!SetBeep(is_on)) throw CommandError(EXIT_REFUSED, "the setting could not be written");
    PObject request;
    request["beep_on_task_start_end"] = is_on;
    try {
        (void)ctl.daemon.Ask("set_global_setting", std::move(request));
    } catch (const CommandError& error) {
        if (error.Status() != EXIT_NOT_REACHABLE) throw;
        std::cout << "Saved; the daemon does not run, and takes it up when it starts.\n";
    }
}

}  // namespace

void AddSettingCommands(CLI::App& program, const Ctl& ctl) {
    struct Options {
        std::string value;
        bool as_json = false;
    };
    CLI::App* group = AddCommandGroup(program, "setting", "Settings of the whole service.",
                                      "ferrixctl setting beep off");
    const auto options = std::make_shared<Options>();
    CLI::App* beep =
        AddCommand(*group, "beep",
                   "Switches the beep at the start and end of a run on or off, now and "
                   "for good. Without a word it tells which.",
                   "ferrixctl setting beep off\nferrixctl setting beep");
    beep->add_option("STATE", options->value, "\"on\" or \"off\"")
        ->check(CLI::IsMember({"on", "off"}));
    AddJsonOption(*beep, options->as_json);
    beep->callback([options, &ctl] {
        if (!options->value.empty()) return SetBeepSetting(ctl, options->value == "on");
        if (options->as_json) {
            Json::Value answer;
            answer["beep"] = GetBeep();
            PrintJson(answer);
        } else {
            std::cout << (GetBeep() ? "on" : "off") << '\n';
        }
    });
}
