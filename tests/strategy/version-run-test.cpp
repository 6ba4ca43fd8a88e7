// Whole runs of a version task, worked off by hand: what stands at the destination afterwards, and
// what a run that is killed at any moment leaves behind.
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <thread>

#include "db/task-info.h"
#include "event/event-generator.h"
#include "event/event-manager.h"
#include "platform/error-handler.h"
#include "strategy/version-end.h"
#include "strategy/version-task-handler.h"
#include "utils/confined-path.h"
#include "utils/error-code.h"
#include "version-fixture.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

// Does the events of the run at once, on the same thread, so that nothing is waited for.
class RunAtOnce final : public VersionTaskHandler {
public:
    using VersionTaskHandler::PreHandle;

    int DoHandle() override {
        const int result = TaskHandler::DoHandle();
        if (m_work) m_work();
        return result;
    }

    std::function<void()> m_work;
};

class VersionRunTest : public VersionFixture {
protected:
    VersionRunTest() {
        m_handler.SetTask(&m_task);
        m_handler.SetProcessor(&m_processor);
        m_handler.SetAbortFlag(&m_abort);
        m_handler.m_work = [this] { m_failures = DrainEvents(); };
        m_processor.SetStatus(PROCESSOR_RUNNING);
    }
    ~VersionRunTest() override { m_processor.SetStatus(PROCESSOR_STOPPED); }

    int Run(const std::string& version_dir = RUN_DIR) {
        SetVersionDir(version_dir);
        Ferrix::ErrorHandler::GetInstance().Clear(TASK_ID);
        const int result = m_handler.Run();
        Ferrix::ErrorHandler::GetInstance().Set(TASK_ID, result);
        return result;
    }
    void Interrupt() {
        EventGenerator(TASK_ID).PushCopyFileEvent("/pending");
        m_abort = 1;
    }
    // What a process that is killed in the middle of a run leaves: no step of it after this.
    void KillInTheMiddleOfARun(const std::string& version_dir) {
        SetVersionDir(version_dir);
        ASSERT_EQ(0, m_handler.PreHandle());
        WriteDst("/" + version_dir + "/half", "x");
    }
    static std::string Bad(const std::string& name) { return name + ".Bad"; }
    std::string Run1() const { return Dst(std::string("/") + RUN_DIR); }

    RunAtOnce m_handler;
    std::vector<std::string> m_failures;
};

constexpr char SECOND_DIR[] = "Ferrix Copy_2024-03-10_080000";

// --- Good runs ---

TEST_F(VersionRunTest, ARunCopiesTheWholeSourceIntoItsFolder) {
    WriteSrc("/a/b.txt", "bytes");
    WriteSrc("/c", "more");
    MakeSrcDir("/empty");
    WriteDst("/beside", "kept");
    EXPECT_EQ(0, Run());
    EXPECT_THAT(m_failures, IsEmpty());
    EXPECT_EQ(TreeOf(Src()), TreeOf(Run1()));
    EXPECT_THAT(Versions(), ElementsAre(RUN_DIR, "beside"));
    EXPECT_TRUE(m_log.Has("[INFO] TaskHandler: pre handle task '7'"));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(VersionRunTest, AnUnchangedSourceStillGivesAFullNewVersion) {
    WriteSrc("/a", "bytes");
    EXPECT_EQ(0, Run());
    EXPECT_EQ(0, Run(SECOND_DIR));
    EXPECT_THAT(Versions(), ElementsAre(RUN_DIR, SECOND_DIR));
    EXPECT_EQ(TreeOf(Src()), TreeOf(Run1()));
    EXPECT_EQ(TreeOf(Src()), TreeOf(Dst(std::string("/") + SECOND_DIR)));
}

TEST_F(VersionRunTest, AnEmptySourceGivesAnEmptyVersion) {
    EXPECT_EQ(0, Run());
    EXPECT_THAT(Versions(), ElementsAre(RUN_DIR));
}

TEST_F(VersionRunTest, TheFolderIsMadeWithItsParentsAndKeepsItsOwner) {
    m_task.dst_dir_path += "/not/yet/there";
    EXPECT_EQ(0, Run());
    struct stat info {};
    ASSERT_EQ(0, stat(Run1().c_str(), &info));
    EXPECT_EQ(geteuid(), info.st_uid);
    EXPECT_EQ(getegid(), info.st_gid);
}

TEST_F(VersionRunTest, AFolderThatCannotBeMadeDoesNotStopTheRun) {
    SetVersionDir(std::string(300, 'n'));
    EXPECT_EQ(0, m_handler.PreHandle());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to create folder '" + Dst("/" + m_task.version_dir) +
                          "' for task '7'"));
}

