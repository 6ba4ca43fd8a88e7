// The state of the service, which other programs read from the file etc/status of the package.
#pragma once

#include <string>

constexpr int SERVICE_STATE_RUNNING = 4;  // the only state that the daemon itself writes

struct ServiceStatus {
    int state = 0;
    std::string error;  // a token such as "err_sys"; empty when there is none
};

// Writes the state under the lock file, which is made when it is missing; waits for another process
// that holds the lock. Returns 0 or -1 (logged; the state may then be written without the error).
// Threads: any.
[[nodiscard]] int SetServiceStatus(const ServiceStatus& status);
