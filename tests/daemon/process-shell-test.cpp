#include "daemon/process-shell.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <fstream>

#include "daemon/daemon-util.h"
#include "ipc/simple-ipc.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/unique-fd.h"

namespace {

mode_t ModeOf(const std::string& path) {
    struct stat info {};
    EXPECT_EQ(0, stat(path.c_str(), &info)) << path;
    return info.st_mode & 07777;
}

// Makes everything that is created world-writable unless its maker takes care, as in the daemon.
class OpenUmask {
public:
    OpenUmask() : m_saved(umask(0)) {}
    ~OpenUmask() { umask(m_saved); }
    OpenUmask(const OpenUmask&) = delete;
    OpenUmask& operator=(const OpenUmask&) = delete;

private:
    mode_t m_saved;
};

// A process number that is surely nobody's: that of a child which has been waited for.
pid_t DeadProcess() {
    const pid_t child = fork();
    if (child == 0) _exit(0);
    waitpid(child, nullptr, 0);
    return child;
}

// Runs `check` in a child process; true when it returned true.
template <typename Check>
bool HoldsInChild(const Check& check) {
    const pid_t child = fork();
    if (child == 0) _exit(check() ? 0 : 1);
    int status = -1;
    waitpid(child, &status, 0);
    return status == 0;
}

class PidFileTest : public testing::Test {
protected:
    TempDir m_dir;
    std::string m_path = m_dir / "pid";
    pid_t m_pid = 0;
    LogCapture m_log;
};

TEST_F(PidFileTest, WithoutAFileNothingRuns) {
    EXPECT_FALSE(IsDaemonRunning(m_path, &m_pid));
    EXPECT_TRUE(
        m_log.Has("[DBG] cannot access pid file at '" + m_path + "', daemon is not running"));
}

TEST_F(PidFileTest, AFileThatCanNotBeOpenedCountsAsNotRunning) {
    IPCListener listener;
    ASSERT_EQ(0, listener.Listen(m_path));  // even root cannot open a socket
    m_log.Clear();
    EXPECT_FALSE(IsDaemonRunning(m_path, &m_pid));
    EXPECT_TRUE(m_log.Has("[ERR] cannot open pid file at '" + m_path + "', daemon is not running"));
}

TEST_F(PidFileTest, AFileWithoutAProcessNumberCountsAsNotRunning) {
    for (const char* content : {"", "\n", "ferrixd\n", "0\n", "-1\n"}) {
        m_dir.Write("pid", content);
        m_log.Clear();
        EXPECT_FALSE(IsDaemonRunning(m_path, &m_pid)) << content;
        EXPECT_TRUE(m_log.Has("[ERR] cannot find pid int pid file at '" + m_path +
                              "', daemon is not running"));
    }
}

TEST_F(PidFileTest, ALivingProcessRuns) {
    m_dir.Write("pid", std::to_string(getpid()) + "\n");
    EXPECT_TRUE(IsDaemonRunning(m_path, &m_pid));
    EXPECT_EQ(getpid(), m_pid);
}

TEST_F(PidFileTest, AStaleNumberCountsAsNotRunning) {
    m_dir.Write("pid", std::to_string(DeadProcess()) + "\n");
    EXPECT_FALSE(IsDaemonRunning(m_path, &m_pid));
    EXPECT_TRUE(m_log.Has("[INFO] kill: No such process (3)"));
}

TEST_F(PidFileTest, WritingReplacesAStaleFileAndNobodyElseMayWriteIt) {
    const OpenUmask open_umask;
    m_dir.Write("pid", "12345678901234567890\n");
    ASSERT_EQ(0, chmod(m_path.c_str(), 0666));
    ASSERT_EQ(0, WritePidFile(m_path));
    EXPECT_EQ(std::to_string(getpid()) + "\n", ReadWholeFile(m_path));
    EXPECT_EQ(0644U, ModeOf(m_path));
    unlink(m_path.c_str());
    ASSERT_EQ(0, WritePidFile(m_path));
    EXPECT_EQ(0644U, ModeOf(m_path));
}

TEST_F(PidFileTest, AFileThatCanNotBeWrittenIsAFailure) {
    const std::string path = m_dir / "none/pid";
    EXPECT_EQ(-1, WritePidFile(path));
    EXPECT_TRUE(m_log.Has("[ERR] failed to create pid file at '" + path + "'"));
    EXPECT_EQ(-1, WritePidFile("/dev/full"));
}

TEST_F(PidFileTest, APlantedLinkIsNotWrittenThrough) {
    const std::string victim = m_dir.Write("victim", "precious");
    ASSERT_EQ(0, symlink(victim.c_str(), m_path.c_str()));
    EXPECT_EQ(-1, WritePidFile(m_path));
    EXPECT_EQ("precious", ReadWholeFile(victim));
}

TEST_F(PidFileTest, ASecondStartEndsAtOnceAndKeepsTheFile) {
    m_dir.Write("pid", std::to_string(getpid()) + "\n");
    EXPECT_EQ(-1, BecomeDaemon(m_path));
    EXPECT_TRUE(
        m_log.Has("[DBG] daemon is already running (pid = " + std::to_string(getpid()) + ")"));
    EXPECT_EQ(std::to_string(getpid()) + "\n", ReadWholeFile(m_path));
}

TEST(CloseInheritedDescriptors, ClosesFromThreeUpAndNothingBelow) {
    for (const bool use_close_range : {true, false}) {
        EXPECT_TRUE(HoldsInChild([&] {
            const int low = dup(0);
            const int high = fcntl(0, F_DUPFD, 200);
            CloseInheritedDescriptors(use_close_range);
            return fcntl(low, F_GETFD) == -1 && fcntl(high, F_GETFD) == -1 &&
                   fcntl(0, F_GETFD) != -1 && fcntl(1, F_GETFD) != -1 && fcntl(2, F_GETFD) != -1;
        })) << "close_range: "
            << use_close_range;
    }
}

class SignalTest : public testing::Test {
protected:
    static constexpr int kSignals[] = {SIGPIPE, SIGINT, SIGTERM, SIGUSR1, SIGUSR2};