TEST_F(VersionRunTest, ARunThatCannotBeginMakesNoFolder) {
    m_fake.LockShare("photos");
    EXPECT_EQ(ERR_WAIT_NOTIFY, Run());
    EXPECT_THAT(Versions(), IsEmpty());
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(VersionRunTest, AFileThatFailsLeavesTheVersionGood) {
    WriteSrc("/a", "bytes");
    WriteSrc("/b", "bytes");
    m_fake.FailCall("KELDFileCopy_r", KELDERR_NO_PERMISSION);
    EXPECT_EQ(0, Run());
    EXPECT_THAT(m_failures, SizeIs(1));
    EXPECT_THAT(Versions(), ElementsAre(RUN_DIR));
}

// --- Rotation after a run ---

TEST_F(VersionRunTest, AGoodRunRotatesWhenItShall) {
    MakeVersion("Ferrix Copy_2020-01-01_000000");
    MakeVersion("Ferrix Copy_2021-01-01_000000");
    m_task.max_version_count = 2;
    EXPECT_EQ(0, Run());
    EXPECT_THAT(Versions(), SizeIs(3)) << "not enabled";
    m_task.enable_rotation = true;
    EXPECT_EQ(0, Run(SECOND_DIR));
    EXPECT_THAT(Versions(), ElementsAre(RUN_DIR, SECOND_DIR));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(VersionRunTest, OtherStrategiesNeverRotate) {
    MakeVersion("Ferrix Copy_2020-01-01_000000");
    MakeVersion("Ferrix Copy_2021-01-01_000000");
    m_task.enable_rotation = true;
    m_task.max_version_count = 1;
    m_handler.m_work = nullptr;
    for (const int strategy : {int{COPY_STRATEGY_MIRROR}, int{COPY_STRATEGY_INCREMENTAL}}) {
        m_task.copy_strategy = strategy;
        m_handler.m_work = [] { EventManager::GetInstance().RemoveTask(TASK_ID); };
        EXPECT_EQ(0, Run());
    }
    EXPECT_TRUE(IsThere(Dst("/Ferrix Copy_2020-01-01_000000")));
    EXPECT_THAT(RotatedRows(), IsEmpty());
}

TEST_F(VersionRunTest, AFailedRotationFailsTheRunAndLeavesItsVersion) {
    MakeVersion("Ferrix Copy_2020-01-01_000000");
    m_task.enable_rotation = true;
    m_task.max_version_count = 1;
    m_task.rotation_policy = 9;
    EXPECT_EQ(ERR_SYSTEM, Run());
    EXPECT_TRUE(m_log.Has("[ERR] TaskHandler: Failed to handle rotation for task '7'"));
    EXPECT_THAT(Versions(), ElementsAre("Ferrix Copy_2020-01-01_000000", RUN_DIR));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(VersionRunTest, ARunThatFillsTheDestinationRotatesNothing) {
    WriteSrc("/a", "bytes");
    WriteSrc("/b", "bytes");
    MakeVersion("Ferrix Copy_2020-01-01_000000");
    m_task.enable_rotation = true;
    m_task.max_version_count = 1;
    for (const int error : {int{KELDERR_NO_SPACE}, int{KELDERR_QUOTA_FULL}}) {
        m_log.Clear();
        m_fake.FailCall("KELDFileCopy_r", error, FakeKeld::ALWAYS);
        EXPECT_EQ(0, Run());
        EXPECT_EQ(ERR_DST_QUOTA_FULL, Ferrix::ErrorHandler::GetInstance().Get(TASK_ID));
        EXPECT_THAT(Versions(), ElementsAre("Ferrix Copy_2020-01-01_000000", RUN_DIR));
        EXPECT_TRUE(m_log.Has("[WARN] The destination of task '7' is full, no version is removed"));
        EXPECT_FALSE(IsThere(MarksPath()));
        fs::remove_all(Run1());
    }
    m_fake.FailCall("KELDFileCopy_r", 0, 0);
    EXPECT_EQ(0, Run(SECOND_DIR));
    EXPECT_THAT(Versions(), ElementsAre(SECOND_DIR));
}

TEST_F(VersionRunTest, ARunWithAnotherFailedFileRotates) {
    WriteSrc("/a", "bytes");
    WriteSrc("/b", "bytes");
    MakeVersion("Ferrix Copy_2020-01-01_000000");
    m_task.enable_rotation = true;
    m_task.max_version_count = 1;
    m_fake.FailCall("KELDFileCopy_r", KELDERR_NO_PERMISSION);
    EXPECT_EQ(0, Run());
    EXPECT_THAT(Versions(), ElementsAre(RUN_DIR));
}

TEST_F(VersionRunTest, AMarkThatStaysDoesNotFailAGoodRun) {
    WriteSrc("/a", "bytes");
    m_handler.m_work = [this] {
        DrainEvents();
        fs::remove(MarksPath());
        fs::create_directory(MarksPath());
    };
    EXPECT_EQ(0, Run());
    EXPECT_THAT(Versions(), ElementsAre(RUN_DIR));
    EXPECT_TRUE(m_log.Contains("gets a bad name when the task is loaded"));
}

// --- Runs that were broken off ---

TEST_F(VersionRunTest, AnInterruptedRunGetsABadName) {
    WriteSrc("/a", "bytes");
    m_task.enable_rotation = true;
    m_task.max_version_count = 1;
    MakeVersion("Ferrix Copy_2020-01-01_000000");
    m_handler.m_work = [this] {
        DrainEvents();
        Interrupt();
    };
    EXPECT_EQ(ERR_INTERRUPTED, Run());
    EXPECT_TRUE(m_log.Has("[INFO] Rename version for task '7', folder name '" + Bad(Run1()) + "'"));
    EXPECT_THAT(Versions(), ElementsAre("Ferrix Copy_2020-01-01_000000", Bad(RUN_DIR)));
    EXPECT_EQ(TreeOf(Src()), TreeOf(Bad(Run1())));
    EXPECT_FALSE(IsThere(MarksPath())) << "settled";
}

TEST_F(VersionRunTest, AStoppedRunGetsABadName) {
    m_handler.m_work = [this] {
        Interrupt();
        m_processor.SetStatus(PROCESSOR_STOPPED);
    };
    EXPECT_EQ(ERR_PROCESS_STOPPED, Run());
    EXPECT_THAT(Versions(), ElementsAre(Bad(RUN_DIR)));
}

TEST_F(VersionRunTest, AFailedRenameChangesNothingAboutTheResult) {
    m_handler.m_work = [this] {
        Interrupt();
        ASSERT_EQ(0, rmdir(Run1().c_str()));
    };
    EXPECT_EQ(ERR_INTERRUPTED, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to rename bad version format for task '7', [ret: -2]"));
    EXPECT_FALSE(IsThere(MarksPath())) << "there is nothing to settle";
}

TEST_F(VersionRunTest, ABadNameThatIsTakenIsNotOverwritten) {
    MakeVersion(Bad(RUN_DIR));
    m_handler.m_work = [this] { Interrupt(); };
    EXPECT_EQ(ERR_INTERRUPTED, Run());
    EXPECT_THAT(Versions(), ElementsAre(Bad(RUN_DIR), "Ferrix Copy_2024-03-09_141503.Bad"));
}

TEST_F(VersionRunTest, ADeviceThatIsGoneAtTheEndLeavesABadVersionAndRotatesNothing) {
    WriteSrc("/a", "bytes");
    MakeVersion("Ferrix Copy_2020-01-01_000000");
    m_task.enable_rotation = true;
    m_task.max_version_count = 1;
    m_handler.m_work = [this] {
        DrainEvents();
        m_fake.Pull(m_usb);
    };
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Run());
    EXPECT_THAT(Versions(), ElementsAre("Ferrix Copy_2020-01-01_000000", Bad(RUN_DIR)));
}

TEST_F(VersionRunTest, ADeviceThatWasGoneAndCameBackLeavesABadVersion) {
    WriteSrc("/d/a", "bytes");
    m_handler.m_work = [this] {
        m_fake.OnCall("KELDDevIsPresent", [this] { m_fake.Pull(m_usb); });
        DrainEvents();
        m_fake.OnCall("KELDDevIsPresent", nullptr);
        m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdb1"});
    };
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Run());
    EXPECT_THAT(Versions(), ElementsAre(Bad(RUN_DIR)));
}

TEST_F(VersionRunTest, CopiesThatDidNotReachTheDiskMakeABadVersion) {
    m_task.dst_root.reset();
    m_handler.m_work = [this] {
        DrainEvents();
        // The flush meets a missing folder.
        fs::rename(Dst(), Dst() + "-away");
    };
    EXPECT_EQ(ERR_IO, Run());
    EXPECT_THAT(Marks(), SizeIs(1)) << "nothing could be renamed: settled later";
    fs::rename(Dst() + "-away", Dst());
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), ElementsAre(Bad(RUN_DIR)));
}

