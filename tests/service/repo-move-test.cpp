#include "service/repo-move.h"

#include <sys/stat.h>

#include "service/repo-move-fixture.h"
#include "support/kill-at-call.h"

namespace fs = std::filesystem;

namespace {

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
        {"/bin/rm",         "-rf",      m_v1 + "/@tmp/@Ferrix.removed"}
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
    EXPECT_EQ("still older", ReadWholeFile(m_v2 + "/@tmp/@Ferrix.replaced/db/task-db.sqlite"));
    EXPECT_EQ("former", ReadWholeFile(m_v2 + "/@tmp/@Ferrix.replaced.2/db/task-db.sqlite"));
    EXPECT_FALSE(fs::exists(m_v2 + "/@Ferrix/@Ferrix"));
    EXPECT_FALSE(fs::exists(m_v2 + "/@tmp/@Ferrix.replaced/@Ferrix"));
}

TEST_F(RepoMoveTest, TheFolderThatItPassesThroughIsItsOwnersAlone) {
    const mode_t saved = umask(0);
    EXPECT_TRUE(MoveRepoData(m_v1, m_v2));
    umask(saved);
    EXPECT_EQ(fs::perms(0700), Mode(m_v1 + "/@tmp"));
    EXPECT_EQ(fs::perms(0700), Mode(m_v2 + "/@tmp"));
}

TEST_F(RepoMoveTest, AFolderOfThatNameThatWasThereStaysAsItIs) {
    fs::permissions(m_dir.MakeDir("v2/@tmp"), fs::perms(0755));
    EXPECT_TRUE(MoveRepoData(m_v1, m_v2));
    EXPECT_EQ(fs::perms(0755), Mode(m_v2 + "/@tmp"));
}

TEST_F(RepoMoveTest, TheRepositoryInUseIsNotReplacedByALeftover) {
    ASSERT_EQ(0, MakeRepo(m_v2));
    UseRegistered();
    m_dir.Write("v2/@Ferrix/task/8/user.config", "mine");
    ASSERT_EQ(0, RegisterVolume(m_v2));
    EXPECT_TRUE(MoveRepoData(m_v1, m_v2));
    EXPECT_EQ("mine", ReadWholeFile(m_v2 + "/@Ferrix/task/8/user.config"));
    EXPECT_EQ(m_v2, GetRepoVolPath());
    EXPECT_FALSE(fs::exists(m_v1 + "/@Ferrix"));
    // Only the settings say that it is a leftover, and not a repository of its own.
    EXPECT_TRUE(fs::exists(m_v1 + "/@tmp/@Ferrix.replaced/used"));
    EXPECT_TRUE(MoveRepoData(m_v1, m_v2)) << "nothing is left to do";
    EXPECT_TRUE(m_fake.Programs().empty());
}

// The program in the background may begin at any moment, also in the middle of the way back.
TEST_F(RepoMoveTest, ARemovalThatIsStillUnderWayDoesNotTouchTheWayBack) {
    std::vector<std::string> pending;
    m_fake.SetProgramResult("/bin/rm", 0);
    m_fake.OnCall("KLIBCExec", [&] {
        for (const std::string& path : pending) fs::remove_all(path);
    });
    ASSERT_TRUE(MoveRepoData(m_v1, m_v2));
    ASSERT_EQ("/bin/rm", m_fake.Programs().back()[0]);
    pending.push_back(m_fake.Programs().back()[2]);
    EXPECT_TRUE(fs::exists(pending[0] + "/db/task-db.sqlite"));
    EXPECT_TRUE(MoveRepoData(m_v2, m_v1));
    EXPECT_TRUE(IsWhole(m_v1));
    fs::remove_all(pending[0]);
    EXPECT_TRUE(IsWhole(m_v1));
    EXPECT_EQ(m_v1, GetRepoVolPath());
}

TEST_F(RepoMoveTest, ARemovalThatWasBrokenOffIsDoneByTheNextMove) {
    m_fake.SetProgramResult("/bin/rm", 0);
    ASSERT_TRUE(MoveRepoData(m_v1, m_v2));
    const std::string left = m_v1 + "/@tmp/@Ferrix.removed";
    EXPECT_TRUE(fs::exists(left));
    FakeKeld::Reset().RunProgramsForReal();
    ASSERT_TRUE(MoveRepoData(m_v2, m_v1));
    EXPECT_FALSE(fs::exists(left));
    EXPECT_TRUE(IsWhole(m_v1));
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
            UseRegistered();
            ASSERT_TRUE(MoveRepoData(m_v1, m_v2)) << nth;
            ASSERT_EQ(m_v2, GetRepoVolPath());
            ASSERT_TRUE(IsWhole(m_v2)) << nth;
            ASSERT_TRUE(IsUsed(m_v2)) << nth;
            ASSERT_FALSE(fs::exists(m_v1 + "/@Ferrix")) << nth;
            ASSERT_FALSE(fs::exists(m_v2 + "/@Ferrix/@Ferrix")) << nth;
        }
    }
    EXPECT_GT(killed, 20);
}

}  // namespace
