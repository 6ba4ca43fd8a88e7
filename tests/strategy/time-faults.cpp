#include "time-faults.h"

#include <dlfcn.h>

#include <atomic>
#include <ctime>

namespace {

std::atomic<int> g_shift{0};
std::atomic<bool> g_is_local_time_known{true};

template <typename Function>
Function Real(const char* name) {
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

}  // namespace

extern "C" {

int clock_gettime(clockid_t clock, timespec* now) noexcept {
    static const auto real = Real<int (*)(clockid_t, timespec*)>("clock_gettime");
    const int result = real(clock, now);
    if (result == 0 && clock == CLOCK_MONOTONIC) now->tv_sec += g_shift.load();
    return result;
}

tm* localtime_r(const time_t* time, tm* local) noexcept {
    static const auto real = Real<tm* (*)(const time_t*, tm*)>("localtime_r");
    return g_is_local_time_known ? real(time, local) : nullptr;
}

}  // extern "C"

MonotonicShift::~MonotonicShift() { g_shift = 0; }
void MonotonicShift::Advance(int seconds) { g_shift += seconds; }

NoLocalTime::NoLocalTime() { g_is_local_time_known = false; }
NoLocalTime::~NoLocalTime() { g_is_local_time_known = true; }
