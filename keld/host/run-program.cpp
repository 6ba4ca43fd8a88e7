#include "host/run-program.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>

#include "host/text.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

using Clock = std::chrono::steady_clock;

// Of the limit, what is kept for a killed program to go away.
constexpr int KILL_MS = 500;
// Where the child tells why it could not become the program.
constexpr int REPORT_FD = 3;

// Everything that the child needs, made before the fork: between fork and exec nothing may
// allocate.
class Prepared {
public:
    explicit Prepared(const Program& program) {
        m_texts.push_back(program.path);
        m_texts.insert(m_texts.end(), program.arguments.begin(), program.arguments.end());
        const size_t argumentCount = m_texts.size();
        AddEnvironment(program);
        for (size_t i = 0; i < m_texts.size(); ++i) {
            auto& list = i < argumentCount ? m_arguments : m_environment;
            list.push_back(m_texts[i].data());
        }
        m_arguments.push_back(nullptr);
        m_environment.push_back(nullptr);
    }

    // Once the caller has gone nobody would keep the program to its time, and its work would go on
    // behind the back of whoever tries the same again.
    static void EndWith(pid_t caller) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        if (getppid() != caller) _exit(127);
    }

    // Does not return: the process is the program afterwards, or ends.
    [[noreturn]] void Become(int reportFd) {
        setsid();
        ResetSignals();
        umask(022);
        // REPORT_FD closes with the exec: then nothing has been told and the other side sees the
        // end.
        const bool isReady = chdir("/") == 0 && PlaceDescriptors(reportFd);
        if (isReady) execve(m_arguments[0], m_arguments.data(), m_environment.data());
        const int error = errno;
        // Without a reader there is nobody to tell.
        static_cast<void>(!write(isReady ? REPORT_FD : reportFd, &error, sizeof(error)));
        _exit(127);
    }

private:
    void AddEnvironment(const Program& program) {
        for (char** entry = environ; entry != nullptr && *entry != nullptr; ++entry) {
            const std::string_view text = *entry;
            const std::string_view name = text.substr(0, text.find('='));
            const bool isReplaced =
                std::any_of(program.environment.begin(), program.environment.end(),
                            [&](const auto& pair) { return pair.first == name; });
            if (!isReplaced) m_texts.emplace_back(text);
        }
        for (const auto& [name, value] : program.environment) m_texts.push_back(name + "=" + value);
        if (getenv("PATH") == nullptr) {
            m_texts.emplace_back(
                "PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin");
        }
    }

    static void ResetSignals() {
        struct sigaction action {};
        action.sa_handler = SIG_DFL;
        for (int number = 1; number < NSIG; ++number) sigaction(number, &action, nullptr);
        sigset_t none;
        sigemptyset(&none);
        sigprocmask(SIG_SETMASK, &none, nullptr);
    }

    static bool PlaceDescriptors(int reportFd) {
        // First out of the way of 0 to 2, which may be closed in a daemon.
        if (reportFd != REPORT_FD && dup2(reportFd, REPORT_FD) < 0) return false;
        if (fcntl(REPORT_FD, F_SETFD, FD_CLOEXEC) != 0) return false;
        CloseFrom(REPORT_FD + 1);
        const int null = open("/dev/null", O_RDWR);
        for (int fd = 0; fd <= 2; ++fd) {
            if (null < 0 || dup2(null, fd) < 0) return false;
        }
        if (null > 2) close(null);
        return true;
    }

    static void CloseFrom(int first) {
        if (syscall(SYS_close_range, first, ~0U, 0) == 0) return;
        const long limit = sysconf(_SC_OPEN_MAX);
        for (int fd = first; fd < limit; ++fd) close(fd);
    }

    std::vector<std::string> m_texts;
    std::vector<char*> m_arguments;
    std::vector<char*> m_environment;
};

int LeftMs(Clock::time_point end) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - Clock::now()).count();
    return static_cast<int>(std::max<decltype(left)>(left, 0));
}

