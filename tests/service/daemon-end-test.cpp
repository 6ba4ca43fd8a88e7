#include "service/daemon-end.h"

#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>

#include "service/child-daemon.h"
#include "service/service-fixture.h"

namespace fs = std::filesystem;

namespace {

class DaemonEndTest : public ServiceTest {
protected:
    int End() { return EndDaemon(Places()); }
};

constexpr char NOT_ASKED[] = "[ERR] StopDaemon: Ferrix failed to stop daemon, try to kill it.";

TEST_F(DaemonEndTest, ADaemonThatListensIsAsked) {
    ChildDaemon daemon(m_pid_file, ChildDaemon::IGNORES_SIGTERM, m_dir / "socket");
    EXPECT_EQ(0, End());
    EXPECT_FALSE(m_log.Has(NOT_ASKED));
    EXPECT_TRUE(m_log.Has("[INFO] daemon is dead"));
    EXPECT_EQ(0, daemon.EndSignal());
    EXPECT_FALSE(fs::exists(m_pid_file));
}

TEST_F(DaemonEndTest, ADaemonThatDoesNotAnswerIsTerminated) {
    ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
    EXPECT_EQ(0, End());
    EXPECT_TRUE(m_log.Has(NOT_ASKED));
    EXPECT_TRUE(m_log.Has("[INFO] daemon is dead"));
    EXPECT_EQ(SIGTERM, daemon.EndSignal());
}

TEST_F(DaemonEndTest, ADaemonThatIgnoresItIsKilledAfterTenLooks) {
    ChildDaemon daemon(m_pid_file, ChildDaemon::IGNORES_SIGTERM);
    EXPECT_EQ(0, End());
    EXPECT_FALSE(m_log.Has("[INFO] daemon is dead"));
    EXPECT_TRUE(m_log.Has("[INFO] forcelly kill daemon"));
    EXPECT_FALSE(fs::exists(m_pid_file));
    EXPECT_EQ(SIGKILL, daemon.EndSignal());
}

TEST_F(DaemonEndTest, TheRealWaitIsTenTimesASecond) {
    EXPECT_EQ(1000, ServicePlaces().kill_wait_ms);
}

TEST_F(DaemonEndTest, APidFileOfAProcessThatIsGoneIsRemoved) {
    int gone = 0;
    {
        ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
        gone = std::stoi(ReadWholeFile(m_pid_file));
    }
    ASSERT_NE(0, kill(gone, 0));
    EXPECT_EQ(0, End());
    EXPECT_TRUE(m_log.Has("[INFO] pid does not exist"));
    EXPECT_FALSE(fs::exists(m_pid_file));
}

TEST_F(DaemonEndTest, WithoutADaemonItFails) {
    EXPECT_EQ(-1, End());
    EXPECT_TRUE(m_log.Has(NOT_ASKED));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to read '" + m_pid_file + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to kill daemon"));
    for (const char* text : {"nonsense", "-1", "0", "1"}) {
        m_dir.Write("daemon.pid", text);
        EXPECT_EQ(-1, End()) << text;
    }
    EXPECT_EQ(5, m_log.Count("[ERR] Failed to kill daemon"));
}

// The pid file says that it has ended, the socket that it has not.
TEST_F(DaemonEndTest, ADaemonWhosePidFileIsLostIsNotTakenForDead) {
    ChildDaemon daemon(m_pid_file, ChildDaemon::IGNORES_STOP, m_dir / "socket");
    fs::remove(m_pid_file);
    EXPECT_EQ(-1, End());
    EXPECT_FALSE(m_log.Has(NOT_ASKED));
    EXPECT_FALSE(m_log.Has("[INFO] daemon is dead"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to read '" + m_pid_file + "'"));
    EXPECT_TRUE(daemon.IsRunning());
}

TEST_F(DaemonEndTest, ADaemonWhosePidFileIsLostMayStillEndByItself) {
    ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM, m_dir / "socket");
    fs::remove(m_pid_file);
    EXPECT_EQ(0, End());
    EXPECT_TRUE(m_log.Has("[INFO] daemon is dead"));
    EXPECT_EQ(0, daemon.EndSignal());
}

TEST_F(DaemonEndTest, SignalsDoNotShortenTheWait) {
    ChildDaemon daemon(m_pid_file, ChildDaemon::IGNORES_SIGTERM);
    const auto old_handler = signal(SIGALRM, [](int) {});
    const itimerval every_ms = {
        {0, 1000},
        {0, 1000}
    };
    ASSERT_EQ(0, setitimer(ITIMER_REAL, &every_ms, nullptr));
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_EQ(0, End());
    const auto taken = std::chrono::steady_clock::now() - begin;
    const itimerval none = {};
    setitimer(ITIMER_REAL, &none, nullptr);
    signal(SIGALRM, old_handler);
    EXPECT_LE(std::chrono::milliseconds(10 * Places().kill_wait_ms), taken);
    EXPECT_EQ(SIGKILL, daemon.EndSignal());
}

// The test itself stands for the daemon, and a child without rights for the control program.
TEST_F(DaemonEndTest, ADaemonThatMayNotBeKilledIsAFailure) {
    if (geteuid() != 0) GTEST_SKIP() << "only root can give up the right to kill its parent";
    fs::permissions(m_dir.Path(), fs::perms(0755));
    m_dir.Write("daemon.pid", std::to_string(getpid()));
    const pid_t child = fork();
    if (child == 0) {
        const bool is_other = setuid(65534) == 0;
        const bool is_refused =
            is_other && End() == -1 && m_log.Has("[ERR] Kill daemon: Operation not permitted (1)");
        _exit(is_refused && m_log.Has("[ERR] Failed to kill daemon") ? 0 : 1);
    }
    int status = 0;
    ASSERT_EQ(child, waitpid(child, &status, 0));
    EXPECT_EQ(0, status);
}

}  // namespace
