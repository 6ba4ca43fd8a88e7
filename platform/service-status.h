// The state of the service, which other programs read from the file etc/status of the package.
#pragma once

#include <string>

// The numbers are read by other programs and never change.
constexpr int SERVICE_STATE_WAITING = 1;  // for a volume that can hold the repository
constexpr int SERVICE_STATE_INITIALISING = 2;
constexpr int SERVICE_STATE_UPGRADING = 3;
constexpr int SERVICE_STATE_RUNNING = 4;  // the only state that the daemon itself writes
constexpr int SERVICE_STATE_MOVING = 5;   // the repository, to another volume
constexpr int SERVICE_STATE_STOPPED = 6;
constexpr int SERVICE_STATE_ERROR = 7;

struct ServiceStatus {
    int state = 0;
    std::string error;  // a token such as "err_sys"; empty when there is none
};

// Writes the state under the lock file, which is made when it is missing; waits for another process
// that holds the lock. Returns 0 or -1 (logged; the state may then be written without the error).
// Threads: any.
[[nodiscard]] int SetServiceStatus(const ServiceStatus& status);

// Reads it under the same lock. 0, or -1 (logged), as when no state was ever written; `status` is
// then unchanged.
[[nodiscard]] int GetServiceStatus(ServiceStatus& status);
