// The forms of IPCListener that listen on a port of 127.0.0.1.
#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>

#include "ipc/simple-ipc.h"
#include "utils/log.h"

namespace {

constexpr int kBacklog = 8;
constexpr int kMaxPort = 65535;

void LogFailure(const char* call) { SLOG_ERR("%s: %s (%d)\n", call, std::strerror(errno), errno); }

int BindToPort(int descriptor, int port) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (bind(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0) {
        return 0;
    }
    LogFailure("bind");
    return -1;
}

// Where the search ended, or -1.
int BindToFreePort(int descriptor, int first_port) {
    for (int port = first_port; port >= 0; ++port) {  // no port is below 0
        SLOG_INFO("Try to bind port: %d\n", port);
        if (port > kMaxPort) {
            SLOG_ERR("Port number exceeds 65536\n");
            break;
        }
        if (BindToPort(descriptor, port) == 0) {
            SLOG_INFO("Bind port %d success\n", first_port);
            return port;
        }
        SLOG_INFO("Bind port %d failed, try next one\n", port);
    }
    SLOG_ERR("find available port failed.\n");
    return -1;
}

// The port that the system has chosen for port 0.
int BoundPort(int descriptor) {
    sockaddr_in address{};
    socklen_t size = sizeof(address);
    if (getsockname(descriptor, reinterpret_cast<sockaddr*>(&address), &size) != 0) {
        LogFailure("getsockname");
        return -1;
    }
    return ntohs(address.sin_port);
}

}  // namespace

int IPCListener::MakePortSocket() {
    m_descriptor = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, IPPROTO_TCP);
    if (m_descriptor >= 0) return 0;
    LogFailure("socket");
    return -1;
}

int IPCListener::StartOnPort() {
    if (listen(m_descriptor, kBacklog) == 0) return 0;
    LogFailure("listen");
    return -1;
}

int IPCListener::Listen(int port) {
    if (m_descriptor >= 0 || port <= 0 || port > kMaxPort) return -1;
    if (MakePortSocket() != 0) return -1;
    if (BindToPort(m_descriptor, port) != 0 || StartOnPort() != 0) {
        Stop();
        return -1;
    }
    SLOG_DBG("listening on port %d\n", port);
    return 0;
}

int IPCListener::ListenOnPort(int first_port) {
    Stop();
    if (MakePortSocket() != 0) return -1;
    int port = BindToFreePort(m_descriptor, first_port);
    if (port >= 0 && StartOnPort() != 0) port = -1;
    if (port == 0) port = BoundPort(m_descriptor);
    if (port < 0) {
        Stop();
        return -1;
    }
    SLOG_INFO("listening on port %d\n", port);
    return port;
}
