// Where the control side finds the daemon, and how long it waits for it. Fixed, but for tests.
#pragma once

#include <string>

#include "ipc/daemon-ipc.h"
#include "updater/default-task.h"

struct ServicePlaces {
    std::string pid_file = "/var/run/ferrixd.pid";
    std::string socket_path = DaemonIPC::SOCKET_PATH;
    BoxConfigPaths box_config{};
    int kill_wait_ms = 1000;    // between two looks at a daemon that is to end, ten times
    int start_wait_ms = 10000;  // at most, until a daemon that was started runs or has ended
};
