#include "utils/log.h"

#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <memory>

#include "utils/mutex-lock.h"

namespace {

constexpr char kSocketPath[] = "/dev/log";
constexpr size_t kStackLine = 2048;  // a usual line has 100 to 300 bytes
constexpr size_t kHeaderRoom = 96;   // priority, time and identity
// After a stall the next attempt to wait comes this much later; in between lines go out only if
// the log daemon takes them at once.
constexpr int64_t kStallPauseMs = 5000;

std::atomic<LogSink> g_sink{nullptr};
std::atomic<const char*> g_identity{"ferrixd"};
std::atomic<int> g_fd{-1};
std::atomic<unsigned> g_lost{0};
std::atomic<int64_t> g_stalled_until{0};
std::atomic<int64_t> g_connect_after{0};
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
    std::strncpy(address.sun_path, kSocketPath, sizeof(address.sun_path) - 1);
    if (connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
        close(fd);
        g_connect_after = now + 1000;  // no log daemon: look for one once a second, not per line
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

// Sends one datagram; waits for a log daemon that is behind, but only so long.
bool SendOnce(int fd, const char* data, size_t size) {
    for (bool waited = false;;) {
        if (send(fd, data, size, MSG_NOSIGNAL) >= 0) return true;
        if (errno == EINTR) continue;
        if ((errno != EAGAIN && errno != ENOBUFS) || waited) return false;
        if (NowMs() < g_stalled_until.load()) return false;
        pollfd entry{fd, POLLOUT, 0};
        if (poll(&entry, 1, LOG_STALL_MS) <= 0) {
            g_stalled_until = NowMs() + kStallPauseMs;
            waited = true;
        }
    }
}

bool IsConnectionLost(int error) {
    return error == ECONNREFUSED || error == ENOTCONN || error == ECONNRESET || error == EPIPE ||
           error == EBADF || error == EDESTADDRREQ;
}

bool Send(const char* data, size_t size) {
    int fd = g_fd.load();
    if (fd < 0) fd = Connect();
    if (fd < 0) return false;
    if (SendOnce(fd, data, size)) return true;
    if (!IsConnectionLost(errno)) return false;
    fd = Connect();
    return fd >= 0 && SendOnce(fd, data, size);
}

// "<PRI>Mmm dd hh:mm:ss identity: ", the local time worked out once a second for each thread.
size_t WriteHeader(char* out, int priority) {
    thread_local time_t last = -1;
    thread_local char stamp[20] = "";
    timespec now{};
    clock_gettime(CLOCK_REALTIME_COARSE, &now);
    if (now.tv_sec != last) {
        tm local{};
        localtime_r(&now.tv_sec, &local);
        strftime(stamp, sizeof(stamp), "%b %e %H:%M:%S", &local);
        last = now.tv_sec;
    }
    const int length = snprintf(out, kHeaderRoom, "<%d>%s %s: ", LOG_USER | priority, stamp,
                                g_identity.load(std::memory_order_relaxed));
    return static_cast<size_t>(length) < kHeaderRoom ? static_cast<size_t>(length)
                                                     : kHeaderRoom - 1;
}

void Deliver(const char* data, size_t size) {
    const unsigned lost = g_lost.load(std::memory_order_relaxed);
    if (lost != 0) {
        char note[256];
        const size_t header = WriteHeader(note, LOG_WARNING);
        const int text =
            snprintf(note + header, sizeof(note) - header,
                     "[WARN] %s(%d): %u log lines were lost\n", __FILE__, __LINE__, lost);
        if (Send(note, header + static_cast<size_t>(text))) g_lost -= lost;
    }
    if (!Send(data, size)) ++g_lost;
}

}  // namespace

void LogOpen(const char* identity) {
    g_identity = identity;
    g_connect_after = 0;
    Connect();
}

void LogClose() {
    const MutexLock lock(g_connect_mutex);
    const int fd = g_fd.exchange(-1);
    if (fd >= 0) close(fd);
    g_connect_after = 0;
}

void LogSetSink(LogSink sink) { g_sink = sink; }

void LogWrite(int priority, const char* format, ...) {
    const int saved_errno = errno;  // texts are often followed by a look at errno
    char stack_line[kStackLine];
    const LogSink sink = g_sink.load(std::memory_order_relaxed);
    const size_t header = sink != nullptr ? 0 : WriteHeader(stack_line, priority);

    va_list arguments;
    va_start(arguments, format);
    const int length =
        vsnprintf(stack_line + header, sizeof(stack_line) - header, format, arguments);
    va_end(arguments);
    if (length < 0) return;

    const size_t size = header + static_cast<size_t>(length);
    char* line = stack_line;
    std::unique_ptr<char[]> heap_line;
    if (size >= sizeof(stack_line)) {
        heap_line = std::make_unique<char[]>(size + 1);
        std::memcpy(heap_line.get(), stack_line, header);
        va_start(arguments, format);
        vsnprintf(heap_line.get() + header, size + 1 - header, format, arguments);
        va_end(arguments);
        line = heap_line.get();
    }
    if (sink != nullptr) {
        sink(priority, std::string_view(line, size));
    } else {
        Deliver(line, size);
    }
    errno = saved_errno;
}
