// Small files of our own that have to survive a power cut: whole, in the old or the new form.
// Threads: any; one writer of a file at a time.
#pragma once

#include <string>

// 1 with the content, 0 when there is no such file, -1 when it cannot be told; errno says why.
[[nodiscard]] int ReadDurableFile(const std::string& path, std::string& content);
// On the disk, readable by its owner alone, when it returns 0; -1 with errno, and the old content
// stays.
[[nodiscard]] int WriteDurableFile(const std::string& path, const std::string& content);
// Gone for good when it returns 0, also when there was none; -1 with errno.
[[nodiscard]] int RemoveDurableFile(const std::string& path);
