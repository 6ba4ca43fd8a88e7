#include "client/daemon-client.h"

#include <unistd.h>

#include "client/exit-status.h"
#include "client/refusal.h"
#include "client/text.h"

DaemonClient::DaemonClient(std::string socket_path) : m_socket_path(std::move(socket_path)) {}

PObject DaemonClient::Send(const std::string& what, const PObject& request) const {
    PObject response;
    if (DaemonIPC(m_socket_path).SendCommand(request, response) == 0) return response;
    if (response.HasMember("error")) {
        throw Refusal(what, response["error_code"].AsInt32(),
                      Printable(response["error"].AsString()));
    }
    if (geteuid() != 0) {
        throw CommandError(EXIT_NOT_REACHABLE, "the daemon does not answer at " + m_socket_path +
                                                   ": it talks to root alone, so run this as root");
    }
    throw CommandError(EXIT_NOT_REACHABLE,
                       "the daemon does not answer at " + m_socket_path +
                           "; \"ferrixctl service status\" tells whether it runs, and "
                           "\"ferrixctl service start\" starts it");
}

PObject DaemonClient::Ask(const std::string& action, PObject request) const {
    request["action"] = action;
    return Send(action, request);
}

PObject DaemonClient::AskAbout(const std::string& action, uint64_t task_id) const {
    PObject request;
    request["task_id"] = task_id;
    return Ask(action, std::move(request));
}

void DaemonClient::SendHook(const std::string& name, const std::string& type,
                            const std::vector<std::pair<std::string, std::string>>& keys) const {
    PObject request;
    for (const auto& [key, value] : keys) request[key] = value;
    request["notify"] = name;
    request["type"] = type;
    (void)Send(name, request);
}

PObject::array_type DaemonClient::Tasks() const {
    const PObject response = Ask("list_task");
    return response["task_list"].AsArray();
}

std::optional<PObject::array_type> DaemonClient::TasksIfReachable() const {
    try {
        return Tasks();
    } catch (const CommandError& error) {
        if (error.Status() != EXIT_NOT_REACHABLE) throw;
        return std::nullopt;
    }
}

PObject DaemonClient::FindTask(const std::string& id_or_name) const {
    const PObject::array_type tasks = Tasks();
    for (const PObject& task : tasks) {
        if (std::to_string(task["id"].AsUInt64()) == id_or_name) return task;
    }
    const PObject* found = nullptr;
    for (const PObject& task : tasks) {
        if (task["task_name"].StringView() != id_or_name) continue;
        if (found != nullptr) {
            throw CommandError(EXIT_USAGE, "several tasks have the name \"" +
                                               Printable(id_or_name) + "\": give the id");
        }
        found = &task;
    }
    if (found == nullptr) {
        throw CommandError(EXIT_USAGE, "there is no task \"" + Printable(id_or_name) +
                                           "\"; \"ferrixctl task list\" shows what there is");
    }
    return *found;
}
