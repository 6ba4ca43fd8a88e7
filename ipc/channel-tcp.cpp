// Channels over IPv4.
#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>

#include "ipc/channel.h"
#include "ipc/stall-count.h"
#include "ipc/wait-ready.h"
#include "utils/error-code.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

constexpr int kMaxPort = 65535;

int PendingError(int descriptor) {
    int error = 0;
    socklen_t size = sizeof(error);
    return getsockopt(descriptor, SOL_SOCKET, SO_ERROR, &error, &size) == 0 ? error : errno;
}

}  // namespace

int Channel::CreateSocket() const { return socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0); }

int Channel::Open(const char* ip, int port) {
    if (ip == nullptr || port < 0) return 0;
    if (RefuseWhenOpen()) return ERR_INVALID_ARGUMENT;
    UniqueFd descriptor(CreateSocket());
    if (!descriptor.IsValid()) return ERR_IO;
    if (SetLinger(descriptor.Get(), 1) != 0 || SetNonBlock(descriptor.Get()) != 0) {
        return ERR_SYSTEM;
    }
    if (Connect(descriptor.Get(), ip, port) != 0) return ERR_IO;
    Adopt(descriptor.Release());
    return 0;
}

int Channel::Connect(int descriptor, const char* ip, int port) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    if (descriptor < 0 || ip == nullptr || port < 0 || port > kMaxPort ||
        inet_pton(AF_INET, ip, &address.sin_addr) != 1) {
        SLOG_ERR("Invalid argumants (ip: %s, port: %d\n", ip != nullptr ? ip : "(null)", port);
        return ERR_INVALID_ARGUMENT;
    }
    address.sin_port = htons(static_cast<uint16_t>(port));
    int error = 0;
    if (connect(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
        error = errno;
        if (error == EINPROGRESS || error == EINTR) {
            if (const int result = WaitForConnect(descriptor); result != 0) return result;
            error = PendingError(descriptor);
        }
    }
    if (error == 0) return 0;
    SLOG_ERR("Connect error %s (%d). %s (%d)\n", ip, port, std::strerror(error), error);
    return ERR_SYSTEM;
}

int Channel::WaitForConnect(int descriptor) const {
    for (StallCount stalls(m_total_timeout);;) {
        if (IsAborted()) return -1;
        const int ready = WaitDespiteSignals(descriptor, true, m_operation_timeout);
        if (ready > 0) return 0;
        if (ready < 0) {
            SLOG_ERR("select: %s\n", std::strerror(errno));
            return ERR_SYSTEM;
        }
        SLOG_DBG("select: timeout\n");
        if (stalls.CountTimeout()) {
            SLOG_ERR("Channel timed out during connect (%u seconds), abort anyway\n",
                     m_total_timeout);
            return ERR_CONNECTION_TIMEOUT;
        }
    }
}

int Channel::GetPeerInfo(std::string& ip, int& port) const {
    ip.clear();
    port = 0;
    if (IsClosed()) {
        SLOG_WARN("GetPeerInfo: Attempting to get info of an uninitialized channel\n");
        return 0;
    }
    sockaddr_storage address{};
    socklen_t size = sizeof(address);
    if (getpeername(m_transport.get_descriptor(m_handle), reinterpret_cast<sockaddr*>(&address),
                    &size) != 0) {
        SLOG_ERR("GetPeerInfo: getpeername: %s\n", std::strerror(errno));
        return ERR_SYSTEM;
    }
    // A peer of another family has no address of this form, and inet_ntop says so.
    sockaddr_in internet{};
    std::memcpy(&internet, &address, sizeof(internet));
    char text[17] = {};
    if (inet_ntop(address.ss_family == AF_INET ? AF_INET : AF_UNSPEC, &internet.sin_addr, text,
                  sizeof(text)) == nullptr) {
        SLOG_ERR("GetPeerInfo: inet_ntop: %s (%d)\n", std::strerror(errno), errno);
        return -1;
    }
    ip = text;
    port = ntohs(internet.sin_port);
    return 0;
}
