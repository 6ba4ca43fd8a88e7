// When a change of the marks is on the disk, and what becomes of one that fails.
#include "strategy/version-mark.h"

#include <gmock/gmock.h>

#include <cerrno>
#include <filesystem>

#include "flush-faults.h"
#include "strategy/version-end.h"
#include "version-fixture.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::SizeIs;

class VersionMarkTest : public VersionFixture {
protected:
    VersionMarkTest() {
        m_first.name = "first";
        m_second.name = "second";
        EXPECT_EQ(0, PutVersionMarks(TASK_ID, {m_first, m_second}));
        m_flushes = 0;
    }
    std::string Folder() const { return fs::path(MarksPath()).parent_path(); }
    // Makes the next flushes of the folder or the file of the marks fail.
    int Flush(const std::string& what) {
        if (!what.starts_with(Folder())) return 0;
        ++m_flushes;
        m_was_there = IsThere(MarksPath());
        return m_flushes <= m_failures ? EIO : 0;
    }

    VersionMark m_first;
    VersionMark m_second;
    int m_failures = 0;
    int m_flushes = 0;
    bool m_was_there = true;  // at the last flush
    const OnFlush m_faults{[this](const std::string& what) { return Flush(what); }};
};

TEST_F(VersionMarkTest, TheRemovalOfTheLastMarkIsOnTheDisk) {
    EXPECT_EQ(0, DropVersionMarks(TASK_ID, {m_first, m_second}));
    EXPECT_EQ(1, m_flushes);
    EXPECT_FALSE(m_was_there) << "flushed behind the removal";
}

TEST_F(VersionMarkTest, ARemovalThatFailsIsTriedAgainOnce) {
    m_failures = 1;
    EXPECT_EQ(0, DropVersionMarks(TASK_ID, {m_first, m_second}));
    EXPECT_EQ(2, m_flushes);
    EXPECT_TRUE(m_log.Has("[ERR] Failed to write the marks of versions '" + MarksPath() +
                          "': Input/output error"));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(VersionMarkTest, ARemovalThatFailsTwiceIsAFailure) {
    m_failures = 2;
    EXPECT_EQ(-1, DropVersionMarks(TASK_ID, {m_first, m_second}));
    EXPECT_EQ(2, m_flushes);
}

TEST_F(VersionMarkTest, TheRemovalOfOneOfTwoIsTriedAgainToo) {
    m_failures = 1;
    EXPECT_EQ(0, DropVersionMarks(TASK_ID, {m_first}));
    EXPECT_THAT(Marks(), ElementsAre(m_second));
    m_failures = m_flushes + 2;
    EXPECT_EQ(-1, DropVersionMarks(TASK_ID, {m_second, m_first})) << "with none of it on the disk";
}

TEST_F(VersionMarkTest, MarksThatCannotBeReadAreLeftAsTheyAre) {
    fs::remove(MarksPath());
    fs::create_directory(MarksPath());
    EXPECT_EQ(-1, DropVersionMarks(TASK_ID, {m_first}));
    EXPECT_EQ(-1, PutVersionMarks(TASK_ID, {m_first}));
    EXPECT_EQ(0, m_flushes);
    MakeVersion(RUN_DIR);
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), ElementsAre(RUN_DIR));
}

}  // namespace
