#include "service/daemon-start.h"

#include <unistd.h>

#include <chrono>
#include <csignal>

#include "platform/package-paths.h"
#include "platform/sdk-service.h"
#include "platform/service-status.h"
#include "utils/log.h"

namespace {

using Clock = std::chrono::steady_clock;

constexpr int LOOK_MS = 10;

bool IsAlive(const ServicePlaces& places) {
    if (access(places.pid_file.c_str(), F_OK) != 0) return false;
    const pid_t pid = SDK::ReadPidFile(places.pid_file);
    return pid > 1 && kill(pid, 0) == 0;
}

// A state that cannot be read is not waited for.
bool SaysThatItRuns() {
    ServiceStatus status;
    return GetServiceStatus(status) < 0 || status.state == SERVICE_STATE_RUNNING;
}

// The program ends well before the daemon that it has become can be found, and whatever becomes of
// that: its pid file comes first, then the state, and without the state it removes the file again.
bool WaitForDaemon(const ServicePlaces& places) {
    const auto end = Clock::now() + std::chrono::milliseconds(places.start_wait_ms);
    for (bool was_alive = false;;) {
        const bool is_alive = IsAlive(places);
        if (is_alive && SaysThatItRuns()) return true;
        if (was_alive && !is_alive) return false;
        if (Clock::now() >= end) return is_alive;
        was_alive = is_alive;
        usleep(LOOK_MS * 1000);
    }
}

}  // namespace

int StartDaemon(const ServicePlaces& places) {
    if (SDK::RunProgram(PackagePath("/target/sbin/ferrixd"), {}) == 0 && WaitForDaemon(places)) {
        return 0;
    }
    SLOG_ERR("Failed to start daemon\n");
    return -1;
}
