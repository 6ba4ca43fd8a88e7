// Changes to the [share ...] sections in the text of host.conf. Everything else stays byte for
// byte: other sections, comments, order, line ends.
//
// Each takes a text that ParseHostConf accepts, and paths as that gives them. The changed text has
// been read again: no value means that it would not say what was wanted, since the format cannot
// hold the path or there is no such share.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace keld_host {

// Whether there is a section [share `label`], whatever its path.
[[nodiscard]] bool HasShareSection(const std::string& text, std::string_view label);

// A section at the end, named by the last component of the path.
[[nodiscard]] std::optional<std::string> WithShareAdded(const std::string& text,
                                                        const std::string& path);
// Without the section of the share at `path`, from its header to its last key.
[[nodiscard]] std::optional<std::string> WithShareRemoved(const std::string& text,
                                                          const std::string& path);
// The section of the share at `path` says `newPath`, and its header the last component of that.
[[nodiscard]] std::optional<std::string> WithShareMoved(const std::string& text,
                                                        const std::string& path,
                                                        const std::string& newPath);

}  // namespace keld_host
