#include "service/daemon-start.h"

#include <sys/wait.h>
#include <unistd.h>

#include "service/service-fixture.h"

namespace fs = std::filesystem;

namespace {

// A wait that no test sees the end of.
constexpr int LONG_MS = 300000;

class DaemonStartTest : public ServiceTest {
protected:
    DaemonStartTest() { EXPECT_EQ(0, SetServiceStatus({SERVICE_STATE_UPGRADING, ""})); }

    int StartWithin(int wait_ms) {
        ServicePlaces places = Places();
        places.start_wait_ms = wait_ms;
        return StartDaemon(places);
    }
    void ExpectFailsWithin(int wait_ms) {
        m_log.Clear();
        EXPECT_EQ(-1, StartWithin(wait_ms));
        EXPECT_TRUE(m_log.Has("[ERR] Failed to start daemon"));
    }
    void WritePidFile(int pid) const { m_dir.Write("daemon.pid", std::to_string(pid)); }
    // At the nth look at the state, of a daemon that lives.
    void OnLook(int nth, const std::function<void()>& action) {
        m_fake.ForgetCalls();
        m_fake.OnCall("KLIBCFileGetKeyValue", [this, nth, action] {
            int looks = 0;
            for (const auto& call : m_fake.CallsOf("KLIBCFileGetKeyValue")) {
                if (call[1] == "state") ++looks;
            }
            if (looks == nth) action();
        });
    }
};

TEST_F(DaemonStartTest, AProgramThatFailsIsAFailure) {
    m_fake.SetProgramResult(m_program, 1);
    ExpectFailsWithin(LONG_MS);
}

TEST_F(DaemonStartTest, ADaemonThatTellsThatItRunsIsNotWaitedForAnyLonger) {
    OnLook(3, [this] { m_dir.Write("p/etc/status", StateText(SERVICE_STATE_RUNNING)); });
    EXPECT_EQ(0, StartWithin(LONG_MS));
    EXPECT_TRUE(m_started->IsRunning());
}

// It may have much to load.
TEST_F(DaemonStartTest, ADaemonThatLivesAfterTheWaitHasStarted) {
    EXPECT_EQ(0, StartWithin(30));
    EXPECT_EQ(StateText(SERVICE_STATE_UPGRADING), Status());
}

TEST_F(DaemonStartTest, WithoutADaemonTheWaitEndsInAFailure) {
    OnDaemonProgram([] {});
    ExpectFailsWithin(30);
    OnDaemonProgram([this] { m_dir.Write("daemon.pid", ""); });
    ExpectFailsWithin(30);
    { const ChildDaemon ended(m_dir / "other.pid", ChildDaemon::ENDS_AT_SIGTERM); }
    const int gone = std::stoi(ReadWholeFile(m_dir / "other.pid"));
    OnDaemonProgram([this, gone] { WritePidFile(gone); });
    ExpectFailsWithin(30);
}

// As when it cannot open its databases: it says nothing and removes its pid file.
TEST_F(DaemonStartTest, ADaemonThatEndsBeforeItRunsHasNotStarted) {
    OnLook(3, [this] { fs::remove(m_pid_file); });
    ExpectFailsWithin(LONG_MS);
}

TEST_F(DaemonStartTest, ADaemonThatIsLateIsWaitedFor) {
    pid_t writer = -1;
    OnDaemonProgram([&] {
        const pid_t living = getpid();
        writer = fork();
        if (writer != 0) return;
        usleep(50000);
        WritePidFile(living);
        _exit(0);
    });
    m_dir.Write("p/etc/status", StateText(SERVICE_STATE_RUNNING));  // told as soon as it is seen
    EXPECT_EQ(0, StartWithin(LONG_MS));
    EXPECT_EQ(writer, waitpid(writer, nullptr, 0));
}

TEST_F(DaemonStartTest, AStateThatCannotBeReadIsNotWaitedFor) {
    m_fake.FailCall("KLIBCFileGetKeyValue");
    EXPECT_EQ(0, StartWithin(LONG_MS));
}

TEST_F(DaemonStartTest, TheRealWaitIsLongEnoughForABusyBoxAndHasAnEnd) {
    EXPECT_EQ(10000, ServicePlaces().start_wait_ms);
}

}  // namespace
