#include "client/share-change.h"

#include "client/box-admin.h"
#include "client/exit-status.h"
#include "client/held-signals.h"
#include "client/share-tasks.h"
#include "client/shell-word.h"

namespace {

constexpr const char* HOOK_TYPE = "share_hook";

// Runs `work`; when the daemon does not answer, `text` says what that means here.
template <typename Work>
auto WithDaemon(const std::string& text, Work work) {
    try {
        return work();
    } catch (const CommandError& error) {
        if (error.Status() != EXIT_NOT_REACHABLE) throw;
        throw CommandError(EXIT_NOT_REACHABLE, text);
    }
}

std::string StartFirst(const std::string& why) {
    return "the daemon does not answer, and " + why +
           ": start the service first (\"ferrixctl service start\")";
}

void SendPathChange(const DaemonClient& daemon, const std::string& name,
                    const std::string& new_name) {
    daemon.SendHook("post_path_change", HOOK_TYPE,
                    {
                        {"origin_share_name", name    },
                        {"share_name",        new_name}
    });
}

// The share keeps its name, and its tasks come back.
void BringTasksBack(const DaemonClient& daemon, const std::string& name) {
    try {
        SendPathChange(daemon, name, name);
    } catch (const CommandError&) {
        // The failure that led here is what the person has to know. A daemon that has gone loads
        // all tasks when it starts.
    }
}

// A failure can be silence: the daemon may have let go of the tasks and not said so.
void LetTasksGo(const DaemonClient& daemon, const std::string& name) {
    try {
        daemon.SendHook("pre_path_change", HOOK_TYPE,
                        {
                            {"share_name", name}
        });
    } catch (const CommandError&) {
        BringTasksBack(daemon, name);
        throw;
    }
}

// The answer to a hook does not tell whether it worked; the tasks do.
void LetTasksFollow(const DaemonClient& daemon, const std::string& name,
                    const std::string& new_name) {
    const std::string left = WithDaemon(
        "the share is renamed, but the daemon did not answer, and its tasks may still name the old "
        "one; when it runs, \"ferrixctl hook post_path_change " +
            ShellWord("origin_share_name=" + name) + " " + ShellWord("share_name=" + new_name) +
            "\" lets them follow",
        [&] {
            SendPathChange(daemon, name, new_name);
            return TaskLabels(TasksOfShare(daemon.Tasks(), name));
        });
    if (left.empty()) return;
    throw CommandError(EXIT_REFUSED,
                       "the share is renamed, but these tasks still name the old one: " + left +
                           "; \"ferrixctl task set\" gives them the new one, and the system log "
                           "says why they did not follow");
}

}  // namespace

std::string RenameShareOfTasks(const DaemonClient& daemon, const std::string& name,
                               const std::string& new_name) {
    CheckRenameShare(name, new_name);
    // Broken off half-way, the tasks of the share would stay out of service until a restart.
    const HeldSignals held;
    WithDaemon(StartFirst("the tasks of the share would not follow"),
               [&] { LetTasksGo(daemon, name); });
    std::string path;
    try {
        path = RenameShare(name, new_name);
    } catch (...) {
        BringTasksBack(daemon, name);
        throw;
    }
    LetTasksFollow(daemon, name, new_name);
    return path;
}

std::string RemoveShareOfTasks(const DaemonClient& daemon, const std::string& name,
                               bool with_tasks) {
    CheckRemoveShare(name);
    const HeldSignals held;
    const auto tasks_now = [&] { return TasksOfShare(daemon.Tasks(), name); };
    const std::string unknown = StartFirst("it is not known which tasks use the share");
    const std::string used_by = TaskLabels(WithDaemon(unknown, tasks_now));
    if (!used_by.empty() && !with_tasks) {
        throw CommandError(EXIT_REFUSED,
                           "these tasks use the share: " + used_by +
                               "; give them another one (\"ferrixctl task set\"), or remove them "
                               "with it: --with-tasks");
    }
    const std::string left = WithDaemon(unknown, [&] {
        daemon.SendHook("pre_delete", HOOK_TYPE,
                        {
                            {"share_name", name}
        });
        return TaskLabels(tasks_now());
    });
    if (!left.empty()) {
        throw CommandError(EXIT_REFUSED, "the share stays, as these tasks could not be removed: " +
                                             left + "; the system log says why");
    }
    try {
        return RemoveShare(name);
    } catch (const CommandError& error) {
        if (used_by.empty()) throw;
        throw CommandError(error.Status(),
                           std::string("the tasks are gone, but the share stays: ") + error.what());
    }
}
