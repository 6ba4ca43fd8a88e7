// The listening end of a domain socket.
//
// Threads: belongs to one thread. Ownership: owns the descriptor and the socket file; the
// destructor stops listening and removes the file.
#pragma once

#include <sys/time.h>

#include <string>

class IPCListener {
public:
    // Waits for a client for at most `wait_timeout`.
    explicit IPCListener(const timeval& wait_timeout = {3, 0});
    IPCListener(const IPCListener&) = delete;
    IPCListener& operator=(const IPCListener&) = delete;
    ~IPCListener();

    // Listens at a path, replacing a file left there. Returns 0 or -1; -1 when it already listens,
    // and the first socket stays.
    [[nodiscard]] int Listen(const std::string& path);
    // True when a client is ready; false after the timeout, a signal or an error.
    [[nodiscard]] bool Wait() const;
    // A connected descriptor that the caller owns, or -1.
    [[nodiscard]] int Accept() const;
    // Closes the socket and removes its file. Harmless when not listening.
    void Stop();

private:
    timeval m_wait_timeout;
    int m_descriptor = -1;
    std::string m_path;  // empty while not listening
};
