// The flushes of a run go through a descriptor that was open before the first copy: one that is
// opened later is not told of an error that another has been told of.
#include "strategy/destination-flush.h"

#include <fcntl.h>
#include <unistd.h>

#include <filesystem>
#include <set>

#include "record-proof-fixture.h"
#include "utils/error-code.h"

namespace fs = std::filesystem;

namespace {

using testing::IsEmpty;

class DestinationFlushTest : public IncBackupFixture {
protected:
    // The descriptors of this process that could flush the destination.
    std::set<int> OpenAtDestination() const {
        std::set<int> open;
        for (const auto& entry : fs::directory_iterator("/proc/self/fd")) {
            std::error_code error;
            const std::string target = fs::read_symlink(entry.path(), error).string();
            if (error || !target.starts_with(m_share)) continue;
            const int fd = std::stoi(entry.path().filename().string());
            if ((fcntl(fd, F_GETFL) & O_PATH) == 0) open.insert(fd);
        }
        return open;
    }
    void WriteFiles(int count) const {
        for (int n = 0; n < count; ++n) WriteSrc("/f" + std::to_string(n), "s");
    }
    // Behind the nth copy the disk loses something, and another task is told of it.
    int RunWithErrorAt(int nth) {
        std::set<int> early;
        m_fake.OnCall("KELDFileCopy_r", [this, nth, &early] {
            if (m_fake.CallCount("KELDFileCopy_r") == nth) early = OpenAtDestination();
        });
        const OnFlush faults([&early](const std::string& what) {
            return what.starts_with("fs:") && early.erase(OnFlush::Fd()) == 1 ? EIO : 0;
        });
        const int result = RunTask();
        m_fake.OnCall("KELDFileCopy_r", [] {});
        return result;
    }
};

TEST_F(DestinationFlushTest, AnErrorThatAnotherTaskWasToldOfFailsTheRun) {
    WriteFiles(3);
    EXPECT_EQ(ERR_IO, RunWithErrorAt(1));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to flush file system of '" + Dst() + "' for task '7'"));
    for (const char* path : {"/f0", "/f1", "/f2"}) EXPECT_EQ("-", Recorded(path));
}

TEST_F(DestinationFlushTest, SoDoesOneThatTheFlushInTheMiddleIsToldOf) {
    WriteFiles(1001);
    EXPECT_EQ(ERR_IO, RunWithErrorAt(1));
    int records = 0;
    for (int n = 0; n < 1001; ++n) records += Recorded("/f" + std::to_string(n)) != "-";
    EXPECT_EQ(1, records) << "the one behind that flush";
}

TEST_F(DestinationFlushTest, ADestinationThatIsMadeByTheRunIsHeldToo) {
    fs::remove(Dst());
    WriteFiles(3);
    EXPECT_EQ(ERR_IO, RunWithErrorAt(1));
}

TEST_F(DestinationFlushTest, AfterTheRunTheDestinationIsLetGo) {
    WriteFiles(3);
    std::set<int> during;
    m_fake.OnCall("KELDFileCopy_r", [&] { during = OpenAtDestination(); });
    RunWell();
    EXPECT_EQ(1U, during.size());
    EXPECT_THAT(OpenAtDestination(), IsEmpty());
    m_abort = 1;
    WriteSrc("/new", "s");
    EXPECT_EQ(ERR_INTERRUPTED, RunTask());
    EXPECT_THAT(OpenAtDestination(), IsEmpty());
}

TEST_F(DestinationFlushTest, WithoutARunTheDestinationIsOpenedForTheFlush) {
    int flushes = 0;
    const OnFlush faults([&](const std::string& what) {
        EXPECT_EQ("fs:" + Dst(), what);
        ++flushes;
        return 0;
    });
    EXPECT_EQ(0, FlushDestination(m_task));
    EXPECT_EQ(1, flushes);
}

}  // namespace
