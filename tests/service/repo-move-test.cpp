#include "service/repo-move.h"

#include "service/repository.h"
#include "service/service-fixture.h"
#include "support/kill-at-call.h"

namespace fs = std::filesystem;

namespace {

class RepoMoveTest : public ServiceTest {
protected:
    RepoMoveTest() {
        Restore();
        m_log.Clear();
    }

    // The repository on the first volume, the second one empty.
    void Restore() {
        FakeKeld::Reset().RunProgramsForReal();
        for (const std::string& volume : {m_v1, m_v2}) {
            fs::remove_all(volume);
            fs::create_directory(volume);
        }
        EXPECT_EQ(0, MakeRepo(m_v1));
        m_dir.Write("v1/@Ferrix/db/task-db.sqlite", "tasks");
        m_dir.Write("v1/@Ferrix/db/task-db.sqlite-wal", "late tasks");
        m_dir.Write("v1/@Ferrix/task/7/file-db.sqlite", std::string(300000, 'f'));
        EXPECT_EQ(0, RegisterVolume(m_v1));
    }
    static bool IsWhole(const std::string& volume) {
        const std::string repository = volume + "/@Ferrix/";
        return fs::exists(repository + "task/7/file-db.sqlite") &&
               ReadWholeFile(repository + "db/task-db.sqlite") == "tasks" &&
               ReadWholeFile(repository + "db/task-db.sqlite-wal") == "late tasks" &&
               ReadWholeFile(repository + "task/7/file-db.sqlite") == std::string(300000, 'f');
    }
    // What the next start finds.
    void ExpectWholeWhereRegistered() const {
        EXPECT_TRUE(GetRepoVolPath() == m_v1 || GetRepoVolPath() == m_v2) << GetRepoVolPath();
        EXPECT_TRUE(IsWhole(GetRepoVolPath())) << GetRepoVolPath();
    }
    [[nodiscard]] bool HasFailure(const std::string& text) const {
        return HasPlaced("ERR", "FAIL: " + text);
    }
};

TEST_F(RepoMoveTest, ItIsCopiedThenTheOldOneGoes) {
    EXPECT_TRUE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(IsWhole(m_v2));
    EXPECT_FALSE(fs::exists(m_v1 + "/@Ferrix"));
    EXPECT_FALSE(fs::exists(m_v1 + "/@tmp/@Ferrix"));
    EXPECT_FALSE(fs::exists(m_v2 + "/@tmp/@Ferrix"));
    EXPECT_EQ(m_v2, GetRepoVolPath());
    const std::string from = m_v1 + "/@Ferrix";
    const std::string old = m_v1 + "/@tmp/@Ferrix";
    const std::string staging = m_v2 + "/@tmp/@Ferrix";
    const std::string to = m_v2 + "/@Ferrix";
    const std::vector<std::vector<std::string>> wanted = {
        {"/bin/cp", "-rf", from,       staging},
        {"/bin/mv",         staging,      to},
        {"/bin/mv",         from,      old   },
        {"/bin/rm",         "-rf",      old}
    };
    EXPECT_EQ(wanted, m_fake.Programs());
    EXPECT_EQ(1, m_fake.CallCount("KLIBCBackgroundExec"));
}

TEST_F(RepoMoveTest, WhatABrokenAttemptLeftIsNoObstacle) {
    m_dir.Write("v2/@tmp/@Ferrix/db/task-db.sqlite", "half");
    m_dir.Write("v2/@tmp/other", "kept");
    m_dir.Write("v1/@tmp/@Ferrix/db/task-db.sqlite", "older");
    EXPECT_TRUE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(IsWhole(m_v2));
    EXPECT_FALSE(fs::exists(m_v2 + "/@Ferrix/@Ferrix"));
    EXPECT_TRUE(fs::exists(m_v2 + "/@tmp/other"));
}

TEST_F(RepoMoveTest, ARepositoryThatLiesInThePlaceIsKeptAside) {
    m_dir.Write("v2/@Ferrix/db/task-db.sqlite", "former");
    m_dir.Write("v2/@tmp/@Ferrix.replaced/db/task-db.sqlite", "still older");
    EXPECT_TRUE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(IsWhole(m_v2));
    EXPECT_EQ("former", ReadWholeFile(m_v2 + "/@tmp/@Ferrix.replaced/db/task-db.sqlite"));
    EXPECT_FALSE(fs::exists(m_v2 + "/@Ferrix/@Ferrix"));
    EXPECT_FALSE(fs::exists(m_v2 + "/@tmp/@Ferrix.replaced/@Ferrix"));
}

TEST_F(RepoMoveTest, AFailedCopyIsClearedAwayAndTheSourceStays) {
    m_fake.SetProgramResult("/bin/cp", 1);
    EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(HasFailure("cp -rf " + m_v1 + "/@Ferrix " + m_v2 + "/@tmp/@Ferrix"));
    const std::vector<std::string> wanted = {"/bin/rm", "-rf", m_v2 + "/@tmp/@Ferrix"};
    EXPECT_EQ(wanted, m_fake.Programs().back());
    EXPECT_EQ(m_v1, GetRepoVolPath());
    ExpectWholeWhereRegistered();
    m_fake.FailCall("KLIBCBackgroundExec");
    EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(HasFailure("rm -rf " + m_v2 + "/@tmp/@Ferrix"));
}

TEST_F(RepoMoveTest, AVolumeThatIsNotThereIsNotMade) {
    EXPECT_FALSE(MoveRepoData(m_v1, m_dir / "none"));
    EXPECT_FALSE(fs::exists(m_dir / "none"));
    EXPECT_FALSE(MoveRepoData(m_dir / "none", m_v2));
    EXPECT_FALSE(fs::exists(m_v2 + "/@Ferrix"));
    EXPECT_EQ(m_v1, GetRepoVolPath());
}

TEST_F(RepoMoveTest, AFailureOfEachMoveLeavesTheOldRepositoryInUse) {
    m_fake.FailCall("KLIBCExec", KELDERR_SYSTEM, 1, 1);
    EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(HasFailure("mv " + m_v2 + "/@tmp/@Ferrix " + m_v2 + "/@Ferrix"));
    EXPECT_EQ(m_v1, GetRepoVolPath());
    ExpectWholeWhereRegistered();
    m_fake.FailCall("KLIBCExec", KELDERR_SYSTEM, 1, 2);
    EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(HasFailure("mv " + m_v1 + "/@Ferrix " + m_v1 + "/@tmp/@Ferrix"));
    EXPECT_EQ(m_v1, GetRepoVolPath());
    ExpectWholeWhereRegistered();
    EXPECT_TRUE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(IsWhole(m_v2));
}

TEST_F(RepoMoveTest, SettingsThatCannotBeWrittenLeaveTheOldRepositoryInUse) {
    m_fake.FailCall("KLIBCFileSetKeyValue");
    EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
    EXPECT_EQ(m_v1, GetRepoVolPath());
    ExpectWholeWhereRegistered();
}

TEST_F(RepoMoveTest, AnOldCopyThatCannotBeRemovedIsToldAndTheMoveIsDone) {
    m_fake.FailCall("KLIBCBackgroundExec");
    EXPECT_TRUE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(HasFailure("rm -rf " + m_v1 + "/@tmp/@Ferrix"));
    ExpectWholeWhereRegistered();
    EXPECT_EQ(m_v2, GetRepoVolPath());
}

TEST_F(RepoMoveTest, KilledAnywhereItLeavesAWholeRepositoryThatIsFoundAgain) {
    const auto move = [this] { return MoveRepoData(m_v1, m_v2) ? 0 : -1; };
    if (KillAtCall(1, move) == KillResult::CANNOT_TRACE) {
        GTEST_SKIP() << "processes cannot be traced here";
    }
    int killed = 0;
    for (bool with_former : {false, true}) {
        for (int nth = 1;; ++nth, ++killed) {
            Restore();
            if (with_former) m_dir.Write("v2/@Ferrix/db/task-db.sqlite", "former");
            const KillResult result = KillAtCall(nth, move);
            ExpectWholeWhereRegistered();
            if (result == KillResult::DONE) break;
            ASSERT_EQ(KillResult::KILLED, result);
            if (GetRepoVolPath() == m_v1) {
                ASSERT_TRUE(MoveRepoData(m_v1, m_v2)) << nth;
            }
            ASSERT_EQ(m_v2, GetRepoVolPath());
            ASSERT_TRUE(IsWhole(m_v2)) << nth;
            ASSERT_FALSE(fs::exists(m_v2 + "/@Ferrix/@Ferrix")) << nth;
        }
    }
    EXPECT_GT(killed, 20);
}

}  // namespace
