#include "service/service-ctrl.h"

#include <csignal>

#include "db/task-db.h"
#include "service/child-daemon.h"
#include "service/repository.h"
#include "service/service-fixture.h"

namespace fs = std::filesystem;

namespace {

class ServiceCtrlTest : public ServiceTest {
protected:
    int Start() { return Ctrl().StartService(); }
    int Stop() { return Ctrl().StopService(); }
    bool Move(const std::string& from, const std::string& to) {
        return Ctrl().MoveRepoVolume(from, to);
    }
    int AddSchedule(bool listable) {
        FakeSchedEntry entry;
        entry.app = "KELD.KDS.Ferrix.Application";
        entry.listable = listable ? 1 : 0;
        return m_fake.AddSchedEntry(entry);
    }
    bool IsListable(int id) const { return m_fake.SchedEntries().at(id).listable != 0; }
    // A start that fails after the volume was found says why, and that it failed.
    void ExpectStartFails(const std::string& why) {
        EXPECT_EQ(-1, Start());
        EXPECT_TRUE(m_log.Has("[ERR] " + why)) << why;
        EXPECT_EQ(StateText(7, "err_sys"), Status());
        EXPECT_TRUE(m_fake.BoxLogCodes().empty());
    }
};

using Strings = std::vector<std::string>;

TEST_F(ServiceCtrlTest, APackageThatIsNotEnabledIsNotStarted) {
    fs::remove(m_dir / "p/enabled");
    EXPECT_EQ(0, Start());
    EXPECT_TRUE(m_log.Lines().empty());
    EXPECT_TRUE(m_fake.Programs().empty());
    EXPECT_FALSE(fs::exists(m_dir / "p/etc/status"));
}

TEST_F(ServiceCtrlTest, AServiceThatRunsIsLeftAlone) {
    ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
    ASSERT_EQ(0, SetServiceStatus({SERVICE_STATE_RUNNING, ""}));
    EXPECT_EQ(0, Start());
    EXPECT_EQ(StateText(4), Status());
    EXPECT_TRUE(m_fake.Programs().empty());
    EXPECT_TRUE(daemon.IsRunning());
}

TEST_F(ServiceCtrlTest, TheFirstStartMakesARepositoryAndRunsTheDaemon) {
    EXPECT_EQ(0, Start());
    EXPECT_TRUE(HasPlaced("INFO", "Ferrix Copy repo NOT mounted ''"));
    EXPECT_TRUE(HasPlaced("NOTICE",
                          "Repo volume was empty, create default repo volume as [" + m_v1 + "]."));
    EXPECT_EQ(m_v1, GetRepoVolPath());
    EXPECT_EQ("[\"" + m_v1 + "\"]\n", VolumeList());
    EXPECT_TRUE(fs::is_directory(m_v1 + "/@Ferrix/task"));
    EXPECT_TRUE(GetBeep());
    EXPECT_EQ((Strings{"2", "3"}), States());
    EXPECT_TRUE(m_log.Has("[WARN] UpdaterCore: new install"));
    EXPECT_EQ((std::vector<Strings>{{m_program}}), m_fake.Programs());
    EXPECT_EQ(std::vector<unsigned>{0x11b01050}, m_fake.BoxLogCodes());
    EXPECT_EQ((std::vector<Strings>{
                  {std::to_string(0x11b01050), "Ferrix Copy"}
    }),
              m_fake.CallsOf("KELDLogSet1"));
}

TEST_F(ServiceCtrlTest, AStartBringsTheRepositoryUpToDateAndShowsTheTimetables) {
    ASSERT_EQ(0, RegisterVolume(m_v2));
    m_dir.Write("caps", "ferrix=\"yes\"\n");
    const int entry = AddSchedule(false);
    ASSERT_TRUE(SetBeep(false));
    EXPECT_EQ(0, Start());
    EXPECT_FALSE(HasPlaced("INFO", "Ferrix Copy repo NOT mounted '" + m_v2 + "'"));
    TaskDB db;
    ASSERT_EQ(0, db.Init(m_v2 + "/@Ferrix/db/task-db.sqlite"));
    USBInfo usb;
    EXPECT_EQ(1, db.GetUSBInfoByUUID("FERRIX_DEFAULT_USB_UUID", usb));
    EXPECT_TRUE(IsListable(entry));
    EXPECT_FALSE(GetBeep()) << "the owner's setting stays";
    EXPECT_FALSE(fs::exists(m_v1 + "/@Ferrix"));
}

TEST_F(ServiceCtrlTest, WithoutAVolumeTheServiceWaits) {
    FakeKeld::Reset().AddVolume({.mount_path = m_v1, .writable = false});
    ASSERT_EQ(0, RegisterVolume(m_v2));
    EXPECT_EQ(0, Start());
    EXPECT_TRUE(HasPlaced("INFO", "Ferrix Copy repo NOT mounted '" + m_v2 + "'"));
    EXPECT_EQ(StateText(1), Status());
    EXPECT_EQ("", GetRepoVolPath());
    EXPECT_EQ("[]\n", VolumeList());
    EXPECT_TRUE(m_fake.Programs().empty());
}

TEST_F(ServiceCtrlTest, AWaitingStateThatCannotBeWrittenIsAFailure) {
    FakeKeld::Reset();
    m_fake.FailCall("KLIBCFileSetKeyValue");
    EXPECT_EQ(-1, Start());
    EXPECT_TRUE(HasPlaced("ERR", "fail to SetServiceStatus()"));
    EXPECT_EQ("[]\n", VolumeList());
}

TEST_F(ServiceCtrlTest, ARepositoryThatCanStillBeReachedMovesToAUsableVolume) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    ASSERT_EQ(0, RegisterVolume(m_v1));
    m_dir.Write("v1/@Ferrix/task/3/user.config", "mine");
    m_fake.RemoveVolume(m_v1);
    m_fake.RunProgramsForReal();
    m_fake.SetProgramResult(m_program, 0);
    EXPECT_EQ(0, Start());
    EXPECT_TRUE(HasPlaced(
        "NOTICE",
        "Repo volume [" + m_v1 + "] was not valid, create new repo volume as [" + m_v2 + "]."));
    EXPECT_EQ("mine", ReadWholeFile(m_v2 + "/@Ferrix/task/3/user.config"));
    EXPECT_EQ(m_v2, GetRepoVolPath());
}

