// The parser of filter files: sections in brackets, lines "key = value".
//
//   [Common]
//   black_name = "tmp", "cache",    # a comma at the end goes on in the next line
//       "core"
//   max_length = 255
//
// Values are numbers, strings between double quotes (with the escapes of C) and lists of strings.
// A line is at most MAX_LINE characters; what follows is parsed as a line of its own.
// Threads: any.
#pragma once

#include <cstddef>
#include <string>

#include "filter/filter-schema.h"

enum FilterParseResult : int {
    FILTER_PARSED = 0,
    FILTER_PARSED_WITH_UNKNOWN_KEYS = 1,
    FILTER_PARSE_FAILED = 2,
};

constexpr size_t FILTER_MAX_LINE = 6144;
constexpr size_t FILTER_MAX_NAME = 32;      // of sections and keys
constexpr size_t FILTER_MAX_STRING = 1024;  // bytes of a value, escapes resolved

// Reads a file into the record that the schema describes, a fresh WhiteFilter or BlackFilter.
// A FilterParseResult; a file that cannot be read has failed. A syntax error is told on standard
// error, an unknown key on standard output. After a failure the record holds what came before it.
[[nodiscard]] int ParseConfigFile(const std::string& path, const FilterSchema& schema,
                                  void* record);
