// The process: becomes a daemon, links the application, serves the socket until it shall end.
//
// Threads: all of it runs on the main thread, which does all reading and writing of the socket.
#pragma once

#include <string>

#include "daemon/app.h"
#include "daemon/daemon-util.h"

class IPCListener;
struct ServiceStatus;

class USBDaemon : public Daemon {
public:
    USBDaemon() = default;
    ~USBDaemon() override = default;

    int Run() override;

private:
    friend class USBDaemonPeer;  // the unit tests' way in

    // Links, tells that the service runs, and serves. Returns 0 after an orderly end, -1 on
    // failure.
    int ServeUntilStopped(ServiceStatus& status);
    // Runs "link" through the queue that serves the clients. Returns 0 or -1.
    int LinkDaemon();
    // Serves clients, one after another, until a signal or "stop". Returns 0, or -1 when it cannot
    // listen.
    int RecieveFromIPC();
    // Waits a while for one client and serves it. False when the client has stopped the daemon.
    bool ServeOneClient(const IPCListener& listener);

    Ferrixd m_app;
    std::string m_pid_file = "/var/run/ferrixd.pid";
};
