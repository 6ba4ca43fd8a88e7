#include "service/daemon-end.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstring>
#include <thread>

#include "ipc/pobject.h"
#include "platform/sdk-service.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

using Clock = std::chrono::steady_clock;

constexpr int LOOKS = 10;

bool AskToStop(const ServicePlaces& places) {
    PObject request;
    request["action"] = "stop";
    request["need_ack"] = false;
    PObject response;
    if (DaemonIPC(places.socket_path).SendCommand(request, response) == 0) return true;
    SLOG_ERR("StopDaemon: Ferrix failed to stop daemon, try to kill it.\n");
    return false;
}

bool IsGone(pid_t pid) { return kill(pid, 0) != 0 && errno == ESRCH; }

int LeftMs(Clock::time_point end) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - Clock::now()).count();
    return static_cast<int>(std::max<decltype(left)>(left, 0));
}

// Waits for the end of the process, at most for this time. True when it has ended, also when nobody
// has taken in its exit status yet.
bool WaitForEnd(pid_t pid, int timeout_ms) {
    const UniqueFd watch(static_cast<int>(syscall(SYS_pidfd_open, pid, 0)));
    pollfd event{watch.Get(), POLLIN, 0};
    const auto end = Clock::now() + std::chrono::milliseconds(timeout_ms);
    int count = 0;
    do {
        // A kernel that cannot watch a process: the time passes, and the caller looks again.
        count = poll(&event, watch.IsValid() ? 1 : 0, LeftMs(end));
    } while (count < 0 && errno == EINTR);
    return count > 0;
}

// True while a process takes connections there.
bool IsServed(const std::string& socket_path) {
    const UniqueFd fd(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (!fd.IsValid() || socket_path.size() >= sizeof(address.sun_path)) return false;
    socket_path.copy(address.sun_path, socket_path.size());
    const int result =
        connect(fd.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address));
    return result == 0 || (errno != ENOENT && errno != ECONNREFUSED);
}

// The daemon removes its pid file last, after its socket. A daemon whose file somebody else has
// removed is known by the socket.
bool HasRemovedPidFile(const ServicePlaces& places) {
    if (access(places.pid_file.c_str(), F_OK) == 0 || errno != ENOENT) return false;
    for (int look = 0; look < LOOKS; ++look) {
        if (!IsServed(places.socket_path)) return true;
        std::this_thread::sleep_for(std::chrono::milliseconds(places.kill_wait_ms));
    }
    return false;
}

// The pid file is the daemon's own to remove; here it goes when the daemon has ended without doing
// so. Who starts the daemon next must not find it still there.
void RemovePidFile(const ServicePlaces& places) { unlink(places.pid_file.c_str()); }

int KillByForce(pid_t pid, const ServicePlaces& places) {
    kill(pid, SIGKILL);
    SLOG_INFO("forcelly kill daemon\n");
    if (IsGone(pid) || WaitForEnd(pid, places.kill_wait_ms)) RemovePidFile(places);
    return 0;
}

int KillDaemon(pid_t pid, const ServicePlaces& places) {
    if (kill(pid, SIGTERM) != 0) {
        if (errno != ESRCH) {
            SLOG_ERR("Kill daemon: %s (%d)\n", std::strerror(errno), errno);
            return -1;
        }
        SLOG_INFO("pid does not exist\n");
        RemovePidFile(places);
        return 0;
    }
    for (int look = 0; look < LOOKS; ++look) {
        if (IsGone(pid) || WaitForEnd(pid, places.kill_wait_ms)) {
            SLOG_INFO("daemon is dead\n");
            RemovePidFile(places);
            return 0;
        }
    }
    return KillByForce(pid, places);
}

}  // namespace

int EndDaemon(const ServicePlaces& places) {
    const bool is_asked = AskToStop(places);
    const pid_t pid = SDK::ReadPidFile(places.pid_file);
    if (pid > 1) {
        if (KillDaemon(pid, places) == 0) return 0;
    } else if (is_asked && HasRemovedPidFile(places)) {
        SLOG_INFO("daemon is dead\n");
        return 0;
    } else {
        SLOG_ERR("Failed to read '%s'\n", places.pid_file.c_str());
    }
    SLOG_ERR("Failed to kill daemon\n");
    return -1;
}
