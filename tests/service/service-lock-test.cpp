#include "service/service-lock.h"

#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <functional>

#include "service/service-fixture.h"

namespace fs = std::filesystem;

namespace {

// A pipe of single letters between the test and its children.
class Letters {
public:
    Letters() { EXPECT_EQ(0, pipe(m_fds)); }
    ~Letters() {
        close(m_fds[0]);
        close(m_fds[1]);
    }
    Letters(const Letters&) = delete;
    Letters& operator=(const Letters&) = delete;

    void Put(char letter) const { (void)!write(m_fds[1], &letter, 1); }
    [[nodiscard]] char Get() const {
        char letter = 0;
        (void)!read(m_fds[0], &letter, 1);
        return letter;
    }
    [[nodiscard]] bool HasNone(int wait_ms) const {
        pollfd event{m_fds[0], POLLIN, 0};
        return poll(&event, 1, wait_ms) == 0;
    }

private:
    int m_fds[2] = {-1, -1};
};

class ServiceLockTest : public ServiceTest {
protected:
    static pid_t RunProgram(const std::function<void()>& work) {
        const pid_t pid = fork();
        if (pid != 0) return pid;
        work();
        _exit(0);
    }
    static void ExpectEnds(pid_t pid) {
        int status = 0;
        EXPECT_EQ(pid, waitpid(pid, &status, 0));
        EXPECT_EQ(0, status);
    }

    Letters m_said;
    Letters m_told;
};

TEST_F(ServiceLockTest, ASecondControlProgramWaitsForTheFirst) {
    const pid_t first = RunProgram([this] {
        const ServiceLock lock;
        m_said.Put('1');
        (void)m_told.Get();
        m_said.Put('2');
    });
    ASSERT_EQ('1', m_said.Get());
    const pid_t second = RunProgram([this] {
        const ServiceLock lock;
        m_said.Put('3');
    });
    EXPECT_TRUE(m_said.HasNone(100));
    m_told.Put('.');
    EXPECT_EQ('2', m_said.Get());
    EXPECT_EQ('3', m_said.Get());
    ExpectEnds(first);
    ExpectEnds(second);
}

TEST_F(ServiceLockTest, AnOperationWaitsForTheOneOfAnotherProgram) {
    const pid_t first = RunProgram([this] {
        const ServiceLock lock;
        m_said.Put('1');
        (void)m_told.Get();
        m_said.Put('2');
    });
    ASSERT_EQ('1', m_said.Get());
    const pid_t second = RunProgram([this] {
        const bool is_moved = Ctrl().MoveRepoVolume("", "");
        m_said.Put(is_moved ? '?' : '3');
    });
    EXPECT_TRUE(m_said.HasNone(100));
    m_told.Put('.');
    EXPECT_EQ('2', m_said.Get());
    EXPECT_EQ('3', m_said.Get());
    ExpectEnds(first);
    ExpectEnds(second);
}

TEST_F(ServiceLockTest, ItEndsWithAProgramThatIsKilled) {
    const pid_t first = RunProgram([this] {
        const ServiceLock lock;
        m_said.Put('1');
        (void)m_told.Get();
    });
    ASSERT_EQ('1', m_said.Get());
    kill(first, SIGKILL);
    const ServiceLock lock;
    int status = 0;
    EXPECT_EQ(first, waitpid(first, &status, 0));
    EXPECT_TRUE(m_log.Lines().empty());
}

TEST_F(ServiceLockTest, AFileThatCannotBeMadeIsToldAndTheOperationGoesOn) {
    const std::string file = m_dir / "p/etc/service.lock";
    fs::create_symlink(m_dir / "elsewhere", file);
    { const ServiceLock lock; }
    EXPECT_TRUE(m_log.Contains("[WARN] The service cannot be locked: Too many levels of symbolic"));
    EXPECT_FALSE(fs::exists(m_dir / "elsewhere"));
    EXPECT_EQ(0, Ctrl().StartService());
    EXPECT_TRUE(m_started->IsRunning());
}

}  // namespace