// What the child wrote before its exec: 0 when it became the program, else an errno; ETIMEDOUT when
// it did neither until `end`, as with a program on a disk that does not answer.
int ReadReport(int fd, Clock::time_point end) {
    pollfd event{fd, POLLIN, 0};
    int count = 0;
    do {
        count = poll(&event, 1, LeftMs(end));
    } while (count < 0 && errno == EINTR);
    if (count == 0) return ETIMEDOUT;
    int error = 0;
    return read(fd, &error, sizeof(error)) == sizeof(error) ? error : 0;
}

int WaitFor(pid_t pid, int flags, int& status) {
    pid_t result = 0;
    do {
        result = waitpid(pid, &status, flags);
    } while (result < 0 && errno == EINTR);
    return result;
}

// Waits for the end of a child at most until `end`. True when it has ended and been taken in; a
// child that somebody else took in (SIGCHLD ignored) has an unknown status, told as a failure.
bool WaitUntil(pid_t pid, Clock::time_point end, int& status) {
    const UniqueFd watch(static_cast<int>(syscall(SYS_pidfd_open, pid, 0)));
    for (;;) {
        const int result = WaitFor(pid, WNOHANG, status);
        if (result == pid) return true;
        if (result < 0) {
            status = 0x7f00;  // as of exit(127)
            return true;
        }
        const int left = LeftMs(end);
        if (left == 0) return false;
        pollfd event{watch.Get(), POLLIN, 0};
        // A kernel before 5.3 has no pidfd: then the child is looked at every 10 ms.
        poll(&event, watch.IsValid() ? 1 : 0, watch.IsValid() ? left : std::min(left, 10));
    }
}

int FailWith(int error) {
    errno = error;
    return -1;
}

}  // namespace

int RunProgram(const Program& program, int limitMs) {
    const auto end = Clock::now() + std::chrono::milliseconds(limitMs);
    const auto killAt = end - std::chrono::milliseconds(std::min(KILL_MS, limitMs / 2));
    Prepared prepared(program);
    int fds[2];
    if (pipe2(fds, O_CLOEXEC) != 0) return -1;
    const UniqueFd reader(fds[0]);
    UniqueFd writer(fds[1]);
    const pid_t caller = getpid();
    const pid_t pid = fork();
    if (pid < 0) return -1;
    if (pid == 0) {
        Prepared::EndWith(caller);
        prepared.Become(writer.Get());
    }
    writer.Reset();
    const int error = ReadReport(reader.Get(), killAt);
    int status = 0;
    if (error != 0 && error != ETIMEDOUT) {
        WaitFor(pid, 0, status);
        return FailWith(error);
    }
    if (error == ETIMEDOUT || !WaitUntil(pid, killAt, status)) {
        kill(-pid, SIGKILL);  // its whole session's group
        kill(pid, SIGKILL);
        // One that sleeps in the kernel on a dead disk cannot be killed; it is not waited for.
        WaitUntil(pid, end, status);
        return FailWith(ETIMEDOUT);
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : FailWith(ECANCELED);
}

int StartProgram(const Program& program) {
    Prepared prepared(program);
    int fds[2];
    if (pipe2(fds, O_CLOEXEC) != 0) return -1;
    const UniqueFd reader(fds[0]);
    UniqueFd writer(fds[1]);
    const pid_t pid = fork();
    if (pid < 0) return -1;
    if (pid == 0) {
        const pid_t grandchild = fork();
        if (grandchild == 0) prepared.Become(writer.Get());
        if (grandchild < 0) {
            const int error = errno;
            static_cast<void>(!write(writer.Get(), &error, sizeof(error)));
        }
        _exit(0);
    }
    writer.Reset();
    int status = 0;
    WaitFor(pid, 0, status);
    const int error =
        ReadReport(reader.Get(), Clock::now() + std::chrono::milliseconds(RUN_LIMIT_MS));
    return error == 0 ? 0 : FailWith(error);
}

}  // namespace keld_host
