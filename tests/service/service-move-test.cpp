// The repository goes to another volume, with the daemon stopped before and started after it.
#include <csignal>

#include "service/repository.h"
#include "service/service-ctrl.h"
#include "service/service-fixture.h"

namespace fs = std::filesystem;

namespace {

using Strings = std::vector<std::string>;

class ServiceMoveTest : public ServiceTest {
protected:
    int Start() { return Ctrl().StartService(); }
    bool Move(const std::string& from, const std::string& to) {
        return Ctrl().MoveRepoVolume(from, to);
    }
    void ExpectRefused(const std::string& from, const std::string& to) {
        ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
        EXPECT_FALSE(Move(from, to)) << to;
        EXPECT_TRUE(m_log.Has("[ERR] The repository cannot be moved to '" + to + "'")) << to;
        EXPECT_TRUE(daemon.IsRunning()) << to;
        EXPECT_TRUE(m_fake.Programs().empty()) << to;
        EXPECT_FALSE(fs::exists(m_dir / "p/etc/status")) << to;
    }
};

TEST_F(ServiceMoveTest, AMoveNeedsAPlaceToGo) {
    EXPECT_FALSE(Move(m_v1, ""));
    EXPECT_TRUE(HasPlaced("ERR", "error: to_volume is empty"));
    EXPECT_FALSE(fs::exists(m_dir / "p/etc/status"));
}

TEST_F(ServiceMoveTest, AMoveToTheSameVolumeChangesNothing) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    fs::create_symlink(m_v1, m_dir / "alias");
    ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
    EXPECT_TRUE(Move(m_v1, m_v1));
    EXPECT_TRUE(Move(m_v1, m_v1 + "/"));
    EXPECT_TRUE(Move(m_v1, m_dir / "alias"));
    EXPECT_TRUE(daemon.IsRunning());
    EXPECT_TRUE(m_fake.Programs().empty());
    EXPECT_FALSE(fs::exists(m_dir / "p/etc/status"));
}

TEST_F(ServiceMoveTest, AMoveStopsTheDaemonMovesTheFilesAndStartsIt) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    ASSERT_EQ(0, RegisterVolume(m_v1));
    m_dir.Write("v1/@Ferrix/task/3/user.config", "mine");
    ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
    m_fake.RunProgramsForReal();
    m_fake.SetProgramResult(m_program, 0);
    m_fake.ForgetCalls();
    EXPECT_TRUE(Move(m_v1, m_v2));
    EXPECT_EQ(SIGTERM, daemon.EndSignal());
    EXPECT_EQ((Strings{"6", "5", "2", "3"}), States());
    EXPECT_EQ("mine", ReadWholeFile(m_v2 + "/@Ferrix/task/3/user.config"));
    EXPECT_FALSE(fs::exists(m_v1 + "/@Ferrix"));
    EXPECT_EQ("[\"" + m_v2 + "\"]\n", VolumeList());
    EXPECT_EQ(Strings{m_program}, m_fake.Programs().back());
}

TEST_F(ServiceMoveTest, AMoveFromNowhereMakesANewRepository) {
    EXPECT_TRUE(Move("", m_v2));
    EXPECT_TRUE(fs::is_directory(m_v2 + "/@Ferrix/db"));
    EXPECT_EQ(m_v2, GetRepoVolPath());
    EXPECT_EQ((Strings{"2", "3"}), States());
    fs::remove_all(m_v1);
    EXPECT_FALSE(Move("", m_v1));
    EXPECT_TRUE(HasPlaced("ERR", "failed to MakeRepo(), volume=[" + m_v1 + "]"));
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_EQ(m_v2, GetRepoVolPath());
}

TEST_F(ServiceMoveTest, AMoveThatFailsLeavesTheErrorStateAndTheRepository) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    ASSERT_EQ(0, RegisterVolume(m_v1));
    m_fake.SetProgramResult("/bin/cp", 1);
    EXPECT_FALSE(Move(m_v1, m_v2));
    EXPECT_TRUE(
        HasPlaced("ERR", "failed to move_repo_volume(), from=[" + m_v1 + "], to=[" + m_v2 + "]"));
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_EQ(m_v1, GetRepoVolPath());
    m_fake.RunProgramsForReal();
    m_fake.SetProgramResult("/bin/cp", 1);
    m_fake.SetProgramResult(m_program, 0);
    EXPECT_EQ(0, Start());
}

