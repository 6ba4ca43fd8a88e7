#include "service/service-ctrl.h"

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
    int SettleStop() { return Ctrl().SettleStop(); }
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
    OnDaemonProgram([] {});
    ExpectStartFails("Failed to start daemon");
    EXPECT_TRUE(m_log.Has("[ERR] fail to run daemon"));
    LetDaemonStart();
    EXPECT_EQ(0, Start());
    EXPECT_TRUE(m_started->IsRunning());
}

// A control program may be killed between the settings and the list.
TEST_F(ServiceCtrlTest, AStartMakesThePackageManagersListRight) {
    ASSERT_EQ(0, RegisterVolume(m_v1));
    ASSERT_TRUE(SetRepoVolPath(m_v2));
    ASSERT_EQ("[\"" + m_v1 + "\"]\n", VolumeList());
    EXPECT_EQ(0, Start());
    EXPECT_EQ("[\"" + m_v2 + "\"]\n", VolumeList());
}

TEST_F(ServiceCtrlTest, AnErrorStateThatCannotBeWrittenIsTold) {
    ASSERT_EQ(0, RegisterVolume(m_v1));
    m_fake.FailCall("KLIBCFileSetKeyValue", KELDERR_SYSTEM, FakeKeld::ALWAYS);
    EXPECT_EQ(-1, Start());
    EXPECT_TRUE(m_log.Has("[ERR] fail to update ferrix copy status to error."));
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

TEST_F(ServiceCtrlTest, AServiceWhoseDaemonHasCrashedIsBroughtToItsEnd) {
    const int entry = AddSchedule(true);
    ASSERT_EQ(0, SetServiceStatus({SERVICE_STATE_RUNNING, ""}));
    {
        ChildDaemon daemon(m_pid_file, ChildDaemon::ENDS_AT_SIGTERM);
        EXPECT_EQ(-1, SettleStop()) << "that one runs";
        EXPECT_EQ(StateText(4), Status());
        EXPECT_TRUE(IsListable(entry));
    }
    EXPECT_EQ(0, SettleStop());
    EXPECT_FALSE(IsListable(entry));
    EXPECT_EQ(StateText(6), Status());
    EXPECT_NE(0, access(m_pid_file.c_str(), F_OK));
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

}  // namespace
