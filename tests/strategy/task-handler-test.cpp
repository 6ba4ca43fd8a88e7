#include "strategy/task-handler.h"

#include <gmock/gmock.h>
#include <unistd.h>

#include <ctime>
#include <functional>
#include <thread>

#include "event/event-generator.h"
#include "event/event-manager.h"
#include "platform/error-handler.h"
#include "strategy-fixture.h"
#include "utils/error-code.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

// Does the events of the run at once, on the same thread, so that nothing is waited for.
class RunAtOnce final : public TaskHandler {
public:
    using TaskHandler::PreHandle;
    using TaskHandler::WaitForFileProcessors;

    int DoHandle() override {
        const int result = TaskHandler::DoHandle();
        if (m_work) m_work();
        return result;
    }

    std::function<void()> m_work;
};

class TaskHandlerTest : public StrategyFixture {
protected:
    TaskHandlerTest() {
        m_handler.SetTask(&m_task);
        m_handler.SetProcessor(&m_processor);
        m_handler.SetAbortFlag(&m_abort);
        m_handler.m_work = [this] { m_failures = DrainEvents(); };
        m_processor.SetStatus(PROCESSOR_RUNNING);
    }
    ~TaskHandlerTest() override { m_processor.SetStatus(PROCESSOR_STOPPED); }

    std::string RecordPath() const { return m_dir / "volume1/@Ferrix/task/7/unproven-run"; }
    // As the task worker does for a run that it takes off the queue, and for one that it tries
    // again.
    int Run() {
        Ferrix::ErrorHandler::GetInstance().Clear(TASK_ID);
        return RunAgain();
    }
    int RunAgain() {
        const int result = m_handler.Run();
        Ferrix::ErrorHandler::GetInstance().Set(TASK_ID, result);
        return result;
    }
    int Outcome() { return Ferrix::ErrorHandler::GetInstance().Get(TASK_ID); }
    void PushPendingEvent() { EventGenerator(TASK_ID).PushCopyFileEvent("/pending"); }
    // A destination whose flush fails: it is not there, and its root neither.
    void MakeFlushFail() {
        m_task.dst_root.reset();
        m_task.dst_dir_path = m_dir / "volume1/photos/never-made";
    }

    RunAtOnce m_handler;
    std::vector<std::string> m_failures;
};

TEST_F(TaskHandlerTest, ARunCopiesTheWholeSource) {
    WriteSrc("/a/b.txt", "bytes");
    WriteDst("/old", "gone");
    EXPECT_EQ(0, Run());
    EXPECT_THAT(m_failures, IsEmpty());
    EXPECT_EQ(TreeOf(Src()), TreeOf(Dst()));
    EXPECT_EQ(0, Outcome());
}

TEST_F(TaskHandlerTest, WhatItWasGivenCanBeRead) {
    EXPECT_EQ(&m_task, m_handler.GetTask());
    EXPECT_EQ(&m_abort, m_handler.GetAbortFlag());
    EXPECT_EQ(-1, m_handler.GetProcessorId());
    EXPECT_EQ(PROCESSOR_RUNNING, m_handler.GetProcessorStatus());
}

// --- Before the run ---

TEST_F(TaskHandlerTest, ATaskWithoutItsDeviceWaits) {
    m_fake.Unmount(m_usb);
    EXPECT_EQ(ERR_WAIT_NOTIFY, Run());
    EXPECT_TRUE(m_log.Has("[WARN] Current Task '7' is not runnable"));
    EXPECT_TRUE(m_log.Has("[ERR] TaskHandler: failed to pre-handle task '7'"));
    EXPECT_EQ(0U, EventManager::GetInstance().GetEventCount(TASK_ID)) << "nothing was seeded";
}

TEST_F(TaskHandlerTest, ATaskWithALockedShareWaits) {
    m_fake.LockShare("photos");
    EXPECT_EQ(ERR_WAIT_NOTIFY, Run());
}

TEST_F(TaskHandlerTest, AMissingSourceRootFailsTheRun) {
    ASSERT_EQ(0, rmdir(Src().c_str()));
    WriteDst("/a", "kept");
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Source root folder miss '" + Src() + "'"));
    EXPECT_TRUE(IsThere(Dst("/a")));
}

