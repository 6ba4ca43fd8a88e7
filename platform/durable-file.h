// Small files of our own that have to survive a power cut: whole, in the old or the new form.
// Threads: any; one writer of a file at a time.
#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>

// 1 with the content, 0 when there is no such file, -1 when it cannot be told; errno says why.
[[nodiscard]] int ReadDurableFile(const std::string& path, std::string& content);
// On the disk, with this mode whatever the umask, when it returns 0; -1 with errno, and the old
// content stays. A link at `path` is replaced, and what is no file (a device, a folder) refused.
[[nodiscard]] int WriteDurableFile(const std::string& path, std::string_view content,
                                   mode_t mode = 0600);
// Gone for good when it returns 0, also when there was none; -1 with errno.
[[nodiscard]] int RemoveDurableFile(const std::string& path);