TEST_F(VersionRunTest, TheRenameWaitsUntilTheFileInHandIsLetGo) {
    Event event;
    m_handler.m_work = [&] {
        ASSERT_EQ(1, EventManager::GetInstance().PullEvent(&m_processor, event));
        m_abort = 1;
    };
    std::thread worker([&] {
        // Until the run waits for us; then the copy makes its folder, as it does at any time.
        while (m_log.Count("[ERR] TaskHandler: interrupted while waiting events being done ...") <
               1) {
            usleep(1000);
        }
        usleep(50000);
        EXPECT_TRUE(IsThere(Run1()));
        WriteDst(std::string("/") + RUN_DIR + "/last", "x");
        EXPECT_EQ(0, EventManager::GetInstance().RedoEvent(&m_processor, event));
    });
    EXPECT_EQ(ERR_INTERRUPTED, Run());
    worker.join();
    EXPECT_THAT(Versions(), ElementsAre(Bad(RUN_DIR)));
    EXPECT_TRUE(IsThere(Bad(Run1()) + "/last"));
}

// --- Runs that were killed ---

TEST_F(VersionRunTest, TheMarkIsThereBeforeTheFolder) {
    fs::remove(Dst());
    fs::create_symlink("nowhere", Dst());  // so that the folder cannot be made
    EXPECT_EQ(0, m_handler.PreHandle());
    EXPECT_TRUE(m_log.Contains("Failed to create folder"));
    ASSERT_THAT(Marks(), SizeIs(1));
    EXPECT_EQ(RUN_DIR, Marks()[0].name);
}

