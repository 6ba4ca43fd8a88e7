// What a refusal of the daemon means for the person who asked, and what to do about it.
#pragma once

#include <string>

#include "client/exit-status.h"

// The daemon's own text, followed by advice where we have any. `action` is the command that was
// refused, `code` and `text` are of the answer.
[[nodiscard]] std::string ExplainRefusal(const std::string& action, int code,
                                         const std::string& text);

constexpr int REFUSED_NO_DESTINATION = 10;  // the folder to copy to is not there

// Ends a command that the daemon has refused, with EXIT_REFUSED and the explanation.
class Refusal : public CommandError {
public:
    Refusal(const std::string& action, int code, const std::string& text)
        : CommandError(EXIT_REFUSED, ExplainRefusal(action, code, text)), m_code(code) {}

    [[nodiscard]] int Code() const { return m_code; }

private:
    int m_code;
};
