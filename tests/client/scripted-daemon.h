// A daemon of one's own making for client programs: answers each request as the test says.
#pragma once

#include <atomic>
#include <functional>
#include <optional>
#include <string>
#include <thread>

#include "ipc/pobject.h"
#include "ipc/simple-ipc.h"

class ScriptedDaemon {
public:
    // Called on the daemon's thread; no answer hangs up.
    using Answer = std::function<std::optional<PObject>(const PObject& request)>;

    ScriptedDaemon(const std::string& path, Answer answer);
    // Returns when no request is being answered any more.
    ~ScriptedDaemon();
    ScriptedDaemon(const ScriptedDaemon&) = delete;
    ScriptedDaemon& operator=(const ScriptedDaemon&) = delete;

private:
    void ServeOne();

    Answer m_answer;
    IPCListener m_listener{
        timeval{0, 20000}
    };
    std::atomic<bool> m_is_ending{false};
    std::thread m_thread;
};
