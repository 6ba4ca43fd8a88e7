#include "daemon/daemon-util.h"

#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "daemon/process-shell.h"
#include "utils/log.h"

static_assert(std::atomic<int>::is_always_lock_free, "signal handlers write them");

std::atomic<int> Daemon::log_level{3};
std::atomic<int> Daemon::daemon_run{1};

void Daemon::increaseLogLevel(int /*signal*/, siginfo_t* /*info*/, void* /*context*/) {
    ++log_level;
}

void Daemon::decreateLogLevel(int /*signal*/, siginfo_t* /*info*/, void* /*context*/) {
    int level = log_level.load();
    while (level != 0 && !log_level.compare_exchange_weak(level, level - 1)) {
    }
}

void Daemon::stop(int /*signal*/, siginfo_t* /*info*/, void* /*context*/) { daemon_run = 0; }

int BecomeDaemon(const std::string& pid_file) {
    if (pid_t pid = 0; IsDaemonRunning(pid_file, &pid)) {
        SLOG_DBG("daemon is already running (pid = %d)\n", static_cast<int>(pid));
        return -1;
    }
    LogClose();
    CloseInheritedDescriptors();
    umask(0);
    if (daemon(0, 0) != 0) {
        SLOG_ERR("failed to become daemon (%s)\n", std::strerror(errno));
        return -1;
    }
    InstallSignalHandlers();
    if (WritePidFile(pid_file) != 0) {
        SLOG_ERR("failed to create pid file at '%s'\n", pid_file.c_str());
        return -1;
    }
    return 0;
}