    SignalTest() {
        for (size_t i = 0; i < std::size(kSignals); ++i)
            sigaction(kSignals[i], nullptr, &m_saved[i]);
        InstallSignalHandlers();
    }
    ~SignalTest() override {
        for (size_t i = 0; i < std::size(kSignals); ++i)
            sigaction(kSignals[i], &m_saved[i], nullptr);
        Daemon::daemon_run = 1;
        Daemon::log_level = 3;
    }

private:
    struct sigaction m_saved[std::size(kSignals)];
};

TEST_F(SignalTest, TerminateAndInterruptStopTheDaemon) {
    for (const int number : {SIGTERM, SIGINT}) {
        Daemon::daemon_run = 1;
        raise(number);
        EXPECT_EQ(0, Daemon::daemon_run) << number;
    }
}

TEST_F(SignalTest, UserSignalsRaiseAndLowerTheLogLevelDownToZero) {
    EXPECT_EQ(3, Daemon::log_level);
    for (int i = 0; i < 3; ++i) raise(SIGUSR1);
    EXPECT_EQ(6, Daemon::log_level);
    for (int i = 0; i < 6; ++i) raise(SIGUSR2);
    EXPECT_EQ(0, Daemon::log_level);
    raise(SIGUSR2);
    EXPECT_EQ(0, Daemon::log_level);
}

TEST_F(SignalTest, ABrokenPipeIsIgnored) {
    raise(SIGPIPE);
    struct sigaction action {};
    sigaction(SIGPIPE, nullptr, &action);
    EXPECT_EQ(SIG_IGN, action.sa_handler);
}

TEST_F(SignalTest, HandlersMayBeInterruptedByTheirOwnSignal) {
    struct sigaction action {};
    sigaction(SIGTERM, nullptr, &action);
    // The C library adds a flag of its own on some machines.
    EXPECT_EQ(SA_SIGINFO | SA_NODEFER, action.sa_flags & (SA_SIGINFO | SA_NODEFER | SA_RESTART));
    EXPECT_EQ(&Daemon::stop, action.sa_sigaction);
    EXPECT_EQ(0, sigismember(&action.sa_mask, SIGINT));
}

// The whole way: a detached process that ends on SIGTERM.
TEST(BecomeDaemon, DetachesWritesItsNumberAndObeysTheSignals) {
    const TempDir dir;
    const std::string path = dir / "pid";
    const pid_t child = fork();
    if (child == 0) {
        const int inherited = fcntl(0, F_DUPFD, 100);
        if (BecomeDaemon(path) != 0) _exit(1);
        alarm(60);  // should the test be gone
        const bool is_clean = fcntl(inherited, F_GETFD) == -1;
        while (Daemon::daemon_run != 0) usleep(1000);
        std::ofstream(path + ".end") << (is_clean ? "clean" : "a descriptor was left open");
        unlink(path.c_str());
        _exit(0);
    }
    int status = -1;
    ASSERT_EQ(child, waitpid(child, &status, 0));  // daemon(3) ends it at once
    ASSERT_EQ(0, status);
    pid_t daemon_pid = 0;
    LogCapture log;
    for (int i = 0; i < 60000 && !IsDaemonRunning(path, &daemon_pid); ++i) usleep(1000);
    ASSERT_GT(daemon_pid, 0);
    EXPECT_NE(child, daemon_pid);
    EXPECT_NE(getsid(0), getsid(daemon_pid));
    char folder[256] = "";
    EXPECT_EQ(1, readlink(("/proc/" + std::to_string(daemon_pid) + "/cwd").c_str(), folder,
                          sizeof(folder)));
    EXPECT_EQ('/', folder[0]);
    EXPECT_EQ(0644U, ModeOf(path));
    ASSERT_EQ(0, kill(daemon_pid, SIGTERM));
    for (int i = 0; i < 60000 && access(path.c_str(), F_OK) == 0; ++i) usleep(1000);
    EXPECT_EQ("clean", ReadWholeFile(path + ".end"));
}

}  // namespace
