#include "service/daemon-end.h"

#include <poll.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstring>

#include "ipc/pobject.h"
#include "platform/sdk-service.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

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

// Waits for the end of the process, at most for this time. True when it has ended, also when nobody
// has taken in its exit status yet.
bool WaitForEnd(pid_t pid, int timeout_ms) {
    const UniqueFd watch(static_cast<int>(syscall(SYS_pidfd_open, pid, 0)));
    pollfd event{watch.Get(), POLLIN, 0};
    // A kernel that cannot watch a process: the time passes, and the caller looks again.
    return poll(&event, watch.IsValid() ? 1 : 0, timeout_ms) > 0;
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
    } else if (is_asked && access(places.pid_file.c_str(), F_OK) != 0 && errno == ENOENT) {
        // Its last act is to remove the file.
        SLOG_INFO("daemon is dead\n");
        return 0;
    } else {
        SLOG_ERR("Failed to read '%s'\n", places.pid_file.c_str());
    }
    SLOG_ERR("Failed to kill daemon\n");
    return -1;
}
