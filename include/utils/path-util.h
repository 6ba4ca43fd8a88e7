// Parts of path texts. Nothing here touches the file system; paths are bytes.
#pragma once

#include <string>
#include <string_view>

// `path` with a "/" at its end; "/" for an empty path.
[[nodiscard]] std::string PathAddTrailingSlash(std::string_view path);
// `path` without any "/" at its end; empty for a path of slashes alone.
[[nodiscard]] std::string PathWithoutTrailingSlashes(std::string_view path);
// What stands before the last "/"; "." without one, "/" when the only one is the first character.
[[nodiscard]] std::string PathDirName(std::string_view path);
// What stands after the last "/", or the whole path.
[[nodiscard]] std::string PathBaseName(std::string_view path);
// What stands after the last "." of the base name; empty without one, and for a name whose only "."
// is its first character.
[[nodiscard]] std::string PathExtension(std::string_view path);
// The whole path without "." and extension; the path itself when it has no extension.
[[nodiscard]] std::string PathStem(std::string_view path);
