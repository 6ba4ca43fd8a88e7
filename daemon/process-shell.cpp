#include "daemon/process-shell.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <memory>

#include "daemon/daemon-util.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

constexpr int kFirstInherited = 3;
constexpr mode_t kPidFileMode = 0644;

using UniqueFile = std::unique_ptr<FILE, FreeWith<fclose>>;
using SignalHandler = void (*)(int, siginfo_t*, void*);

void HandleSignal(int signal, SignalHandler handler) {
    struct sigaction action {};
    if (sigemptyset(&action.sa_mask) != 0) {
        SLOG_ERR("sigemptyset(%d): %s (%d)\n", signal, std::strerror(errno), errno);
    }
    action.sa_flags = SA_SIGINFO | SA_NODEFER;
    action.sa_sigaction = handler;
    if (sigaction(signal, &action, nullptr) != 0) {
        SLOG_ERR("sigaction(%d): %s (%d)\n", signal, std::strerror(errno), errno);
    }
}

// A whole number of a process; 0 and below would stand for a group.
bool ReadPid(FILE* file, pid_t* pid) {
    int number = 0;
    if (fscanf(file, "%d\n", &number) != 1 || number <= 0) return false;
    *pid = number;
    return true;
}

bool WritePid(int fd) {
    char text[16];
    const int length = snprintf(text, sizeof(text), "%d\n", static_cast<int>(getpid()));
    return write(fd, text, static_cast<size_t>(length)) == length;
}

}  // namespace

bool IsDaemonRunning(const std::string& pid_file, pid_t* pid) {
    if (access(pid_file.c_str(), F_OK) != 0) {
        SLOG_DBG("cannot access pid file at '%s', daemon is not running\n", pid_file.c_str());
        return false;
    }
    const UniqueFile file(fopen(pid_file.c_str(), "re"));
    if (file == nullptr) {
        SLOG_ERR("cannot open pid file at '%s', daemon is not running\n", pid_file.c_str());
        return false;
    }
    if (!ReadPid(file.get(), pid)) {
        SLOG_ERR("cannot find pid int pid file at '%s', daemon is not running\n", pid_file.c_str());
        return false;
    }
    if (kill(*pid, 0) == 0) return true;
    SLOG_INFO("kill: %s (%d)\n", std::strerror(errno), errno);
    return false;
}

void CloseInheritedDescriptors(bool use_close_range) {
    if (use_close_range && close_range(kFirstInherited, UINT_MAX, 0) == 0) return;
    const long end = sysconf(_SC_OPEN_MAX);
    for (int fd = kFirstInherited; fd < end; ++fd) close(fd);
}

void InstallSignalHandlers() {
    if (signal(SIGPIPE, SIG_IGN) == SIG_ERR) {
        SLOG_ERR("signal(%d): %s (%d)\n", SIGPIPE, std::strerror(errno), errno);
    }
    HandleSignal(SIGINT, Daemon::stop);
    HandleSignal(SIGTERM, Daemon::stop);
    HandleSignal(SIGUSR1, Daemon::increaseLogLevel);
    HandleSignal(SIGUSR2, Daemon::decreateLogLevel);
}

// The mode is given at once, not after the fact: with an umask of 0 the file would else be writable
// by everybody for a moment.
int WritePidFile(const std::string& pid_file) {
    UniqueFd fd(open(pid_file.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW,
                     kPidFileMode));
    const bool is_written =
        fd.IsValid() && WritePid(fd.Get()) && fchmod(fd.Get(), kPidFileMode) == 0;
    if (fd.Close() == 0 && is_written) return 0;
    SLOG_ERR("failed to create pid file at '%s'\n", pid_file.c_str());
    return -1;
}
