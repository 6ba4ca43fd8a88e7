// Reads one setting out of a request and tells whether it changes what is stored.
//
// Each gives the value sent in `value` (empty, false or 0 when the key is absent) and returns true
// when the key was sent and its value differs from `old_value`. Threads: any.
#pragma once

#include <cstdint>
#include <string>

class PObject;

// An empty text counts as not sent; a text ends at its first NUL byte.
[[nodiscard]] bool GetChangedString(const PObject& request, const std::string& key,
                                    const std::string& old_value, std::string& value);
[[nodiscard]] bool GetChangedBool(const PObject& request, const std::string& key, bool old_value,
                                  bool& value);
[[nodiscard]] bool GetChangedInt(const PObject& request, const std::string& key, int old_value,
                                 int& value);
[[nodiscard]] bool GetChangedUInt64(const PObject& request, const std::string& key,
                                    uint64_t old_value, uint64_t& value);
