// Asks the daemon, and turns what can go wrong into the exit status and the sentence for the user.
//
// Threads: belongs to one thread. Errors: CommandError, EXIT_NOT_REACHABLE when nothing answers,
// and Refusal (client/refusal.h), with the daemon's own text, when it refuses.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "ipc/daemon-ipc.h"
#include "ipc/pobject.h"

class DaemonClient {
public:
    explicit DaemonClient(std::string socket_path = DaemonIPC::SOCKET_PATH);

    // Sends the command `action`, with the keys that `request` holds, and returns the answer.
    PObject Ask(const std::string& action, PObject request = {}) const;
    // The same for a command about one task.
    PObject AskAbout(const std::string& action, uint64_t task_id) const;

    // Sends the hook `name` ("post_mount") of the type `type` ("volume_hook"). What the daemon
    // makes of a hook stands in its log only.
    void SendHook(const std::string& name, const std::string& type,
                  const std::vector<std::pair<std::string, std::string>>& keys) const;

    // The descriptions of all tasks.
    [[nodiscard]] PObject::array_type Tasks() const;
    // The same; nothing when no daemon answers.
    [[nodiscard]] std::optional<PObject::array_type> TasksIfReachable() const;
    // The description of the task with this id or, failing that, this name. EXIT_USAGE when there
    // is none or the name is that of several.
    [[nodiscard]] PObject FindTask(const std::string& id_or_name) const;

private:
    PObject Send(const std::string& what, const PObject& request) const;

    std::string m_socket_path;
};
