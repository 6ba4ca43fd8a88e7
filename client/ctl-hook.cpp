#include "client/command.h"
#include "client/ctl.h"
#include "client/hook-keys.h"

void AddHookCommand(CLI::App& program, const Ctl& ctl) {
    struct Options {
        std::string name;
        std::string type;
        std::vector<std::string> keys;
    };
    const auto options = std::make_shared<Options>();
    CLI::App* command = AddCommand(
        program, "hook",
        "Tells the daemon that something happens to a volume or a share, as the box itself does. "
        "What the daemon makes of it stands in the system log.",
        "ferrixctl hook post_mount mountpoint=/media/card device=/dev/sdb1\n"
        "ferrixctl hook pre_encrypt share_name=photos");
    command->add_option("NAME", options->name, "What happens, \"post_mount\" for example")
        ->required();
    command->add_option("KEY=VALUE", options->keys, "What it happens to");
    command
        ->add_option("--type", options->type, "The kind of hook; taken from the name if not given")
        ->check(CLI::IsMember(HOOK_TYPES));
    command->callback([options, &ctl] {
        const std::string usual = HookType(options->name);
        ctl.daemon.SendHook(options->name, options->type.empty() ? usual : options->type,
                            HookKeys(options->keys));
    });
}
