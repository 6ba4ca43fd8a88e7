// Small helpers for texts: filling a caller's buffer, prefixes of paths, trimming, lists of globs.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace keld_host {

// Copies `text` with its NUL; false (and an empty buffer, when there is one) when there is no room.
[[nodiscard]] bool FillBuffer(std::string_view text, char* buffer, size_t size);
// Whether `path` is `root` or lies below it, component by component.
[[nodiscard]] bool IsSameOrBelow(std::string_view path, std::string_view root);
// The path without doubled slashes and without one at the end ("/" stays).
[[nodiscard]] std::string CleanPath(std::string_view path);
// What stands before the last slash; "/" for a path directly in the root.
[[nodiscard]] std::string ParentOf(std::string_view path);
[[nodiscard]] std::string_view BaseNameOf(std::string_view path);
[[nodiscard]] std::string_view Trim(std::string_view text);
// The items of a comma-separated list, trimmed, without empty ones.
[[nodiscard]] std::vector<std::string> SplitList(std::string_view text);
// Whether one of the globs (fnmatch) matches the whole of `text`.
[[nodiscard]] bool MatchesAny(const std::vector<std::string>& globs, const std::string& text);
// The content of a small file, trimmed; empty when it cannot be read. For attributes in sysfs.
[[nodiscard]] std::string ReadAttribute(const std::string& path);
// The same below an open folder.
[[nodiscard]] std::string ReadAttributeAt(int folder, const char* name);

}  // namespace keld_host
