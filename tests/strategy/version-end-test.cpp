#include "strategy/version-end.h"

#include <gmock/gmock.h>

#include <filesystem>

#include "version-fixture.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

class VersionEndTest : public VersionFixture {
protected:
    void MarkRun(const std::string& version_dir = RUN_DIR) {
        SetVersionDir(version_dir);
        EXPECT_EQ(0, PutVersionMarks(TASK_ID, {MakeVersionMark(m_task, VersionMark::FILLING)}));
    }
};

TEST_F(VersionEndTest, ABadEndWithoutAFolderSettlesTheMark) {
    MarkRun();
    EndBadVersion(m_task);
    EXPECT_TRUE(m_log.Has("[ERR] Failed to rename bad version format for task '7', [ret: -2]"));
    EXPECT_THAT(Marks(), IsEmpty());
}

TEST_F(VersionEndTest, ABadEndOfAFolderThatCannotBeAskedForKeepsTheMark) {
    MarkRun(std::string(300, 'n'));  // longer than a name may be
    EndBadVersion(m_task);
    EXPECT_TRUE(m_log.Has("[ERR] Failed to rename bad version format for task '7', [ret: -2]"));
    EXPECT_THAT(Marks(), SizeIs(1));
}

TEST_F(VersionEndTest, ABadEndInALockedShareKeepsTheMark) {
    MarkRun();
    m_fake.LockShare("photos");
    EndBadVersion(m_task);
    EXPECT_THAT(Marks(), SizeIs(1));
}

TEST_F(VersionEndTest, AGoodEndWhoseMarkStaysIsTold) {
    MarkRun();
    MakeVersion(RUN_DIR);
    fs::remove(MarksPath());
    fs::create_directory(MarksPath());
    EndGoodVersion(m_task);
    EXPECT_TRUE(m_log.Has(std::string("[WARN] The whole version '") + RUN_DIR +
                          "' of task '7' gets a bad name when the task is loaded"));
    EXPECT_THAT(Versions(), ElementsAre(RUN_DIR));
}

TEST_F(VersionEndTest, SettledMarksThatStayAreTold) {
    MarkRun();
    MakeVersion(RUN_DIR);
    // The new file of the marks cannot be written: there is a second mark that is to stay.
    VersionMark other = MakeVersionMark(m_task, VersionMark::FILLING);
    other.share_name = "nowhere";
    ASSERT_EQ(0, PutVersionMarks(TASK_ID, {other}));
    fs::create_directory(MarksPath() + ".new");
    SettleVersionsAtLoad(m_task);
    EXPECT_TRUE(
        m_log.Has("[WARN] Settled versions of task '7' are looked at again when it is loaded"));
    EXPECT_THAT(Marks(), SizeIs(2));
}

}  // namespace
