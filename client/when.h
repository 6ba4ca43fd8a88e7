// Times as people write them on a command line: "2026-11-21", "2026-11-21 12:30",
// "2026-11-21T12:30:05", "today", "yesterday", "12:30" (of today), and "30min", "2h", "3d", "2w"
// ago.
//
// All are local time. "3d" ago has the present time of day, also across a change of the clocks. A
// time that the clocks pass twice is taken as the first or the last of the two, one that they leave
// out as the moment of the change.
#pragma once

#include <cstdint>
#include <ctime>
#include <string>

// A date is a day long, "12:30" a minute: which second of it is meant.
enum class WhenEdge { BEGIN, END };

// Seconds since the epoch, 1 at least: the nearest that a log row can have. EXIT_USAGE
// (CommandError), with examples, for any other text.
[[nodiscard]] uint32_t ParseWhen(const std::string& text, WhenEdge edge, time_t now);