TEST_F(ServiceCtrlTest, ARepositoryThatIsGoneGivesWayToANewOne) {
    ASSERT_EQ(0, RegisterVolume(m_dir / "gone"));
    m_fake.RunProgramsForReal();
    m_fake.SetProgramResult(m_program, 0);
    EXPECT_EQ(0, Start());
    EXPECT_EQ(m_v1, GetRepoVolPath());
    EXPECT_TRUE(fs::is_directory(m_v1 + "/@Ferrix/db"));
    EXPECT_FALSE(fs::exists(m_dir / "gone"));
}

TEST_F(ServiceCtrlTest, EachStepOfAStartThatFailsIsTold) {
    ASSERT_EQ(0, RegisterVolume(m_v1));
    const auto fail_state = [&](int skip) {
        m_fake.FailCall("KLIBCFileSetKeyValue", KELDERR_SYSTEM, 1, skip);
    };
    fail_state(0);
    ExpectStartFails("fail to update ferrix copy status to init.");
    ASSERT_TRUE(SetBeep(true));
    fail_state(2);  // after state and error of "init"
    ExpectStartFails("fail to update ferrix copy status to upgrading.");
    fs::remove_all(m_v1 + "/@Ferrix");
    m_dir.Write("v1/@Ferrix", "in the way");
    ExpectStartFails("Failed to MakeRepo '" + m_v1 + "'");
    EXPECT_TRUE(m_log.Has("[ERR] fail to prepare env."));
    fs::remove(m_v1 + "/@Ferrix");
    m_dir.Write("v1/@Ferrix/db/task-db.sqlite", std::string(5000, 'x'));
    ExpectStartFails("fail to run updater");
    fs::remove_all(m_v1 + "/@Ferrix");
    m_fake.FailCall("KELDSchedTaskListGet");
    ExpectStartFails("fail to ShowAllSchedule");
    m_fake.SetProgramResult(m_program, 3);
    ExpectStartFails("Failed to start daemon");
    EXPECT_TRUE(m_log.Has("[ERR] fail to run daemon"));
    m_fake.SetProgramResult(m_program, 0);
    EXPECT_EQ(0, Start());
}