TEST_F(TaskHandlerTest, ASourceRootThatCannotBeAskedForIsAFileError) {
    m_task.src_dir_path += "/" + std::string(300, 'n');
    EXPECT_EQ(ERR_FILE_OPERATION, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to FSStat '" + Src() + "'."));
}

TEST_F(TaskHandlerTest, ARunIsSeededByOneScanOfTheRoot) {
    m_handler.m_work = nullptr;
    EXPECT_EQ(0, m_handler.DoHandle());
    EXPECT_THAT(TakeIssued(), ElementsAre("scan /"));
}

// --- Waiting ---

TEST_F(TaskHandlerTest, WithoutEventsNothingIsWaitedFor) {
    m_processor.SetStatus(PROCESSOR_STOPPED);
    m_abort = 1;
    EXPECT_EQ(0, m_handler.WaitForFileProcessors());
}

TEST_F(TaskHandlerTest, AStoppedWorkerEndsTheWaitAlsoWhenItIsAborted) {
    PushPendingEvent();
    m_processor.SetStatus(PROCESSOR_STOPPED);
    m_abort = 1;
    EXPECT_EQ(ERR_PROCESS_STOPPED, m_handler.WaitForFileProcessors());
    EXPECT_TRUE(m_log.Has("[WARN] Process stopped while copying files ..."));
}

TEST_F(TaskHandlerTest, AnAbortEndsTheWait) {
    PushPendingEvent();
    m_abort = 1;
    EXPECT_EQ(ERR_INTERRUPTED, m_handler.WaitForFileProcessors());
    EXPECT_TRUE(m_log.Has("[WARN] TaskProcessor '-1' abort flag is set ..."));
}

TEST_F(TaskHandlerTest, APausedWorkerGoesOnWaitingUntilItIsAborted) {
    PushPendingEvent();
    m_processor.SetStatus(PROCESSOR_PAUSED);
    std::thread control([this] {
        while (m_log.Count("[INFO] Wait for file processor (still 1 pending events).") < 2) {
            usleep(1000);
        }
        m_abort = 1;
    });
    EXPECT_EQ(ERR_INTERRUPTED, m_handler.WaitForFileProcessors());
    control.join();
    EXPECT_EQ(3, m_log.Count("[WARN] Process pause while copying files ..."));
}

TEST_F(TaskHandlerTest, AStopDuringTheSleepIsNoticed) {
    PushPendingEvent();
    std::thread control([this] {
        while (m_log.Count("[INFO] Wait for file processor (still 1 pending events).") < 1) {
            usleep(1000);
        }
        m_processor.SetStatus(PROCESSOR_STOPPED);
    });
    EXPECT_EQ(ERR_PROCESS_STOPPED, m_handler.WaitForFileProcessors());
    control.join();
}

TEST_F(TaskHandlerTest, AnInterruptedRunKeepsItsOutcomeAndRenamesNothing) {
    m_handler.m_work = [this] {
        PushPendingEvent();
        m_abort = 1;
    };
    EXPECT_EQ(ERR_INTERRUPTED, Run());
    EXPECT_TRUE(m_log.Has("[ERR] TaskHandler: interrupted while waiting events being done ..."));
    EXPECT_TRUE(m_log.Has("[ERR] TaskHandler: failed to post-handle task '7'"));
    EXPECT_TRUE(IsThere(Dst()));
    EXPECT_FALSE(IsThere(Dst() + ".Bad"));
}

TEST_F(TaskHandlerTest, ABrokenOffRunLeavesOnlyItsLastMomentsUnproven) {
    m_handler.m_work = [this] {
        m_dir.Write("volume1/@Ferrix/task/7/unproven-run", "0 0 1\n");  // began long ago
        PushPendingEvent();
        m_abort = 1;
    };
    const time_t before = time(nullptr);
    EXPECT_EQ(ERR_INTERRUPTED, Run());
    long long open = 0;
    ASSERT_EQ(1, sscanf(ReadWholeFile(RecordPath()).c_str(), "0 0 %lld", &open));
    EXPECT_GE(open, before - 2) << "what came before is flushed";
}

TEST_F(TaskHandlerTest, ABrokenOffRunWithoutItsDestinationLeavesAllUnproven) {
    MakeExport();
    m_handler.m_work = [this] {
        m_dir.Write("volume1/@Ferrix/task/7/unproven-run", "0 0 1\n");
        PushPendingEvent();
        m_fake.Pull(m_usb);
        m_abort = 1;
    };
    EXPECT_EQ(ERR_INTERRUPTED, Run());
    EXPECT_EQ("0 0 1\n", ReadWholeFile(RecordPath()));
}

TEST_F(TaskHandlerTest, ABrokenOffRunWithoutItsDeviceAndItsShareLeavesAllUnproven) {
    m_handler.m_work = [this] {
        m_dir.Write("volume1/@Ferrix/task/7/unproven-run", "0 0 1\n");
        PushPendingEvent();
        m_fake.Pull(m_usb);
        m_fake.LockShare("photos");
        m_abort = 1;
    };
    EXPECT_EQ(ERR_INTERRUPTED, Run());
    EXPECT_EQ("0 0 1\n", ReadWholeFile(RecordPath()));
}

TEST_F(TaskHandlerTest, AMirrorNeverRotates) {
    m_task.enable_rotation = true;
    m_task.max_version_count = 1;
    WriteSrc("/v1/a", "x");
    WriteSrc("/v2/a", "x");
    EXPECT_EQ(0, Run());
    EXPECT_EQ(TreeOf(Src()), TreeOf(Dst()));
}

// --- Done means on the disk ---

TEST_F(TaskHandlerTest, AFailedFlushFailsTheRun) {
    MakeFlushFail();
    EXPECT_EQ(ERR_IO, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to flush file system of '" + Dst() + "' for task '7'"));
    EXPECT_EQ(ERR_IO, Outcome());
}

TEST_F(TaskHandlerTest, ADestinationThatWasNeverMadeIsFlushedAtItsRoot) {
    m_task.dst_dir_path += "/not/yet";
    EXPECT_EQ(0, Run());
    EXPECT_FALSE(IsThere(Dst()));
}

TEST_F(TaskHandlerTest, ARetriedRunDoesNotTurnAFailedFlushIntoSuccess) {
    const TaskRunInfo good = m_task;
    MakeFlushFail();
    EXPECT_EQ(ERR_IO, Run());
    m_task = good;
    WriteSrc("/a", "s");
    WriteDst("/a", "s");  // as the first attempt would have left it
    EXPECT_EQ(0, RunAgain());
    EXPECT_EQ(ERR_IO, Outcome()) << "the outcome of the run";
}

TEST_F(TaskHandlerTest, CopiesOfARunWhoseFlushFailedAreMadeAgain) {
    WriteSrc("/a", "good");
    WriteDst("/a", "lost");  // of equal size and date: what the disk has made of the first copy
    // Unproven from the first second on, and the clock counts for nothing in the test.
    m_dir.Write("volume1/@Ferrix/task/7/unproven-run", "1 99999999999 1\n");
    EXPECT_EQ(0, Run());
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/a=good"));
    EXPECT_FALSE(IsThere(RecordPath())) << "all copied, all flushed";
}

TEST_F(TaskHandlerTest, TheRecordIsThereBeforeTheFirstCopyAndGoneAfterAGoodRun) {
    WriteSrc("/a", "x");
    bool was_there = false;
    m_fake.OnCall("KELDFileCopy_r", [&] { was_there = IsThere(RecordPath()); });
    EXPECT_EQ(0, Run());
    EXPECT_TRUE(was_there);
    EXPECT_FALSE(IsThere(RecordPath()));
}

TEST_F(TaskHandlerTest, TheRecordStaysAfterAFailedFlush) {
    MakeFlushFail();
    EXPECT_EQ(ERR_IO, Run());
    EXPECT_TRUE(IsThere(RecordPath()));
}

TEST_F(TaskHandlerTest, TheRecordStaysWithADoubtfulFileThatCouldNotBeCopied) {
    WriteSrc("/a", "good");
    WriteDst("/a", "lost");
    m_dir.Write("volume1/@Ferrix/task/7/unproven-run", "1 99999999999 1\n");
    m_fake.FailCall("KELDFileCopy_r", KELDERR_NO_PERMISSION);
    EXPECT_EQ(0, Run());
    EXPECT_THAT(m_failures, ElementsAre("/a: -9"));
    EXPECT_EQ("lost", ReadWholeFile(Dst("/a")));
    EXPECT_TRUE(IsThere(RecordPath()));
    EXPECT_EQ(0, Run());
    EXPECT_EQ("good", ReadWholeFile(Dst("/a"))) << "the next run tries again";
    EXPECT_FALSE(IsThere(RecordPath()));
}

TEST_F(TaskHandlerTest, ARepositoryThatCannotBeWrittenDoesNotStopTheRun) {
    ASSERT_EQ(0, rmdir((m_dir / "volume1/@Ferrix/task/7").c_str()));
    WriteSrc("/a", "x");
    EXPECT_EQ(0, Run());
    EXPECT_TRUE(IsThere(Dst("/a")));
    EXPECT_TRUE(m_log.Has("[WARN] Copies of task '7' will not be proven after a crash"));
}

// --- A device that is gone is not an empty device ---

TEST_F(TaskHandlerTest, ADevicePulledDuringTheRunFailsIt) {
    WriteSrc("/a", "x");
    WriteDst("/b", "kept");
    WriteDst("/c/d", "kept");
    m_handler.m_work = [this] {
        m_fake.Pull(m_usb);
        m_failures = DrainEvents();
    };
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Run());
    EXPECT_THAT(m_failures, ElementsAre("/: -22"));
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/b=kept", "/c/", "/c/d=kept"));
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Outcome());
}