TEST_F(VersionRunTest, AMarkThatCannotBeWrittenDoesNotStopTheRun) {
    fs::remove_all(m_dir / "volume1/@Ferrix/task/7");
    WriteSrc("/a", "bytes");
    EXPECT_EQ(0, Run());
    EXPECT_TRUE(
        m_log.Has("[WARN] The version of task '7' will not be known as unfinished after a crash"));
    EXPECT_THAT(Versions(), ElementsAre(RUN_DIR));
}

TEST_F(VersionRunTest, AKilledRunGetsABadNameWhenTheTaskIsLoaded) {
    KillInTheMiddleOfARun(RUN_DIR);
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), ElementsAre(Bad(RUN_DIR)));
    EXPECT_TRUE(IsThere(Bad(Run1()) + "/half"));
    EXPECT_TRUE(m_log.Has("[INFO] Rename version for task '7', folder name '" + Bad(Run1()) + "'"));
    EXPECT_FALSE(IsThere(MarksPath()));
    m_log.Clear();
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(m_log.Lines(), IsEmpty()) << "once";
}

TEST_F(VersionRunTest, AKilledRunGetsABadNameAtTheNextRunAtTheLatest) {
    KillInTheMiddleOfARun(RUN_DIR);
    EXPECT_EQ(0, Run(SECOND_DIR));
    EXPECT_THAT(Versions(), ElementsAre(Bad(RUN_DIR), SECOND_DIR));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(VersionRunTest, AKillBeforeTheFolderIsMadeLeavesNothing) {
    ASSERT_EQ(0, PutVersionMarks(TASK_ID, {MakeVersionMark(m_task, VersionMark::FILLING)}));
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), IsEmpty());
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(VersionRunTest, AKillAfterTheRenameLeavesTheBadName) {
    KillInTheMiddleOfARun(RUN_DIR);
    fs::rename(Run1(), Bad(Run1()));
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), ElementsAre(Bad(RUN_DIR)));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(VersionRunTest, WhatCannotBeReachedIsSettledLater) {
    KillInTheMiddleOfARun(RUN_DIR);
    m_fake.LockShare("photos");
    fs::rename(Dst(), Dst() + "-locked");  // as a locked share looks
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Marks(), SizeIs(1));
    fs::rename(Dst() + "-locked", Dst());
    m_fake.LockShare("photos", false);
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), ElementsAre(Bad(RUN_DIR)));
}

TEST_F(VersionRunTest, AKilledRunIsFoundAfterTheTaskWasGivenAnotherFolder) {
    KillInTheMiddleOfARun(RUN_DIR);
    const std::string old = Run1();
    m_task.dst_dir_path = m_share + "/elsewhere";
    SettleVersionsAtLoad(m_task);
    EXPECT_TRUE(IsThere(Bad(old)));
    EXPECT_FALSE(IsThere(old));
}

