// Opening and closing a Channel, and the plain transport: a socket descriptor.
#include <fcntl.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "ipc/channel.h"
#include "ipc/deadline.h"
#include "ipc/wait-ready.h"
#include "utils/error-code.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

int PlainDescriptor(const void* handle) {
    return handle != nullptr ? *static_cast<const int*>(handle) : -1;
}

bool IsPlainInvalid(const void* handle) { return PlainDescriptor(handle) == -1; }

void ClosePlain(void* handle) {
    const int descriptor = PlainDescriptor(handle);
    if (shutdown(descriptor, SHUT_RDWR) != 0) {
        SLOG_DBG("Channel: shutdown: %s\n", std::strerror(errno));
    }
    close(descriptor);
    SLOG_DBG("Channel: socket %d closed\n", descriptor);
    delete static_cast<int*>(handle);
}

// 0, or the error. Zero is no limit.
int LimitSending(int descriptor, const timeval& limit) {
    return setsockopt(descriptor, SOL_SOCKET, SO_SNDTIMEO, &limit, sizeof(limit)) == 0 ? 0 : errno;
}

}  // namespace

constinit const Channel::Transport Channel::kPlainTransport = {
    [](void* handle, void* buffer, size_t length, const timeval& timeout) {
        return ReadFd(PlainDescriptor(handle), buffer, length, timeout);
    },
    [](void* handle, const void* buffer, size_t length, const timeval& timeout) {
        return WriteFd(PlainDescriptor(handle), buffer, length, timeout);
    },
    PlainDescriptor,
    ClosePlain,
    IsPlainInvalid,
};

void Channel::SetFunctions(const Transport& transport) { m_transport = transport; }

void Channel::SetFunctions(bool plain) { SetFunctions(plain ? kPlainTransport : kTlsTransport); }

ssize_t Channel::ReadFd(int descriptor, void* buffer, size_t length, const timeval& timeout) {
    if (length == 0) {
        SLOG_ERR("ReadFd: request 0\n");
        return ERR_INVALID_ARGUMENT;
    }
    if (const int result = WaitForSocket(descriptor, false, timeout); result != 0) return result;
    const ssize_t count = recv(descriptor, buffer, length, 0);
    if (count > 0) return count;
    SLOG_ERR("read: %s\n", std::strerror(count < 0 ? errno : 0));
    if (count == 0) {
        SLOG_ERR(
            "Diagnose: select says the socket is readable but actually we can't read ... "
            "connection closed?\n");
    }
    return ERR_IO;
}

ssize_t Channel::WriteFd(int descriptor, const void* buffer, size_t length,
                         const timeval& timeout) {
    if (const int result = WaitForSocket(descriptor, true, timeout); result != 0) return result;
    // No signal for a peer that has gone: a client need not have arranged for it to be ignored.
    const ssize_t count = send(descriptor, buffer, length, MSG_NOSIGNAL);
    if (count > 0) return count;
    SLOG_ERR("write: %s\n", std::strerror(count < 0 ? errno : 0));
    if (count == 0) {
        SLOG_ERR(
            "Diagnose: select says the socket is writeable but actually we can't write ... "
            "connection closed?\n");
    }
    return ERR_IO;
}

bool Channel::RefuseWhenOpen() const {
    if (IsClosed()) return false;
    SLOG_ERR("Open: Channel already opened [%d]\n", m_transport.get_descriptor(m_handle));
    SLOG_ERR("Open: %s\n", ErrorText(ERR_INVALID_ARGUMENT));
    return true;
}

void Channel::Adopt(int descriptor) {
    m_handle = new int(descriptor);
    ResetRead();
    ResetWrite();
}

int Channel::Open(int descriptor, bool tune) {
    if (RefuseWhenOpen()) return ERR_INVALID_ARGUMENT;
    if (tune) {
        if (SetLinger(descriptor, 1) != 0) {
            SLOG_ERR("Open: SetLinger to socket [%d] failed, %s\n", descriptor,
                     std::strerror(errno));
            return ERR_SYSTEM;
        }
        if (SetNonBlock(descriptor) != 0) {
            SLOG_ERR("Open: SetNonBlock to socket [%d] failed, %s\n", descriptor,
                     std::strerror(errno));
            return ERR_SYSTEM;
        }
    }
    if (descriptor == -1) return ERR_INVALID_ARGUMENT;
    Adopt(descriptor);
    SLOG_DBG("Channel: opening socket %d\n", descriptor);
    return 0;
}

int Channel::Open(const std::string& path) {
    if (RefuseWhenOpen()) return ERR_INVALID_ARGUMENT;
    UniqueFd descriptor(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    if (!descriptor.IsValid()) {
        SLOG_ERR("Channel: Can not open socket. %s\n", std::strerror(errno));
        return ERR_SYSTEM;
    }
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof(address.sun_path) - 1);
    if (ConnectInTime(descriptor.Get(), address) != 0) {
        SLOG_ERR("Channel: Can not connect to server at '%s'. %s\n", path.c_str(),
                 std::strerror(errno));
        return ERR_IO;
    }
    if (SetNonBlock(descriptor.Get()) != 0) return ERR_SYSTEM;
    Adopt(descriptor.Release());
    return 0;
}

// A listener that accepts nobody, its backlog full, blocks a connect until the limit on sending is
// over. That is the limit of one wait, so that the abort flag and the total are looked at.
int Channel::ConnectInTime(int descriptor, const sockaddr_un& address) const {
    const Deadline deadline({static_cast<time_t>(m_total_timeout), 0});
    int error = LimitSending(descriptor, m_operation_timeout);
    while (error == 0) {
        if (connect(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) ==
            0) {
            error = LimitSending(descriptor, {0, 0});
            break;
        }
        error = errno;
        if (error != EAGAIN && error != EINTR) break;
        SLOG_DBG("select: %s\n", error == EINTR ? "EINTR" : "timeout");
        const bool is_late = m_total_timeout != 0 && deadline.IsOver();
        error = IsAborted() ? EINTR : is_late ? ETIMEDOUT : 0;
    }
    errno = error;
    return error == 0 ? 0 : -1;
}

void Channel::Close() {
    if (IsClosed()) return;
    if (const int result = FlushWrite(0); result < 0) {
        SLOG_ERR("FlushWrite: %s\n", ErrorText(result));
        ResetRead();
        ResetWrite();
    }
    m_transport.close(m_handle);
    m_handle = nullptr;
    m_is_tls = false;
    SetFunctions(true);
}

int Channel::SetLinger(int descriptor, int seconds) const {
    const linger value{1, seconds};
    if (setsockopt(descriptor, SOL_SOCKET, SO_LINGER, &value, sizeof(value)) != 0) {
        SLOG_ERR("setsockopt: %s\n", std::strerror(errno));
        return -1;
    }
    return 0;
}

int Channel::SetNonBlock(int descriptor) const {
    if (descriptor == -1) return -1;
    const int flags = fcntl(descriptor, F_GETFL);
    if (flags < 0 ||
        ((flags & O_NONBLOCK) == 0 && fcntl(descriptor, F_SETFL, flags | O_NONBLOCK) != 0)) {
        SLOG_ERR("fcntl: %s\n", std::strerror(errno));
        return -1;
    }
    return 0;
}
