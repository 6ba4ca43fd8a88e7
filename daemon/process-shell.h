// The steps of becoming a daemon.
#pragma once

#include <sys/types.h>

#include <string>

// True when the pid file names a process that lives; *pid is then that process. A file that cannot
// be read, that holds no number, or whose process is gone counts as "not running".
[[nodiscard]] bool IsDaemonRunning(const std::string& pid_file, pid_t* pid);

// Closes every descriptor from 3 up. Without `use_close_range` one at a time, as on a kernel that
// has no call for the whole range.
void CloseInheritedDescriptors(bool use_close_range = true);

// SIGPIPE is ignored; SIGINT and SIGTERM stop the daemon, SIGUSR1 and SIGUSR2 change the log level.
// A failure is logged and nothing more.
void InstallSignalHandlers();

// Writes the number of this process; the file has mode 0644 whatever the umask. Returns 0 or -1.
[[nodiscard]] int WritePidFile(const std::string& pid_file);
