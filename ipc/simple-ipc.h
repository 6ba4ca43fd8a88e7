// The listening end of a domain socket, or of a port of 127.0.0.1.
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
    // Listens on this one port, which is above 0. Returns 0 or -1; -1 when it already listens, and
    // the first socket stays.
    [[nodiscard]] int Listen(int port);
    // Listens on the first free port from this one upwards, 0 being any that the system chooses.
    // What it listened on before is closed first. Returns the port in use, or -1 and does not
    // listen.
    [[nodiscard]] int ListenOnPort(int first_port);
    // True when a client is ready; false after the timeout, a signal or an error.
    [[nodiscard]] bool Wait() const;
    // A connected descriptor that the caller owns, or -1.
    [[nodiscard]] int Accept() const;
    // Closes the socket and removes its file. Harmless when not listening.
    void Stop();

private:
    [[nodiscard]] int MakePortSocket();
    [[nodiscard]] int StartOnPort();

    timeval m_wait_timeout;
    int m_descriptor = -1;
    std::string m_path;  // empty while not listening or listening on a port
};
