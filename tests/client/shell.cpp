#include "shell.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <pty.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <memory>

namespace {

constexpr auto PATIENCE = std::chrono::seconds(60);

std::vector<char*> Pointers(std::vector<std::string>& texts) {
    std::vector<char*> pointers;
    for (std::string& text : texts) pointers.push_back(text.data());
    pointers.push_back(nullptr);
    return pointers;
}

}  // namespace

bool HasProgram(const std::string& name) { return RunShell("command -v " + name).status == 0; }

ShellResult RunShell(const std::string& command) {
    ShellResult result{-1, ""};
    const std::string line = "exec </dev/null 2>&1\n" + command;
    FILE* pipe = popen(line.c_str(), "r");
    if (pipe == nullptr) return result;
    char piece[4096];
    for (size_t size = 0; (size = fread(piece, 1, sizeof piece, pipe)) > 0;) {
        result.output.append(piece, size);
    }
    const int status = pclose(pipe);
    if (WIFEXITED(status)) result.status = WEXITSTATUS(status);
    return result;
}

TerminalShell::TerminalShell(const std::vector<std::string>& arguments,
                             const std::vector<std::string>& environment) {
    std::vector<std::string> argument_texts = arguments;
    std::vector<std::string> environment_texts = environment;
    const std::vector<char*> argv = Pointers(argument_texts);
    const std::vector<char*> envp = Pointers(environment_texts);
    winsize size{};
    size.ws_row = 50;
    size.ws_col = 200;
    int terminal = -1;
    m_pid = forkpty(&terminal, nullptr, nullptr, &size);
    if (m_pid == 0) {
        execvpe(argv[0], argv.data(), envp.data());
        _exit(127);
    }
    EXPECT_GT(m_pid, 0);
    m_terminal.Reset(terminal);
}

TerminalShell::~TerminalShell() {
    if (m_pid <= 0) return;
    m_terminal.Reset();  // hangs up
    kill(m_pid, SIGKILL);
    waitpid(m_pid, nullptr, 0);
}

void TerminalShell::Type(const std::string& keys) const {
    EXPECT_EQ(static_cast<ssize_t>(keys.size()), write(m_terminal.Get(), keys.data(), keys.size()));
}

std::string TerminalShell::WaitFor(const std::string& text) {
    const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
    while (true) {
        if (const size_t at = m_shown.find(text); at != std::string::npos) {
            const std::string shown = m_shown.substr(0, at + text.size());
            m_shown.erase(0, shown.size());
            return shown;
        }
        pollfd wait{m_terminal.Get(), POLLIN, 0};
        char piece[4096];
        ssize_t size = 0;
        if (poll(&wait, 1, 1000) > 0) {
            size = read(m_terminal.Get(), piece, sizeof piece);
            if (size <= 0) break;
        }
        m_shown.append(piece, static_cast<size_t>(size));
        if (std::chrono::steady_clock::now() > deadline) break;
    }
    ADD_FAILURE() << "the terminal did not show \"" << text << "\" but \"" << m_shown << "\"";
    return m_shown;
}
