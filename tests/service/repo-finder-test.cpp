#include "service/repo-finder.h"

#include "service/repository.h"
#include "service/service-fixture.h"

namespace fs = std::filesystem;

namespace {

using Strings = std::vector<std::string>;

class RepoFinderTest : public ServiceTest {
protected:
    RepoFinderTest() { RunForReal(); }

    // What moves files, but not the daemon.
    void RunForReal() {
        m_fake.RunProgramsForReal();
        m_fake.SetProgramResult(m_program, 0);
    }
    int Start() { return Ctrl().StartService(); }
    // On the first volume.
    void MakeRepoInUse() {
        EXPECT_EQ(0, MakeRepo(m_v1));
        EXPECT_EQ(0, RegisterVolume(m_v1));
        m_dir.Write("v1/@Ferrix/task/3/user.config", "mine");
    }
    void ExpectRepoOn(const std::string& volume) const {
        EXPECT_EQ("mine", ReadWholeFile(volume + "/@Ferrix/task/3/user.config"));
        EXPECT_EQ(volume, GetRepoVolPath());
        EXPECT_EQ("[\"" + volume + "\"]\n", VolumeList());
    }
    // The start fails, and where the repository is stays as it is.
    void ExpectStartFailsAndRepoStays() {
        EXPECT_EQ(-1, Start());
        EXPECT_EQ(StateText(7, "err_sys"), Status());
        ExpectRepoOn(m_v1);
        EXPECT_FALSE(fs::exists(m_v2 + "/@Ferrix"));
        EXPECT_EQ(nullptr, m_started);
    }
    [[nodiscard]] bool HasReplaced(const std::string& from, const std::string& to) const {
        return HasPlaced("NOTICE", "Repo volume [" + from +
                                       "] was not valid, create new repo volume as [" + to + "].");
    }
};

TEST_F(RepoFinderTest, WithoutAVolumeTheServiceWaits) {
    FakeKeld::Reset().AddVolume({.mount_path = m_v1, .writable = false});
    ASSERT_EQ(0, RegisterVolume(m_v2));
    EXPECT_EQ(0, Start());
    EXPECT_TRUE(HasPlaced("INFO", "Ferrix Copy repo NOT mounted '" + m_v2 + "'"));
    EXPECT_EQ(StateText(1), Status());
    EXPECT_EQ("", GetRepoVolPath());
    EXPECT_EQ("[]\n", VolumeList());
    EXPECT_TRUE(m_fake.Programs().empty());
}

TEST_F(RepoFinderTest, AWaitingStateThatCannotBeWrittenIsAFailure) {
    FakeKeld::Reset();
    m_fake.FailCall("KLIBCFileSetKeyValue");
    EXPECT_EQ(-1, Start());
    EXPECT_TRUE(HasPlaced("ERR", "fail to SetServiceStatus()"));
    EXPECT_EQ("[]\n", VolumeList());
}

TEST_F(RepoFinderTest, ARepositoryThatCanStillBeReachedMovesToAUsableVolume) {
    MakeRepoInUse();
    m_fake.RemoveVolume(m_v1);
    EXPECT_EQ(0, Start());
    EXPECT_TRUE(HasReplaced(m_v1, m_v2));
    ExpectRepoOn(m_v2);
    EXPECT_FALSE(fs::exists(m_v1 + "/@Ferrix"));
}

TEST_F(RepoFinderTest, ARepositoryThatIsGoneGivesWayToANewOne) {
    ASSERT_EQ(0, RegisterVolume(m_dir / "gone"));
    EXPECT_EQ(0, Start());
    EXPECT_TRUE(HasReplaced(m_dir / "gone", m_v1));
    EXPECT_EQ(m_v1, GetRepoVolPath());
    EXPECT_TRUE(fs::is_directory(m_v1 + "/@Ferrix/db"));
    EXPECT_FALSE(fs::exists(m_dir / "gone"));
}

TEST_F(RepoFinderTest, ARepositoryThatCannotBeMadeOrRegisteredEndsTheStart) {
    m_dir.Write("v1/@Ferrix", "in the way");
    EXPECT_EQ(-1, Start());
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_EQ("", GetRepoVolPath());
    fs::remove(m_v1 + "/@Ferrix");
    m_fake.FailCall("KLIBCFileSetKeyValue");
    EXPECT_EQ(-1, Start());
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_TRUE(m_fake.Programs().empty());
}

TEST_F(RepoFinderTest, ARepositoryThatCannotBeBroughtAlongIsNotGivenUp) {
    MakeRepoInUse();
    m_fake.RemoveVolume(m_v1);
    m_fake.SetProgramResult("/bin/cp", 1);
    ExpectStartFailsAndRepoStays();
    EXPECT_FALSE(HasReplaced(m_v1, m_v2));
}

TEST_F(RepoFinderTest, VolumesThatCannotBeToldLeaveEverythingAsItIs) {
    MakeRepoInUse();
    m_fake.RemoveVolume(m_v1);
    for (const int which : {0, 1}) {
        m_fake.FailCall("KELDMountVolAllEnum", KELDERR_SYSTEM, 1, which);
        ExpectStartFailsAndRepoStays();
    }
    m_fake.AddVolume({.mount_path = m_v1});
    m_fake.FailCall("KELDMountVolInfoGet");
    m_fake.FailCall("KELDMountVolAllEnum");
    ExpectStartFailsAndRepoStays();
    EXPECT_EQ(0, Start());
    ExpectRepoOn(m_v1);
}

TEST_F(RepoFinderTest, VolumesThatCannotBeToldMakeNoFirstRepository) {
    m_fake.FailCall("KELDMountVolAllEnum");
    EXPECT_EQ(-1, Start());
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_FALSE(fs::exists(m_dir / "p/etc/keldpkg_conf"));
    EXPECT_FALSE(fs::exists(m_v1 + "/@Ferrix"));
}

TEST_F(RepoFinderTest, ALookupThatFailsOnceMovesNothing) {
    ASSERT_EQ(0, RegisterVolume(m_v2));
    m_dir.Write("v2/@Ferrix/task/3/user.config", "mine");
    m_fake.FailCall("KELDMountVolInfoGet");
    EXPECT_EQ(0, Start());
    ExpectRepoOn(m_v2);
    EXPECT_EQ((std::vector<Strings>{{m_program}}), m_fake.Programs());
}

// Not moved onto itself, which would end with its removal.
TEST_F(RepoFinderTest, AVolumeThatComesUpMeanwhileIsTakenAsItIs) {
    MakeRepoInUse();
    m_fake.RemoveVolume(m_v1);
    m_fake.RemoveVolume(m_v2);
    m_fake.OnCall("KELDMountVolAllEnum", [this] {
        if (m_fake.CallCount("KELDMountVolAllEnum") == 2) m_fake.AddVolume({.mount_path = m_v1});
    });
    EXPECT_EQ(0, Start());
    EXPECT_TRUE(HasPlaced("INFO", "Ferrix Copy repo NOT mounted '" + m_v1 + "'"));
    ExpectRepoOn(m_v1);
    EXPECT_EQ((std::vector<Strings>{{m_program}}), m_fake.Programs());
}

TEST_F(RepoFinderTest, AVolumeThatTheSettingsCallByAnotherNameIsTakenAsItIs) {
    MakeRepoInUse();
    fs::create_symlink(m_v1, m_dir / "alias");
    ASSERT_EQ(0, RegisterVolume(m_dir / "alias"));
    EXPECT_EQ(0, Start());
    ExpectRepoOn(m_v1);
    EXPECT_EQ((std::vector<Strings>{{m_program}}), m_fake.Programs());
}

}  // namespace