TEST_F(VersionRunTest, AKilledExportIsFoundWhereverItsDeviceIsMountedThen) {
    MakeExport();
    KillInTheMiddleOfARun(RUN_DIR);
    m_fake.Unmount(m_usb);
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Marks(), SizeIs(1)) << "the device is not there";
    const std::string elsewhere = m_dir / "usb2";
    fs::rename(m_usb, elsewhere);
    m_fake.AddDevice({.mount_path = elsewhere, .dev_path = "/dev/sdc1", .identity = "same"});
    m_task.device_mount_path = elsewhere;
    m_task.device_identity = "same";
    m_task.dst_dir_path = elsewhere + "/another-folder";
    m_task.dst_root = std::make_shared<ConfinedRoot>(elsewhere);
    SettleVersionsAtLoad(m_task);
    EXPECT_TRUE(IsThere(elsewhere + "/data/" + Bad(RUN_DIR)));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(VersionRunTest, SettlingFollowsNoLinkOutOfTheShare) {
    KillInTheMiddleOfARun(RUN_DIR);
    fs::rename(Dst(), m_dir / "outside");
    fs::create_symlink(m_dir / "outside", Dst());
    SettleVersionsAtLoad(m_task);
    EXPECT_TRUE(IsThere(m_dir / "outside" + "/" + RUN_DIR));
}

TEST_F(VersionRunTest, ManyKilledRunsAreAllSettled) {
    m_fake.LockShare("photos", false);
    std::vector<std::string> expected;
    for (int n = 0; n < 5; ++n) {
        VersionMark mark = MakeVersionMark(m_task, VersionMark::FILLING);
        mark.name = "Ferrix Copy_2024-01-01_00000" + std::to_string(n);
        ASSERT_EQ(0, PutVersionMarks(TASK_ID, {mark}));
        MakeVersion(mark.name);
        expected.push_back(Bad(mark.name));
    }
    SettleVersionsAtLoad(m_task);
    EXPECT_EQ(expected, Versions());
}

// --- Marks ---

TEST_F(VersionRunTest, MarksSurviveTheirFileWithAnyBytes) {
    VersionMark mark;
    mark.kind = VersionMark::REMOVING;
    mark.is_on_device = true;
    mark.share_name = "sh\nare";
    mark.root = "/vol\xff";
    mark.folder = "/a\nb 'c' %s";
    mark.name = RUN_DIR;
    VersionMark second;
    second.name = "x";
    ASSERT_EQ(0, PutVersionMarks(TASK_ID, {mark, second}));
    EXPECT_THAT(Marks(), ElementsAre(mark, second));
    EXPECT_EQ(0, DropVersionMarks(TASK_ID, {mark}));
    EXPECT_THAT(Marks(), ElementsAre(second));
    EXPECT_EQ(0, DropVersionMarks(TASK_ID, {mark})) << "gone already";
    EXPECT_EQ(0, DropVersionMarks(TASK_ID, {second}));
    EXPECT_FALSE(IsThere(MarksPath()));
    EXPECT_EQ(0, DropVersionMarks(TASK_ID, {second})) << "there is no file";
}

TEST_F(VersionRunTest, TheMarksArePrivate) {
    KillInTheMiddleOfARun(RUN_DIR);
    struct stat info {};
    ASSERT_EQ(0, stat(MarksPath().c_str(), &info));
    EXPECT_EQ(0600U, info.st_mode & 07777);
}

TEST_F(VersionRunTest, DamagedMarksLeadNowhere) {
    const std::string texts[] = {"garbage",
                                 std::string("fs\0a\0b\0c", 8),
                                 std::string("xs\0photos\0\0\0n\0", 14),
                                 std::string("fs\0photos\0\0\0../x\0", 17),
                                 std::string("fs\0photos\0\0\0..\0", 15),
                                 std::string("fs\0photos\0\0\0\0", 13)};
    for (const std::string& text : texts) {
        m_dir.Write("volume1/@Ferrix/task/7/version-marks", text);
        m_log.Clear();
        EXPECT_THAT(Marks(), IsEmpty());
        EXPECT_TRUE(m_log.Has("[WARN] The marks of versions '" + MarksPath() + "' are damaged"));
        SettleVersionsAtLoad(m_task);
    }
}

TEST_F(VersionRunTest, MarksThatCannotBeReadAreReported) {
    fs::create_directory(MarksPath());
    std::vector<VersionMark> marks;
    EXPECT_EQ(-1, ReadVersionMarks(TASK_ID, marks));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to read the marks of versions '" + MarksPath() +
                          "': Is a directory"));
    EXPECT_EQ(-1, PutVersionMarks(TASK_ID, {VersionMark()}));
}

}  // namespace
