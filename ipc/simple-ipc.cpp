#include "ipc/simple-ipc.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "ipc/wait-ready.h"
#include "utils/log.h"

namespace {

constexpr int kBacklog = 8;

// Cut off, it would name another file.
bool IsTooLong(const std::string& path) { return path.size() >= sizeof(sockaddr_un::sun_path); }

int Bind(int descriptor, const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (IsTooLong(path)) {
        errno = ENAMETOOLONG;
        return -1;
    }
    path.copy(address.sun_path, path.size());
    return bind(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof(address));
}

// The path that a domain socket is bound to. Empty when it is bound to none.
int BoundPath(int descriptor, std::string& path) {
    sockaddr_un address{};
    socklen_t size = sizeof(address);
    if (getsockname(descriptor, reinterpret_cast<sockaddr*>(&address), &size) != 0) return -1;
    path.assign(address.sun_path, strnlen(address.sun_path, sizeof(address.sun_path)));
    return 0;
}

}  // namespace

IPCListener::IPCListener(const timeval& wait_timeout) : m_wait_timeout(wait_timeout) {}

IPCListener::~IPCListener() { Stop(); }

int IPCListener::Listen(const std::string& path) {
    if (m_descriptor >= 0 || path.empty()) return -1;
    m_descriptor = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (m_descriptor < 0) {
        SLOG_ERR("socket: %s (%d)\n", std::strerror(errno), errno);
        return -1;
    }
    m_path = path;
    if (!IsTooLong(path)) unlink(path.c_str());  // left by an earlier process
    const int on = 1;
    setsockopt(m_descriptor, SOL_SOCKET, SO_REUSEADDR, &on, sizeof(on));
    if (Bind(m_descriptor, path) != 0) {
        SLOG_ERR("bind: %s (%d)\n", std::strerror(errno), errno);
        Stop();
        return -1;
    }
    if (listen(m_descriptor, kBacklog) != 0) {
        SLOG_ERR("listen: %s (%d)\n", std::strerror(errno), errno);
        Stop();
        return -1;
    }
    SLOG_DBG("listening on domain socket '%s'\n", path.c_str());
    return 0;
}

bool IPCListener::Wait() const {
    return m_descriptor >= 0 && WaitReady(m_descriptor, false, m_wait_timeout) > 0;
}

int IPCListener::Accept() const {
    if (m_descriptor < 0) return -1;
    return accept4(m_descriptor, nullptr, nullptr, SOCK_CLOEXEC);
}

void IPCListener::Stop() {
    if (m_descriptor < 0) return;
    std::string bound;
    if (!m_path.empty() && BoundPath(m_descriptor, bound) != 0) {
        SLOG_ERR("getsockname: %s (%d).\n", std::strerror(errno), errno);
    }
    shutdown(m_descriptor, SHUT_RDWR);
    close(m_descriptor);
    if (!bound.empty()) unlink(bound.c_str());
    m_descriptor = -1;
    m_path.clear();
}
