// Texts for people: names that may hold anything made safe to show, sizes, times, and columns.
//
// Names are bytes. What a terminal would take as an order (escape sequences, line ends, characters
// that turn the reading direction) and what is no UTF-8 is shown as "\xNN", so that a hostile file
// name is just a name. Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <ctime>
#include <string>
#include <string_view>

[[nodiscard]] std::string Printable(std::string_view bytes);
// Columns that a printable text takes on a terminal.
[[nodiscard]] size_t DisplayWidth(std::string_view text);
// The text, at most `width` columns of it; its middle is replaced by "..." when it is longer.
[[nodiscard]] std::string Shortened(const std::string& text, size_t width);
// The text followed by blanks up to `width` columns.
[[nodiscard]] std::string Padded(const std::string& text, size_t width);

// "0 B", "980 B", "1.5 kB", "2.1 GB": powers of 1000, as disks are sold.
[[nodiscard]] std::string SizeText(uint64_t bytes);
// "7 s", "3 min 05 s", "2 h 07 min".
[[nodiscard]] std::string DurationText(uint64_t seconds);
// "2026-11-21 19:04:33", local time; "never" for 0.
[[nodiscard]] std::string TimeText(time_t time);
