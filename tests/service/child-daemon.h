// A process that stands for the daemon: it has a pid file, may listen for "stop", and ends at
// SIGTERM and "stop" or does not care for one of them.
#pragma once

#include <sys/types.h>

#include <string>

class ChildDaemon {
public:
    enum Manner { ENDS_AT_SIGTERM, IGNORES_SIGTERM, IGNORES_STOP };

    // Without a socket path it does not listen.
    ChildDaemon(const std::string& pid_file, Manner manner, const std::string& socket_path = "");
    ~ChildDaemon();
    ChildDaemon(const ChildDaemon&) = delete;
    ChildDaemon& operator=(const ChildDaemon&) = delete;

    // Waits for the end, which must have been brought about. The signal that ended it, 0 when it
    // ended by itself.
    int EndSignal();
    // True while it has not ended.
    [[nodiscard]] bool IsRunning();

private:
    pid_t m_pid;
};
