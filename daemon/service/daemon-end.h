// Ends the daemon, by its own command or by force. Threads: one control program at a time.
#pragma once

#include "service/service-places.h"

// 0 when the daemon has ended; -1 (logged) when it cannot be found or ended.
[[nodiscard]] int EndDaemon(const ServicePlaces& places);