TEST_F(TaskHandlerTest, ADeviceThatIsGoneAtTheEndMakesNoGoodRun) {
    m_handler.m_work = [this] {
        m_failures = DrainEvents();  // it listed empty, and so did the destination
        m_fake.Pull(m_usb);
    };
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Run());
    EXPECT_THAT(m_failures, IsEmpty());
}

TEST_F(TaskHandlerTest, ADestinationDeviceThatIsGoneAtTheEndLeavesItsCopiesUnproven) {
    MakeExport();
    WriteSrc("/a", "x");
    m_handler.m_work = [this] {
        m_failures = DrainEvents();
        m_fake.Pull(m_usb);
    };
    EXPECT_EQ(ERR_DST_ROOT_MISS, Run());
    EXPECT_TRUE(IsThere(RecordPath()));
}

TEST_F(TaskHandlerTest, AShareThatIsGoneWithTheDeviceLeavesItsCopiesUnproven) {
    WriteSrc("/a", "x");
    m_handler.m_work = [this] {
        m_failures = DrainEvents();
        m_fake.Pull(m_usb);
        m_fake.LockShare("photos");
    };
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Run());
    EXPECT_TRUE(IsThere(RecordPath()));
}

TEST_F(TaskHandlerTest, AnExportWhoseShareIsGoneHasItsCopiesOnTheDisk) {
    MakeExport();
    WriteSrc("/a", "x");
    m_handler.m_work = [this] {
        m_failures = DrainEvents();
        m_fake.LockShare("photos");
    };
    EXPECT_EQ(ERR_SHARE_NOT_MOUNTED, Run());
    EXPECT_FALSE(IsThere(RecordPath()));
}

