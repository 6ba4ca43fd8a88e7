// Real shells for tests: one that runs a command and ends, and one with a person at its terminal.
#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

#include "utils/unique-fd.h"

// True when the program can be found.
[[nodiscard]] bool HasProgram(const std::string& name);

struct ShellResult {
    int status;          // the exit status; -1 when it did not end by itself
    std::string output;  // standard output and standard error, as they came
};
// Runs a command of /bin/sh with nothing on standard input.
[[nodiscard]] ShellResult RunShell(const std::string& command);

// An interactive shell on a terminal of its own, ended by the destructor.
class TerminalShell {
public:
    // `environment` holds "NAME=VALUE" texts and is all that the shell gets.
    TerminalShell(const std::vector<std::string>& arguments,
                  const std::vector<std::string>& environment);
    ~TerminalShell();
    TerminalShell(const TerminalShell&) = delete;
    TerminalShell& operator=(const TerminalShell&) = delete;

    // Types these keys; "\t" asks for a completion, "\n" ends a line.
    void Type(const std::string& keys) const;
    // Waits until the terminal shows this text, and returns all that it has shown since the last
    // such text. Fails the test, and returns what there is, when it does not come.
    std::string WaitFor(const std::string& text);

private:
    pid_t m_pid = -1;
    UniqueFd m_terminal;
    std::string m_shown;
};
