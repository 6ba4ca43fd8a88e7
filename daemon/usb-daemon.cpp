#include "daemon/usb-daemon.h"

#include <unistd.h>

#include "ipc/channel.h"
#include "ipc/peer-credentials.h"
#include "ipc/pobject.h"
#include "ipc/simple-ipc.h"
#include "ipc/stream.h"
#include "platform/service-status.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

constexpr timeval kPollTimeout = {3, 0};
constexpr char kSocketPath[] = "/tmp/ferrix-socket";

void SendResponse(PStream& stream, Channel& channel, const PObject& response) {
    SLOG_DBG("send rsp <<< %s\n", response.ToText().c_str());
    if (stream.Send(channel, response) >= 0) return;
    SLOG_ERR("Failed to send message from channel.\n");
    channel.ResetWrite();  // closing must not wait for this client once more
}

}  // namespace

int USBDaemon::Run() {
    ServiceStatus status;
    if (BecomeDaemon(m_pid_file) < 0) {
        SLOG_ERR("failed to become daemon\n");
        return -1;
    }
    LogOpen("ferrixd");
    m_app.StartAppThread();
    const int result = ServeUntilStopped(status);
    // After a failure the application thread is not joined: it ends with the process.
    if (result == 0) m_app.StopAppThread();
    unlink(m_pid_file.c_str());
    return result;
}

int USBDaemon::ServeUntilStopped(ServiceStatus& status) {
    if (LinkDaemon() < 0) {
        SLOG_ERR("Failed to link daemon.\n");
        return -1;
    }
    status.state = SERVICE_STATE_RUNNING;
    status.error.clear();
    if (SetServiceStatus(status) < 0) {
        SLOG_ERR("SetServiceStatus() failed");
        return -1;
    }
    if (RecieveFromIPC() < 0) {
        SLOG_ERR("Failed to RecieveFromIPC.\n");
        return -1;
    }
    return 0;
}

int USBDaemon::LinkDaemon() {
    PObject request;
    request["action"] = "link";
    PObject response;
    m_app.ProcessMessage(request, response);
    SLOG_DBG("response <<< %s\n", response.ToText().c_str());
    if (response.HasMember("error")) {
        SLOG_ERR("LinkDaemon error: %s\n", response["error"].ToText().c_str());
        return -1;
    }
    if (response["ack"].AsString() != "ok") {
        SLOG_ERR("Can not recieve ack.\n");
        return -1;
    }
    return 0;
}

int USBDaemon::RecieveFromIPC() {
    const std::string path = kSocketPath;
    if (path.empty()) {
        SLOG_ERR("Can not get socket path.\n");
        return -1;
    }
    IPCListener listener(kPollTimeout);
    if (listener.Listen(path) < 0) {
        SLOG_ERR("failed to listen on port domain socket '%s'\n", path.c_str());
        return -1;
    }
    SLOG_DBG("daemon is listening on socket %s\n", path.c_str());
    while (daemon_run != 0 && ServeOneClient(listener)) {
    }
    listener.Stop();
    return 0;
}

bool USBDaemon::ServeOneClient(const IPCListener& listener) {
    if (!listener.Wait()) return true;
    UniqueFd client(listener.Accept());
    if (!client.IsValid() || !IsTrustedPeer(client.Get())) return true;
    Channel channel(Channel::DEFAULT_CAPACITY);
    if (channel.Open(client.Get(), true) < 0) return true;
    static_cast<void>(client.Release());  // the channel's now

    PStream stream;
    stream.RefuseBinaries();  // no request has a file in it
    PObject request;
    if (stream.Recv(channel, request) < 0) {
        SLOG_ERR("Failed to recieve message from channel.\n");
        return true;
    }
    SLOG_DBG("recieve msg >>> %s\n", request.ToText().c_str());
    PObject response;
    m_app.ProcessMessage(request, response);

    const PObject& asked = request;
    if (asked["action"].AsString() == "stop") return false;  // without a reply
    if (asked.HasMember("need_ack") && !asked["need_ack"].AsBool()) {
        SLOG_DBG("NO NEED SEND ACK\n");
    } else {
        SendResponse(stream, channel, response);
    }
    return true;
}
