#include "strategy/version-start.h"

#include <gmock/gmock.h>
#include <unistd.h>

#include "strategy/version-name.h"
#include "version-fixture.h"

namespace {

constexpr time_t START = 1709993702;  // 2024-03-09 14:15:02 UTC

class VersionStartTest : public VersionFixture {
protected:
    std::string Name(time_t start = START) {
        std::string name = "none";
        EXPECT_EQ(0, NameNewVersion(m_task, start, name));
        return name;
    }
    void Mark(VersionMark::Kind kind, const std::string& folder) {
        TaskRunInfo task = m_task;
        task.version_dir = RUN_DIR;
        task.dst_dir_path = folder;
        ASSERT_EQ(0, PutVersionMarks(TASK_ID, {MakeVersionMark(task, kind)}));
    }

    static constexpr char NEXT_DIR[] = "Ferrix Copy_2024-03-09_141503";
    TimeZone m_zone{"UTC"};
};

TEST_F(VersionStartTest, ARunIsNamedByItsStart) {
    EXPECT_EQ(RUN_DIR, Name());
    MakeVersion(std::string(RUN_DIR) + ".Bad");
    EXPECT_EQ(RUN_DIR, Name()) << "what is bad is not in the way";
}

TEST_F(VersionStartTest, AVersionOfThatTimeIsNotGoneInto) {
    MakeVersion(RUN_DIR);
    EXPECT_EQ(NEXT_DIR, Name());
    EXPECT_TRUE(m_log.Has("[INFO] There is a version '" + Dst(std::string("/") + RUN_DIR) +
                          "' of task '7' already"));
    MakeVersion(NEXT_DIR);
    EXPECT_EQ("Ferrix Copy_2024-03-09_141504", Name());
}

TEST_F(VersionStartTest, WhateverHasTheNameIsInTheWay) {
    WriteDst(std::string("/") + RUN_DIR, "a file");
    ASSERT_EQ(0, symlink("nowhere", Dst(std::string("/") + NEXT_DIR).c_str()));
    EXPECT_EQ("Ferrix Copy_2024-03-09_141504", Name());
}

TEST_F(VersionStartTest, TheRunsOwnUnfinishedFolderIsNotInTheWay) {
    MakeVersion(RUN_DIR);
    Mark(VersionMark::REMOVING, m_task.dst_dir_path);
    Mark(VersionMark::FILLING, m_share + "/elsewhere");
    EXPECT_EQ(NEXT_DIR, Name()) << "neither mark is about this folder's run";
    Mark(VersionMark::FILLING, m_task.dst_dir_path);
    EXPECT_EQ(RUN_DIR, Name());
}

TEST_F(VersionStartTest, TheHourThatComesTwiceGivesEachRunAFolder) {
    const TimeZone zone("Europe/Berlin");
    constexpr time_t AUTUMN = 1729990800;  // 2024-10-27 01:00 UTC: 03:00 becomes 02:00
    const std::string first = Name(AUTUMN - 1800);
    EXPECT_EQ("Ferrix Copy_2024-10-27_023000", first);
    MakeVersion(first);
    EXPECT_EQ("Ferrix Copy_2024-10-27_023001", Name(AUTUMN + 1800));
}

TEST_F(VersionStartTest, TheSearchEnds) {
    for (int second = 0; second < 3600; ++second) {
        std::string name;
        ASSERT_EQ(0, NameVersion(START + second, name));
        MakeDstDir("/" + name);
    }
    std::string name = "none";
    EXPECT_EQ(-1, NameNewVersion(m_task, START, name));
    EXPECT_EQ("none", name);
}

}  // namespace
