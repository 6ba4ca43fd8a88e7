#include "platform/service-status.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <keld/error.h>
#include <sys/file.h>
#include <sys/stat.h>

#include <thread>

#include "fake/fake-keld.h"
#include "platform/package-paths.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/unique-fd.h"

namespace {

class ServiceStatusTest : public testing::Test {
protected:
    ServiceStatusTest() : m_fake(FakeKeld::Reset()) {
        m_dir.MakeDir("etc");
        SetPackageFolderForTest(m_dir.Path());
    }
    ~ServiceStatusTest() override { SetPackageFolderForTest(""); }

    FakeKeld& m_fake;
    TempDir m_dir;
    LogCapture m_log;
};

TEST_F(ServiceStatusTest, IsWrittenAsKeysAndValues) {
    ASSERT_EQ(0, SetServiceStatus({SERVICE_STATE_RUNNING, ""}));
    EXPECT_EQ("state=\"4\"\nerror=\"\"\n", ReadWholeFile(m_dir / "etc/status"));
    ASSERT_EQ(0, SetServiceStatus({5, "err_sys"}));
    EXPECT_EQ("state=\"5\"\nerror=\"err_sys\"\n", ReadWholeFile(m_dir / "etc/status"));
}

TEST_F(ServiceStatusTest, TheLockFileIsEmptyAndNobodyMayWriteIt) {
    const mode_t saved = umask(0);
    ASSERT_EQ(0, SetServiceStatus({SERVICE_STATE_RUNNING, ""}));
    umask(saved);
    struct stat info {};
    ASSERT_EQ(0, stat((m_dir / "etc/status.lock").c_str(), &info));
    EXPECT_EQ(0440U, info.st_mode & 07777);
    EXPECT_EQ(0, info.st_size);
    ASSERT_EQ(0, stat((m_dir / "etc/status").c_str(), &info));
    EXPECT_EQ(0U, info.st_mode & 022);
}

TEST_F(ServiceStatusTest, WithoutALockFileNothingIsWritten) {
    SetPackageFolderForTest(m_dir / "none");
    EXPECT_EQ(-1, SetServiceStatus({SERVICE_STATE_RUNNING, ""}));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to open ferrix copy status lock file."));
    EXPECT_EQ(0, m_fake.CallCount("KLIBCFileSetKeyValue"));
}

TEST_F(ServiceStatusTest, AFailureIsToldForEachKey) {
    m_fake.FailCall("KLIBCFileSetKeyValue", KELDERR_SYSTEM);
    EXPECT_EQ(-1, SetServiceStatus({4, "err_sys"}));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set ferrix copy service state to [4]."));
    m_fake.FailCall("KLIBCFileSetKeyValue", KELDERR_SYSTEM, 1, 1);
    EXPECT_EQ(-1, SetServiceStatus({4, "err_sys"}));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set ferrix copy service error to [err_sys]."));
}

TEST_F(ServiceStatusTest, AHeldLockIsWaitedFor) {
    ASSERT_EQ(0, SetServiceStatus({1, ""}));
    UniqueFd holder(open((m_dir / "etc/status.lock").c_str(), O_RDONLY));
    ASSERT_EQ(0, flock(holder.Get(), LOCK_EX));
    int result = -100;
    std::thread writer([&] { result = SetServiceStatus({4, ""}); });
    EXPECT_EQ("state=\"1\"\nerror=\"\"\n", ReadWholeFile(m_dir / "etc/status"));
    holder.Reset();
    writer.join();
    EXPECT_EQ(0, result);
    EXPECT_EQ("state=\"4\"\nerror=\"\"\n", ReadWholeFile(m_dir / "etc/status"));
}

}  // namespace
