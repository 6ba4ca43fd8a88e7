// What stands before each line in its datagram: "<PRI>Mmm dd hh:mm:ss identity: ".
#pragma once

#include <cstddef>

constexpr size_t LOG_HEADER_ROOM = 96;

// A literal; kept by pointer.
void SetLogIdentity(const char* identity);

// Writes at most LOG_HEADER_ROOM bytes, without a terminating zero; returns how many. The time is
// local time. Any thread.
[[nodiscard]] size_t WriteLogHeader(char* out, int priority);