TEST_F(ServiceCtrlTest, ARepositoryThatCannotBeMadeOrRegisteredEndsTheStart) {
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

TEST_F(ServiceCtrlTest, AnErrorStateThatCannotBeWrittenIsTold) {
    ASSERT_EQ(0, RegisterVolume(m_v1));
    m_fake.FailCall("KLIBCFileSetKeyValue", KELDERR_SYSTEM, FakeKeld::ALWAYS);
    EXPECT_EQ(-1, Start());
    EXPECT_TRUE(m_log.Has("[ERR] fail to update ferrix copy status to error."));
}

TEST_F(ServiceCtrlTest, AStartWaitsForTheDaemonsPidFile) {
    ServicePlaces places = Places();
    places.start_wait_ms = 60000;
    m_fake.OnCall("KLIBCExec", [this] { m_dir.Write("daemon.pid", std::to_string(getpid())); });
    EXPECT_EQ(0, ServiceCtrl(places).StartService());
    fs::remove(m_pid_file);
    m_fake.OnCall("KLIBCExec", [] {});
    places.start_wait_ms = 30;
    EXPECT_EQ(0, ServiceCtrl(places).StartService()) << "what became of it shows elsewhere";
}

TEST_F(ServiceCtrlTest, AStopEndsTheDaemonAndHidesTheTimetables) {
    const int entry = AddSchedule(true);
    ChildDaemon daemon(m_pid_file, ChildDaemon::IGNORES_SIGTERM, m_dir / "socket");
    EXPECT_EQ(0, Stop());
    EXPECT_FALSE(IsListable(entry));
    EXPECT_EQ(StateText(6), Status());
    EXPECT_EQ(std::vector<unsigned>{0x11b01051}, m_fake.BoxLogCodes());
    EXPECT_EQ(0, daemon.EndSignal());
}

TEST_F(ServiceCtrlTest, AStopOfNothingChangesNoState) {
    ASSERT_EQ(0, SetServiceStatus({SERVICE_STATE_ERROR, "err_sys"}));
    EXPECT_EQ(-1, Stop());
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_TRUE(m_fake.BoxLogCodes().empty());
}

TEST_F(ServiceCtrlTest, EachStepOfAStopThatFailsIsToldAndTheOthersAreDone) {
    {
        ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
        m_fake.FailCall("KELDSchedTaskListGet");
        EXPECT_EQ(-1, Stop());
        EXPECT_TRUE(m_log.Has("[ERR] fail to HideAllSchedule"));
        EXPECT_EQ(StateText(6), Status());
    }
    ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
    m_fake.FailCall("KLIBCFileSetKeyValue");
    EXPECT_EQ(-1, Stop());
    EXPECT_TRUE(m_log.Has("[ERR] fail to update ferrix copy status to stop."));
    EXPECT_EQ(2U, m_fake.BoxLogCodes().size());
}

TEST_F(ServiceCtrlTest, AMoveNeedsAPlaceToGo) {
    EXPECT_FALSE(Move(m_v1, ""));
    EXPECT_TRUE(HasPlaced("ERR", "error: to_volume is empty"));
    EXPECT_FALSE(fs::exists(m_dir / "p/etc/status"));
}

TEST_F(ServiceCtrlTest, AMoveToTheSameVolumeChangesNothing) {
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

TEST_F(ServiceCtrlTest, AMoveStopsTheDaemonMovesTheFilesAndStartsIt) {
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

TEST_F(ServiceCtrlTest, AMoveFromNowhereMakesANewRepository) {
    EXPECT_TRUE(Move("", m_v2));
    EXPECT_TRUE(fs::is_directory(m_v2 + "/@Ferrix/db"));
    EXPECT_EQ(m_v2, GetRepoVolPath());
    EXPECT_EQ((Strings{"2", "3"}), States());
    EXPECT_FALSE(Move("", m_dir / "none"));
    EXPECT_TRUE(HasPlaced("ERR", "failed to MakeRepo(), volume=[" + (m_dir / "none") + "]"));
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_EQ(m_v2, GetRepoVolPath());
}

TEST_F(ServiceCtrlTest, AMoveThatFailsLeavesTheErrorStateAndTheRepository) {
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

TEST_F(ServiceCtrlTest, AMoveWhoseStartFailsIsAFailure) {
    m_fake.SetProgramResult(m_program, 1);
    EXPECT_FALSE(Move("", m_v2));
    EXPECT_TRUE(HasPlaced("ERR", "failed to StartService()"));
    EXPECT_EQ(StateText(7, "err_sys"), Status());
    EXPECT_EQ(m_v2, GetRepoVolPath());
}

TEST_F(ServiceCtrlTest, AMoveIsNotBegunWhileTheDaemonCannotBeStopped) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
    m_fake.FailCall("KLIBCReadPidFile");
    EXPECT_FALSE(Move(m_v1, m_v2));
    EXPECT_TRUE(HasPlaced("ERR", "failed to StopService()"));
    EXPECT_TRUE(m_fake.Programs().empty());
    EXPECT_TRUE(daemon.IsRunning());
}

TEST_F(ServiceCtrlTest, APackageThatIsNotEnabledIsMovedAndStaysStopped) {
    ASSERT_EQ(0, MakeRepo(m_v1));
    ASSERT_EQ(0, RegisterVolume(m_v1));
    fs::remove(m_dir / "p/enabled");
    m_fake.RunProgramsForReal();
    EXPECT_TRUE(Move(m_v1, m_v2));
    EXPECT_TRUE(fs::is_directory(m_v2 + "/@Ferrix/db"));
    EXPECT_EQ(StateText(6), Status());
}

}  // namespace
