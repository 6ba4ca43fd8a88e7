// Loads and writes filter files as records.
#pragma once

#include <string>
#include <string_view>

#include "filter/filter-record.h"

// 0; -1 on failure, the record is then empty. Unknown keys are accepted only in a file that says
// that it is newer: major 1 and minor at least 1.
[[nodiscard]] int ReadBlackFilterFile(BlackFilter& record, const std::string& path);
[[nodiscard]] int ReadWhiteFilterFile(WhiteFilter& record, const std::string& path);

// 0, -1 on failure. The file is readable by all and writable by its owner alone. A value is cut off
// where its written form would pass FILTER_MAX_WRITTEN bytes.
[[nodiscard]] int WriteBlackFilterFile(const BlackFilter& record, const std::string& path);
[[nodiscard]] int WriteWhiteFilterFile(const WhiteFilter& record, const std::string& path);

constexpr size_t FILTER_MAX_WRITTEN = 1023;

// The length of a value in a filter file, without its quotes and before it is cut off.
[[nodiscard]] size_t FilterWrittenLength(std::string_view value);
