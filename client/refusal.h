// What a refusal of the daemon means for the person who asked, and what to do about it.
#pragma once

#include <string>

// The daemon's own text, followed by advice where we have any. `action` is the command that was
// refused, `code` and `text` are of the answer.
[[nodiscard]] std::string ExplainRefusal(const std::string& action, int code,
                                         const std::string& text);
