// The platform's key files: texts of lines key="value" in the box's own settings.
//
// Threads: any; each operation holds the lock of the layer for its platform call.
#pragma once

#include <cstddef>
#include <string>

namespace SDK {

// 1 with the value, cut to `size` - 1 bytes; 0 when the key or the file is missing, negative on an
// error; the value is then empty.
[[nodiscard]] int GetKeyValue(const std::string& file, const std::string& key, size_t size,
                              std::string& value);
// 1 when the key has this value; 0 for another one, and when the key or the file is missing;
// negative on an error.
[[nodiscard]] int CheckKeyValue(const std::string& file, const std::string& key,
                                const std::string& value);
// 0 or above, also when there is no such key; negative on an error.
[[nodiscard]] int RemoveKey(const std::string& file, const std::string& key);

}  // namespace SDK
