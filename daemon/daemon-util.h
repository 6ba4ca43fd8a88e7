// The process as a daemon: its signals, and how it becomes one.
#pragma once

#include <atomic>
#include <csignal>
#include <string>

class Daemon {
public:
    virtual ~Daemon() = default;
    // Runs to the end of the process. Returns 0 on a clean end, -1 on failure.
    virtual int Run() = 0;

    // Raised and lowered by SIGUSR1 and SIGUSR2. Nothing reads it: which lines are kept is left to
    // the system's logger.
    static std::atomic<int> log_level;
    // Non-zero while the socket loop shall go on.
    static std::atomic<int> daemon_run;

    // Signal handlers: they touch the two values above and nothing else.
    static void increaseLogLevel(int signal, siginfo_t* info, void* context);
    static void decreateLogLevel(int signal, siginfo_t* info, void* context);
    static void stop(int signal, siginfo_t* info, void* context);
};

// Turns the process into a background daemon: refuses when the pid file names a live process,
// closes every descriptor from 3 up, detaches, installs the signal handlers, writes the pid file.
// Called before any thread is made. Returns 0, or -1 (the pid file is not removed).
[[nodiscard]] int BecomeDaemon(const std::string& pid_file);
