// Reading and replacing small files whole.
#pragma once

#include <sys/stat.h>

#include <string>
#include <string_view>

namespace keld_host {

// Reads a regular file of at most `limit` bytes. Returns 0, or an errno: ENOENT when there is none,
// EFBIG beyond the limit, EINVAL for what is no regular file.
[[nodiscard]] int ReadFile(const std::string& path, size_t limit, std::string& content);
// The same, and tells what the file it has read is like (also when reading it fails after that).
[[nodiscard]] int ReadFile(const std::string& path, size_t limit, std::string& content,
                           struct stat& info);

// Puts a new file with this content in the place of `path`, in one step and flushed to the disk: a
// reader, or a machine whose power fails, sees the old file or the new one. `mode` is what the
// umask does not change. A link at `path` is not followed but replaced.
// Returns 0, or an errno; after a failure `path` is as it was.
[[nodiscard]] int ReplaceFile(const std::string& path, std::string_view content, unsigned mode);

}  // namespace keld_host
