#include "ipc/daemon-ipc.h"

#include <utility>

#include "ipc/ipc-sender.h"
#include "ipc/pobject.h"
#include "utils/log.h"

namespace {

int JudgeResponse(const PObject& response) {
    if (response.HasMember("error")) {  // even beside an acknowledgement
        SLOG_ERR("SendCommand error: %s\n", response["error"].AsString().c_str());
        return -1;
    }
    if (response["ack"].AsString() != "ok") {
        SLOG_ERR("Can not recieve ack.\n");
        return -1;
    }
    SLOG_DBG("Recieve ack.\n");
    return 0;
}

}  // namespace

DaemonIPC::DaemonIPC(std::string socket_path) : m_socket_path(std::move(socket_path)) {}

int DaemonIPC::SendCommand(const PObject& request, PObject& response) {
    IPCSender sender;
    if (sender.Connect(m_socket_path) != 0) {
        SLOG_ERR("Failed to connect at '%s'\n", m_socket_path.c_str());
        return -1;
    }
    if (sender.Send(request) != 0) {
        SLOG_ERR("Failed to send request.\n");
        return -1;
    }
    SLOG_DBG("DaemonIPC: send request >>> %s\n", request.ToText().c_str());
    if (request.HasMember("need_ack") && !request["need_ack"].AsBool()) {
        SLOG_DBG("DaemonIPC: no need ack\n");
        return 0;
    }
    if (sender.Recv(response) != 0) {
        SLOG_ERR("Failed to receive response.\n");
        return -1;
    }
    SLOG_DBG("DaemonIPC: recv response <<< %s\n", response.ToText().c_str());
    return JudgeResponse(response);
}
