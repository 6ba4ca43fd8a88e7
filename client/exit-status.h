// How a client program ends. The numbers are a contract with scripts.
#pragma once

#include <stdexcept>
#include <string>

enum ExitStatus : int {
    EXIT_DONE = 0,
    EXIT_REFUSED = 1,        // by the daemon, or by what the command would have worked on
    EXIT_USAGE = 2,          // the command line makes no sense
    EXIT_NOT_REACHABLE = 3,  // no daemon answers
};

// Ends a command; its text goes to standard error, in one line without the program's name.
class CommandError : public std::runtime_error {
public:
    CommandError(ExitStatus status, const std::string& text)
        : std::runtime_error(text), m_status(status) {}

    [[nodiscard]] ExitStatus Status() const { return m_status; }

private:
    ExitStatus m_status;
};
