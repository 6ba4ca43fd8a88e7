// Moves of the repository that fail, at each of their steps.
#include "service/repo-move-fixture.h"

namespace fs = std::filesystem;

namespace {

class RepoMoveFailureTest : public RepoMoveTest {
protected:
    // Nothing has happened to the repository that is in use.
    void ExpectFailsAndStays(const std::string& failure) {
        m_log.Clear();
        EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
        EXPECT_TRUE(HasFailure(failure)) << failure;
        EXPECT_EQ(m_v1, GetRepoVolPath());
        EXPECT_TRUE(IsWhole(m_v1));
    }

    std::string m_cp = "cp -rf " + m_v1 + "/@Ferrix " + m_v2 + "/@tmp/@Ferrix";
    std::string m_mv_in = "mv " + m_v2 + "/@tmp/@Ferrix " + m_v2 + "/@Ferrix";
    std::string m_mv_out = "mv " + m_v1 + "/@Ferrix " + m_v1 + "/@tmp/@Ferrix";
};

TEST_F(RepoMoveFailureTest, AFailedCopyIsClearedAwayAndTheSourceStays) {
    const std::string half = m_v2 + "/@tmp/@Ferrix.removed";
    m_fake.SetProgramResult("/bin/cp", 1);
    m_fake.OnCall("KLIBCExec", [this] { m_dir.Write("v2/@tmp/@Ferrix/db/task-db.sqlite", "ta"); });
    EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(HasFailure("cp -rf " + m_v1 + "/@Ferrix " + m_v2 + "/@tmp/@Ferrix"));
    EXPECT_EQ((std::vector<std::string>{"/bin/rm", "-rf", half}), m_fake.Programs().back());
    EXPECT_EQ(m_v1, GetRepoVolPath());
    ExpectWholeWhereRegistered();
    EXPECT_TRUE(fs::is_empty(m_v2 + "/@tmp"));
    m_fake.FailCall("KLIBCBackgroundExec");
    EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(HasFailure("rm -rf " + half));
}

TEST_F(RepoMoveFailureTest, AVolumeThatIsNotThereIsNotMade) {
    EXPECT_FALSE(MoveRepoData(m_v1, m_dir / "none"));
    EXPECT_FALSE(fs::exists(m_dir / "none"));
    EXPECT_FALSE(MoveRepoData(m_dir / "none", m_v2));
    EXPECT_FALSE(fs::exists(m_v2 + "/@Ferrix"));
    EXPECT_EQ(m_v1, GetRepoVolPath());
}

TEST_F(RepoMoveFailureTest, AFailureOfEachMoveLeavesTheOldRepositoryInUse) {
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

TEST_F(RepoMoveFailureTest, SettingsThatCannotBeWrittenLeaveTheOldRepositoryInUse) {
    m_fake.FailCall("KLIBCFileSetKeyValue");
    EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
    EXPECT_EQ(m_v1, GetRepoVolPath());
    ExpectWholeWhereRegistered();
}

TEST_F(RepoMoveFailureTest, AnOldCopyThatCannotBeRemovedIsToldAndTheMoveIsDone) {
    m_fake.FailCall("KLIBCBackgroundExec");
    EXPECT_TRUE(MoveRepoData(m_v1, m_v2));
    EXPECT_TRUE(HasFailure("rm -rf " + m_v1 + "/@tmp/@Ferrix.removed"));
    ExpectWholeWhereRegistered();
    EXPECT_EQ(m_v2, GetRepoVolPath());
}

TEST_F(RepoMoveFailureTest, AFolderThatCannotBePassedThroughStopsTheMove) {
    m_dir.Write("v2/@tmp", "in the way");
    ExpectFailsAndStays(m_cp);
    fs::remove(m_v2 + "/@tmp");
    m_dir.Write("v1/@tmp", "in the way");
    ExpectFailsAndStays(m_mv_out);
    EXPECT_FALSE(fs::exists(m_v2 + "/@Ferrix"));
}

TEST_F(RepoMoveFailureTest, AFormerRepositoryThatCannotBeKeptIsNotReplaced) {
    m_dir.Write("v2/@Ferrix/db/task-db.sqlite", "former");
    m_dir.MakeDir("v2/@tmp/@Ferrix.replaced");
    for (int number = 2; number <= 100; ++number) {
        m_dir.MakeDir("v2/@tmp/@Ferrix.replaced." + std::to_string(number));
    }
    ExpectFailsAndStays(m_mv_in);
    EXPECT_EQ("former", ReadWholeFile(m_v2 + "/@Ferrix/db/task-db.sqlite"));
}

TEST_F(RepoMoveFailureTest, AVolumeListThatCannotBeWrittenLeavesTheOldRepositoryInUse) {
    fs::remove_all(m_dir / "p/etc/keldpkg_conf");
    m_dir.Write("p/etc/keldpkg_conf", "in the way");
    EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
    EXPECT_EQ(m_v1, GetRepoVolPath());
    EXPECT_TRUE(IsWhole(m_v1));
}

TEST_F(RepoMoveFailureTest, SettingsThatNamedAnotherVolumeNameItStill) {
    const std::string other = m_dir.MakeDir("v3");
    for (const int skipped : {0, 1, 2}) {
        Restore();
        ASSERT_EQ(0, RegisterVolume(other));
        m_fake.FailCall("KLIBCExec", KELDERR_SYSTEM, 1, skipped);
        EXPECT_FALSE(MoveRepoData(m_v1, m_v2)) << skipped;
        EXPECT_EQ(other, GetRepoVolPath()) << skipped;
        EXPECT_EQ("[\"" + other + "\"]\n", VolumeList()) << skipped;
        EXPECT_TRUE(IsWhole(m_v1)) << skipped;
    }
}

// The program that moves the source away fails at its very end, or in the middle of its work.
TEST_F(RepoMoveFailureTest, ASourceThatIsNoLongerWholeIsNotReturnedTo) {
    const std::string gone = m_v1 + "/@tmp/@Ferrix";
    for (const bool is_done : {true, false}) {
        Restore();
        m_fake.FailCall("KLIBCExec", KELDERR_SYSTEM, 1, 2);
        m_fake.OnCall("KLIBCExec", [&] {
            if (m_fake.CallCount("KLIBCExec") != 3) return;
            if (is_done) return fs::rename(m_v1 + "/@Ferrix", gone);
            fs::copy(m_v1 + "/@Ferrix", gone, fs::copy_options::recursive);
            fs::remove_all(m_v1 + "/@Ferrix/db");
        });
        EXPECT_FALSE(MoveRepoData(m_v1, m_v2));
        EXPECT_TRUE(HasFailure(m_mv_out));
        EXPECT_EQ(m_v2, GetRepoVolPath());
        EXPECT_TRUE(IsWhole(m_v2));
        EXPECT_EQ("[\"" + m_v2 + "\"]\n", VolumeList());
    }
}

TEST_F(RepoMoveFailureTest, OneFolderUnderTwoNamesIsNotMovedOntoItself) {
    fs::create_symlink(m_v1, m_dir / "alias");
    EXPECT_FALSE(MoveRepoData(m_v1, m_dir / "alias"));
    EXPECT_FALSE(MoveRepoData(m_dir / "alias", m_v1));
    EXPECT_FALSE(MoveRepoData(m_v1, m_v1));
    fs::create_symlink(m_v1 + "/@Ferrix", m_v2 + "/@Ferrix");
    ExpectFailsAndStays(m_cp);
    EXPECT_TRUE(m_fake.Programs().empty());
    EXPECT_FALSE(fs::exists(m_v1 + "/@tmp"));
}

TEST_F(RepoMoveFailureTest, AVolumeWhosePathCannotBeRememberedGetsNoCopy) {
    const std::string too_long = m_dir.MakeDir(std::string(64, 'v'));
    EXPECT_FALSE(MoveRepoData(m_v1, too_long));
    EXPECT_TRUE(m_fake.Programs().empty());
    EXPECT_TRUE(fs::is_empty(too_long));
    ExpectWholeWhereRegistered();
}

}  // namespace
