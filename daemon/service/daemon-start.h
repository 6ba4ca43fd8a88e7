// Runs the daemon and sees that it lives. Threads: one control program at a time.
#pragma once

#include "service/service-places.h"

// 0 when the daemon runs, or is still about to after the whole wait; -1 (logged) when it could not
// be run or has ended. The state of the service must not be RUNNING before.
[[nodiscard]] int StartDaemon(const ServicePlaces& places);
