#include "platform/log-header.h"

#include <syslog.h>

#include <algorithm>
#include <atomic>
#include <cstdio>
#include <cstring>
#include <ctime>

namespace {

constexpr size_t kPriorityRoom = 4;  // "<15"

std::atomic<const char*> g_identity{"ferrixd"};

}  // namespace

void SetLogIdentity(const char* identity) { g_identity = identity; }

// All but the priority stays the same for a second, and the local time is what costs.
size_t WriteLogHeader(char* out, int priority) {
    thread_local time_t last = -1;
    thread_local const char* identity = nullptr;
    thread_local char rest[LOG_HEADER_ROOM - kPriorityRoom];
    thread_local size_t rest_size = 0;
    timespec now{};
    clock_gettime(CLOCK_REALTIME_COARSE, &now);
    const char* const current = g_identity.load(std::memory_order_relaxed);
    if (now.tv_sec != last || current != identity) {
        tm local{};
        localtime_r(&now.tv_sec, &local);
        char stamp[20];
        strftime(stamp, sizeof(stamp), "%b %e %H:%M:%S", &local);
        const int length = snprintf(rest, sizeof(rest), ">%s %s: ", stamp, current);
        rest_size = std::min(static_cast<size_t>(length), sizeof(rest) - 1);
        last = now.tv_sec;
        identity = current;
    }
    const int number = LOG_USER | priority;
    size_t at = 0;
    out[at++] = '<';
    if (number >= 10) out[at++] = static_cast<char>('0' + number / 10);
    out[at++] = static_cast<char>('0' + number % 10);
    std::memcpy(out + at, rest, rest_size);
    return at + rest_size;
}