TEST_F(ServiceMoveTest, AMoveWhoseStartFailsIsAFailure) {
    m_fake.SetProgramResult(m_program, 1);
    EXPECT_FALSE(Move("", m_v2));
    EXPECT_TRUE(HasPlaced("ERR", "failed to StartService()"));
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_EQ(m_v2, GetRepoVolPath());
}

TEST_F(ServiceMoveTest, AMoveIsNotBegunWhileTheDaemonCannotBeStopped) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
    m_fake.FailCall("KLIBCReadPidFile");
    EXPECT_FALSE(Move(m_v1, m_v2));
    EXPECT_TRUE(HasPlaced("ERR", "failed to StopService()"));
    EXPECT_TRUE(m_fake.Programs().empty());
    EXPECT_TRUE(daemon.IsRunning());
}

TEST_F(ServiceMoveTest, APackageThatIsNotEnabledIsMovedAndStaysStopped) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    ASSERT_EQ(0, RegisterVolume(m_v1));
    fs::remove(m_dir / "p/enabled");
    m_fake.RunProgramsForReal();
    EXPECT_TRUE(Move(m_v1, m_v2));
    EXPECT_TRUE(fs::is_directory(m_v2 + "/@Ferrix/db"));
    EXPECT_EQ(StateText(6), Status());
}

TEST_F(ServiceMoveTest, AVolumeThatCannotTakeTheRepositoryIsRefusedWhileTheDaemonRuns) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    ASSERT_EQ(0, RegisterVolume(m_v1));
    const std::string away = m_dir.MakeDir("away");
    m_fake.AddVolume({.mount_path = away, .mounted = false});
    const std::string read_only = m_dir.MakeDir("ro");
    m_fake.AddVolume({.mount_path = read_only, .writable = false});
    const std::string too_long = m_dir.MakeDir(std::string(64, 'v'));
    m_fake.AddVolume({.mount_path = too_long});
    const std::string no_volume = m_dir.MakeDir("folder");
    for (const std::string& to : {away, read_only, too_long, no_volume, m_dir / "none"}) {
        ExpectRefused(m_v1, to);
        ExpectRefused("", to);
    }
    EXPECT_EQ(m_v1, GetRepoVolPath());
}

TEST_F(ServiceMoveTest, AMoveWhoseVolumeGoesAwayBeforeTheStartIsAFailure) {
    m_fake.OnCall("KLIBCFileSetKeyValue", [this] {
        m_fake.RemoveVolume(m_v1);
        m_fake.RemoveVolume(m_v2);
    });
    EXPECT_FALSE(Move("", m_v2));
    EXPECT_TRUE(HasPlaced("ERR", "failed to StartService()"));
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_EQ(nullptr, m_started);
}

TEST_F(ServiceMoveTest, AMoveThatCannotFinishTheStopLeavesTheErrorState) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    ASSERT_EQ(0, RegisterVolume(m_v1));
    ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
    m_fake.FailCall("KELDSchedTaskListGet");
    EXPECT_FALSE(Move(m_v1, m_v2));
    EXPECT_TRUE(HasPlaced("ERR", "failed to StopService()"));
    EXPECT_EQ(SIGTERM, daemon.EndSignal());
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_TRUE(m_fake.Programs().empty());
    EXPECT_EQ(m_v1, GetRepoVolPath());
}

TEST_F(ServiceMoveTest, ARetryKeepsTheRepositoryThatIsInUseByNow) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    ASSERT_EQ(0, RegisterVolume(m_v2));  // as a move leaves it that is killed at its end
    m_dir.Write("v1/@Ferrix/task/3/user.config", "stale");
    m_dir.Write("v2/@Ferrix/task/3/user.config", "mine");
    m_fake.RunProgramsForReal();
    m_fake.SetProgramResult(m_program, 0);
    EXPECT_TRUE(Move(m_v1, m_v2));
    EXPECT_EQ("mine", ReadWholeFile(m_v2 + "/@Ferrix/task/3/user.config"));
    EXPECT_FALSE(fs::exists(m_v1 + "/@Ferrix"));
    EXPECT_TRUE(m_started->IsRunning());
}

}  // namespace