// However late the device goes, not one file of the copy is removed for it; and the run is no good
// one unless the device went after it had been asked for the last time.
TEST_F(TaskHandlerTest, WheneverTheDeviceIsPulledNothingOfTheCopyGoes) {
    int pulls = 0;
    for (const char* call : {"KELDShareGet", "KELDDevIsPresent", "KELDShareNamePathGet",
                             "KLIBShareIsEncryptedGet", "KELDFileCopy_r"}) {
        for (int nth = 1; nth <= 12; ++nth) {
            ASSERT_EQ(0, system(("rm -rf " + Src("/*") + " " + Dst("/*")).c_str()));
            m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdb1"});
            WriteSrc("/d/same", "1");
            WriteDst("/d/same", "1");
            WriteSrc("/d/sub/same", "1");
            WriteDst("/d/sub/same", "1");
            WriteSrc("/new", "1");
            WriteDst("/d/old", "2");
            // From the nth call on the device is gone and lists as an empty folder.
            int calls = 0;
            int asked_before = -1;
            m_fake.OnCall(call, [&] {
                if (++calls != nth) return;
                asked_before = m_fake.CallCount("KELDDevIsPresent");
                m_fake.Pull(m_usb);
                EXPECT_EQ(0, system(("rm -rf " + Src("/*")).c_str()));
            });
            m_fake.ForgetCalls();
            Run();
            m_fake.OnCall(call, nullptr);
            EventManager::GetInstance().RemoveTask(TASK_ID);
            if (asked_before < 0) continue;
            ++pulls;
            const std::string when = "pulled at call " + std::to_string(nth) + " of " + call;
            EXPECT_EQ("1", ReadWholeFile(Dst("/d/same"))) << when;
            EXPECT_EQ("1", ReadWholeFile(Dst("/d/sub/same"))) << when;
            if (m_fake.CallCount("KELDDevIsPresent") > asked_before) {
                EXPECT_EQ(ERR_SRC_ROOT_MISS, Outcome()) << when;
            }
        }
    }
    EXPECT_GT(pulls, 20) << "the moments that the test is about";
}

}  // namespace
