#include "platform/log-connection.h"

#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <ctime>

#include "platform/log-header.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

namespace {

constexpr size_t kAtOnce = 64;  // datagrams for one system call
// After a stall the next attempt to wait comes this much later; in between lines go out only if
// the log daemon takes them at once.
constexpr int64_t kStallPauseMs = 5000;
// Without a log daemon one is looked for once a second, not per line.
constexpr int64_t kConnectPauseMs = 1000;

std::atomic<const char*> g_socket_path{"/dev/log"};
std::atomic<int> g_fd{-1};
std::atomic<int64_t> g_stalled_until{0};
std::atomic<int64_t> g_connect_after{0};
std::atomic<unsigned> g_lost{0};
pthread_mutex_t g_connect_mutex = PTHREAD_MUTEX_INITIALIZER;

int64_t NowMs() {
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
    return static_cast<int64_t>(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
}

// The connection stays on one descriptor number, also over a reconnect (dup3), so that a thread
// that is just sending never meets a number that has gone to somebody else.
int Connect() {
    const MutexLock lock(g_connect_mutex);
    const int64_t now = NowMs();
    if (now < g_connect_after.load()) return -1;
    const int fd = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    if (fd < 0) return -1;
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, g_socket_path.load(), sizeof(address.sun_path) - 1);
    if (connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
        close(fd);
        g_connect_after = now + kConnectPauseMs;
        return -1;
    }
    const int kept = g_fd.load();
    if (kept < 0) {
        g_fd = fd;
        return fd;
    }
    dup3(fd, kept, O_CLOEXEC);
    close(fd);
    return kept;
}

// Sends what the log daemon takes now; negative only if it took nothing.
int SendSome(int fd, const iovec* lines, size_t count) {
    if (count == 1) {
        return send(fd, lines->iov_base, lines->iov_len, MSG_NOSIGNAL) < 0 ? -1 : 1;
    }
    mmsghdr messages[kAtOnce];
    count = std::min(count, kAtOnce);
    for (size_t i = 0; i < count; ++i) {
        messages[i] = {};
        messages[i].msg_hdr.msg_iov = const_cast<iovec*>(&lines[i]);
        messages[i].msg_hdr.msg_iovlen = 1;
    }
    return sendmmsg(fd, messages, static_cast<unsigned>(count), MSG_NOSIGNAL);
}

// Sends the lines; waits for a log daemon that is behind, but only so long. Fewer sent than `count`
// leaves the reason in errno.
size_t SendAll(int fd, const iovec* lines, size_t count) {
    size_t sent = 0;
    for (bool waited = false; sent < count;) {
        if (const int some = SendSome(fd, lines + sent, count - sent); some >= 0) {
            sent += static_cast<size_t>(some);
            continue;
        }
        if (errno == EINTR) continue;
        if ((errno != EAGAIN && errno != ENOBUFS) || waited) break;
        if (NowMs() < g_stalled_until.load()) break;
        pollfd entry{fd, POLLOUT, 0};
        const int ready = poll(&entry, 1, LOG_STALL_MS);
        if (ready < 0 && errno == EINTR) continue;
        if (ready <= 0) {
            g_stalled_until = NowMs() + kStallPauseMs;
            waited = true;
        }
    }
    return sent;
}

bool IsConnectionLost(int error) {
    return error == ECONNREFUSED || error == ENOTCONN || error == ECONNRESET || error == EPIPE ||
           error == EBADF || error == EDESTADDRREQ;
}

// Returns how many of the lines were sent.
size_t Send(const iovec* lines, size_t count) {
    int fd = g_fd.load();
    if (fd < 0) fd = Connect();
    if (fd < 0) return 0;
    const size_t sent = SendAll(fd, lines, count);
    if (sent == count || !IsConnectionLost(errno)) return sent;
    fd = Connect();
    return fd < 0 ? sent : sent + SendAll(fd, lines + sent, count - sent);
}

// Each loss is told by one thread.
void TellLost() {
    const unsigned lost = g_lost.exchange(0);
    if (lost == 0) return;
    char text[256];
    const size_t header = WriteLogHeader(text, LOG_WARNING);
    const int size = snprintf(text + header, sizeof(text) - header,
                              "[WARN] %s(%d): %u log lines were lost\n", __FILE__, __LINE__, lost);
    const iovec note{text, header + static_cast<size_t>(size)};
    if (Send(&note, 1) != 1) g_lost += lost;
}

}  // namespace

void SetLogSocketForTest(const char* path) { g_socket_path = path; }

void LogConnectionOpen() {
    g_connect_after = 0;
    Connect();
}

void LogConnectionClose() {
    const MutexLock lock(g_connect_mutex);
    const int fd = g_fd.exchange(-1);
    if (fd >= 0) close(fd);
    g_connect_after = 0;
}

void LogConnectionSend(const iovec* lines, size_t count) {
    if (g_lost.load(std::memory_order_relaxed) != 0) TellLost();
    g_lost += static_cast<unsigned>(count - Send(lines, count));
}

void LogConnectionSendInCrash(const iovec* lines, size_t count) {
    if (const int fd = g_fd.load(); fd >= 0) static_cast<void>(SendAll(fd, lines, count));
}
