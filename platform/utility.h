// Small tests and values that all layers share. Threads: any.
#pragma once

#include <cstdint>
#include <ctime>
#include <string>

// True unless the id is 0; for task ids and device ids alike.
[[nodiscard]] bool IsValidID(uint64_t id);

// A copy in lower case, byte by byte.
[[nodiscard]] std::string ToLower(const std::string& text);

// Asks the platform once whether this model has front ports for default tasks, and keeps the
// answer; it is no before that.
void InitDeviceSupport();
[[nodiscard]] bool IsDeviceSupported();

// Formats a broken-down time as strftime(3) does, up to 1023 bytes. Returns 0, or -1 with `out`
// unchanged when nothing comes out (too long, or an empty format).
[[nodiscard]] int GetTimeString(const struct tm& time, const char* format, std::string& out)
    __attribute__((format(strftime, 2, 0)));
