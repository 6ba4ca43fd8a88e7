#include "client/notifier.h"

#include <charconv>

#include "client/daemon-client.h"
#include "client/exit-status.h"
#include "client/hook-keys.h"
#include "client/text.h"

namespace {

struct Options {
    std::string task_id;
    std::string hook;
    std::string type;
    std::vector<std::string> keys;
};

// Decimal, all of it. The library's own numbers would take "-1" and, as octal, "010".
uint64_t TaskId(const std::string& text) {
    uint64_t id = 0;
    const char* end = text.data() + text.size();
    const auto [stopped, error] = std::from_chars(text.data(), end, id);
    if (error != std::errc() || stopped != end) {
        throw CLI::ValidationError("--execute-task", Printable(text) + " is no task id");
    }
    return id;
}

void Notify(const DaemonClient& daemon, const Options& options) {
    if (!options.task_id.empty()) {
        (void)daemon.AskAbout("run_task", TaskId(options.task_id));
        return;
    }
    if (options.hook.empty()) throw CLI::RequiredError("--execute-task or --hook");
    (void)HookType(options.hook);  // a name that the daemon does not know it acknowledges as well
    daemon.SendHook(options.hook, options.type, HookKeys(options.keys));
}

}  // namespace

std::unique_ptr<CLI::App> MakeNotifierProgram(const DaemonClient& daemon) {
    auto program = std::make_unique<CLI::App>(
        "Tells the copy daemon that a task is due, or what happens to a volume or a share.",
        "ferrix-notifier");
    const auto options = std::make_shared<Options>();
    CLI::Option* task =
        program->add_option("--execute-task", options->task_id, "Run the task with this id")
            ->type_name("ID");
    CLI::Option* hook =
        program->add_option("--hook", options->hook, "What happens, \"post_mount\" for example")
            ->type_name("NAME")
            ->excludes(task);
    CLI::Option* type = program->add_option("--type", options->type, "The kind of hook")
                            ->type_name("TYPE")
                            ->check(CLI::IsMember(HOOK_TYPES))
                            ->needs(hook);
    hook->needs(type);
    program->add_option("KEY=VALUE", options->keys, "What it happens to")->needs(hook);
    program->footer(
        "Example:\n"
        "  ferrix-notifier --execute-task 7\n"
        "  ferrix-notifier --hook post_mount --type volume_hook mountpoint=/media/card "
        "device=/dev/sdb1");
    program->callback([options, &daemon] { Notify(daemon, *options); });
    return program;
}
