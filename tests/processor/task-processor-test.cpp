#include "processor/task-processor.h"

#include <set>

#include "event/event-manager.h"
#include "platform/error-handler.h"
#include "processor/barrier.h"
#include "processor/hardware-controller.h"
#include "processor/task-event-manager.h"
#include "strategy/version-name.h"
#include "utils/error-code.h"
#include "worker-fixture.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

// The worker without its thread: the test makes the passes of the loop.
class SteppedTaskProcessor : public TaskProcessor {
public:
    SteppedTaskProcessor() { SetStatus(PROCESSOR_RUNNING); }
    using TaskProcessor::HandleAction;
    using TaskProcessor::RunOnce;
};

class TaskProcessorTest : public WorkerFixture {
protected:
    TaskProcessorTest() {
        m_strategy->task_script = [this](ScriptedTaskHandler& handler) {
            ++m_runs;
            m_version_dirs.insert(handler.GetTask()->version_dir);
            return m_on_run ? m_on_run(handler) : m_result;
        };
        m_task = AddTask("holiday");
    }
    void Push() { TaskEventManager::GetInstance().PushEvent(m_task); }
    std::string Id() const { return std::to_string(m_task); }
    int State() const { return Entry(m_task).status; }
    bool IsNowhere() const {
        return !TaskEventManager::GetInstance().IsProcessing(m_task) &&
               TaskEventManager::GetInstance().IsReadyQueueEmpty();
    }
    void SetEject() {
        USBRunInfo usb;
        ASSERT_EQ(0, TaskEntryHandler::GetInstance().GetUSBEntry(USB_ID, usb));
        usb.eject_when_task_done = true;
        TaskEntryHandler::GetInstance().AddUSBEntry(usb);
    }

    uint64_t m_task = 0;
    int m_result = ERR_SUCCESS;
    std::function<int(ScriptedTaskHandler&)> m_on_run;
    int m_runs = 0;
    std::set<std::string> m_version_dirs;
    LogCapture m_log;
    SteppedTaskProcessor m_worker;
};

TEST_F(TaskProcessorTest, AnIdleWorkerHasNothingInHand) {
    m_worker.RunOnce();
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
    EXPECT_EQ(0, m_runs);
}

TEST_F(TaskProcessorTest, AGoodRunIsStoredToldLoggedAndIndexed) {
    Push();
    m_on_run = [this](ScriptedTaskHandler& handler) {
        EXPECT_EQ(m_task, m_worker.GetCurrentTaskId());
        EXPECT_EQ(TASK_RUN_STATE_RUNNING, State());
        EXPECT_TRUE(TaskEventManager::GetInstance().IsProcessing(m_task));
        EXPECT_EQ("holiday", handler.GetTask()->task_name);
        EXPECT_EQ(PROCESSOR_RUNNING, handler.GetProcessorStatus());
        EXPECT_EQ(0, handler.GetAbortFlag()->load());
        EXPECT_THAT(LogRows(), ElementsAre("100 0 [\"holiday\"]"));
        return ERR_SUCCESS;
    };
    m_worker.RunOnce();
    EXPECT_EQ(1, m_runs);
    EXPECT_THAT(LogRows(), ElementsAre("100 0 [\"holiday\"]", "101 0 [\"holiday\"]"));
    EXPECT_EQ(ERR_SUCCESS, Row(m_task).error);
    EXPECT_NE(0U, Row(m_task).last_copied_time);
    ASSERT_THAT(m_fake.Notifications(), SizeIs(1));
    EXPECT_EQ("FERRIXFinished", m_fake.Notifications()[0].tag);
    EXPECT_EQ("holiday", m_fake.Notifications()[0].variables["%TASKNAME%"]);
    EXPECT_THAT(m_fake.Indexed(), ElementsAre(m_share + "/holiday"));
    EXPECT_EQ(TASK_RUN_STATE_IDLE, State());
    EXPECT_TRUE(IsNowhere());
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
    EXPECT_THAT(m_fake.Ejected(), IsEmpty());
    EXPECT_TRUE(m_log.Has("[INFO] TaskProcessor (-1): Get a task event: '" + Id() + "'"));
    EXPECT_TRUE(m_log.Has("[INFO] TaskProcessor (-1): HandleError: Successful."));
    EXPECT_TRUE(m_log.Has("[INFO] TaskProcessor (-1): HandleError: task_err_code = 0."));
    EXPECT_TRUE(m_log.Has("[DBG] TaskProcessor (-1): DoneEvent '" + Id() + "'"));
    EXPECT_TRUE(m_log.Has("[INFO] TaskProcessor (-1): HandleAction (0), task id '" + Id() + "'"));
}

TEST_F(TaskProcessorTest, TheOutcomeOfAnEventDecidesAndNotTheRunsOwn) {
    Push();
    m_on_run = [this](ScriptedTaskHandler&) {
        Ferrix::ErrorHandler::GetInstance().Set(m_task, ERR_DST_QUOTA_FULL);
        return ERR_SUCCESS;
    };
    m_worker.RunOnce();
    EXPECT_EQ(ERR_DST_QUOTA_FULL, Row(m_task).error);
    EXPECT_EQ(0U, Row(m_task).last_copied_time);
    EXPECT_THAT(LogRows(), ElementsAre("100 0 [\"holiday\"]", "103 -19 [\"holiday\"]"));
    EXPECT_EQ("FERRIXNospace", m_fake.Notifications()[0].tag);
    EXPECT_TRUE(IsNowhere());
}

TEST_F(TaskProcessorTest, AFormerRunsOutcomeIsForgotten) {
    Ferrix::ErrorHandler::GetInstance().Set(m_task, ERR_DST_QUOTA_FULL);
    Push();
    m_worker.RunOnce();
    EXPECT_EQ(ERR_SUCCESS, Row(m_task).error);
}

TEST_F(TaskProcessorTest, AFailedRunKeepsTheTimeOfTheLastGoodOne) {
    ASSERT_EQ(0, TaskDB::GetInstance().SetTaskResult(m_task, 0, 12345));
    Push();
    m_result = ERR_SRC_ROOT_MISS;
    while (!IsNowhere()) m_worker.RunOnce();
    EXPECT_EQ(12345U, Row(m_task).last_copied_time);
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Row(m_task).error);
}

TEST_F(TaskProcessorTest, AnIoErrorRunsFourTimesWithARowAndANotificationEach) {
    Push();
    m_result = ERR_IO;
    for (int i = 1; i <= 3; ++i) {
        m_worker.RunOnce();
        EXPECT_EQ(m_task, m_worker.GetCurrentTaskId());
        EXPECT_EQ(TASK_RUN_STATE_RUNNING, State());
    }
    m_worker.RunOnce();
    EXPECT_EQ(4, m_runs);
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
    EXPECT_THAT(m_fake.Notifications(), SizeIs(4));
    EXPECT_THAT(LogRows(), SizeIs(8));
    EXPECT_EQ("103 -2 [\"holiday\"]", LogRows().back());
    EXPECT_EQ(3, m_log.Count("[INFO] TaskProcessor (-1): current task event is valid '" + Id() +
                             "', do it again"));
    EXPECT_TRUE(IsNowhere());
}

TEST_F(TaskProcessorTest, AnInterruptedTaskGoesToTheBackOfTheQueue) {
    const uint64_t other = AddTask("other");
    Push();
    m_result = ERR_INTERRUPTED;
    m_worker.RunOnce();
    TaskEventManager::GetInstance().PushEvent(other);
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
    EXPECT_EQ(TASK_RUN_STATE_IDLE, State());
    EXPECT_FALSE(TaskEventManager::GetInstance().IsProcessing(m_task));
    EXPECT_EQ("102 0 [\"holiday\"]", LogRows().back());
    EXPECT_EQ("FERRIXDisconnect", m_fake.Notifications().back().tag);
    EXPECT_EQ(ERR_INTERRUPTED, Row(m_task).error);
    EXPECT_TRUE(m_log.Has("[DBG] TaskProcessor (-1): RedoEvent '" + Id() + "'"));
    uint64_t next = 0;
    EXPECT_EQ(1, TaskEventManager::GetInstance().PullEvent(next));
    EXPECT_EQ(m_task, next);
}

TEST_F(TaskProcessorTest, AStoppedRunStaysInHand) {
    Push();
    m_result = ERR_PROCESS_STOPPED;
    m_worker.RunOnce();
    EXPECT_EQ(m_task, m_worker.GetCurrentTaskId());
    EXPECT_TRUE(TaskEventManager::GetInstance().IsProcessing(m_task));
    EXPECT_EQ("102 0 [\"holiday\"]", LogRows().back());
}

TEST_F(TaskProcessorTest, AnUnknownOutcomeIsASystemError) {
    Push();
    m_result = 1;
    m_worker.RunOnce();
    EXPECT_TRUE(
        m_log.Has("[CRIT] TaskProcessor (-1): unknown error code [1] -> set errror code [-3]."));
    EXPECT_EQ(ERR_SYSTEM, Row(m_task).error);
}

TEST_F(TaskProcessorTest, AnUnknownActionGivesTheTaskBack) {
    Push();
    m_result = ERR_PROCESS_STOPPED;
    m_worker.RunOnce();
    m_worker.HandleAction(9);
    EXPECT_TRUE(m_log.Has("[WARN] unknown action [9]"));
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
    EXPECT_FALSE(TaskEventManager::GetInstance().IsReadyQueueEmpty());
}

TEST_F(TaskProcessorTest, AVersionTaskGetsADatedFolderThatIsIndexed) {
    m_task = AddTask("version", TASK_TYPE_IMPORT_GENERAL, COPY_STRATEGY_VERSION);
    Push();
    m_worker.RunOnce();
    ASSERT_THAT(m_version_dirs, SizeIs(1));
    const std::string dir = *m_version_dirs.begin();
    EXPECT_THAT(dir, testing::MatchesRegex("Ferrix Copy_[0-9]{4}-[0-9]{2}-[0-9]{2}_[0-9]{6}"));
    EXPECT_THAT(m_fake.Indexed(), ElementsAre(m_share + "/version/" + dir));
}

TEST_F(TaskProcessorTest, ARunDoesNotGoIntoAVersionThatIsThere) {
    m_task = AddTask("version", TASK_TYPE_IMPORT_GENERAL, COPY_STRATEGY_VERSION);
    const time_t now = time(nullptr);
    std::string name;
    for (int second = 0; second <= 60; ++second) {
        ASSERT_EQ(0, NameVersion(now + second, name));
        m_dir.MakeDir("volume1/photos/version/" + name);
    }
    Push();
    m_worker.RunOnce();
    ASSERT_EQ(0, NameVersion(now + 61, name));
    EXPECT_THAT(m_version_dirs, ElementsAre(name));
    EXPECT_THAT(m_fake.Indexed(), ElementsAre(m_share + "/version/" + name));
}

TEST_F(TaskProcessorTest, AnExportIsNotIndexed) {
    m_task = AddTask("export", TASK_TYPE_EXPORT_GENERAL);
    Push();
    m_worker.RunOnce();
    EXPECT_EQ(1, m_runs);
    EXPECT_THAT(m_fake.Indexed(), IsEmpty());
    EXPECT_TRUE(m_log.Has("[DBG] Export Task '" + Id() + "' does not need to create index"));
}

TEST_F(TaskProcessorTest, ATaskWhoseEntryHasGoneEndsWithoutARun) {
    Push();
    TaskEntryHandler::GetInstance().RemoveTaskEntry(m_task);
    m_worker.RunOnce();
    EXPECT_EQ(0, m_runs);
    EXPECT_TRUE(IsNowhere());
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
    EXPECT_TRUE(m_log.Has("[ERR] Task id '" + Id() + "' does not exist"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to update version dir for '" + Id() + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] USB id '0' does not exist"));
    EXPECT_THAT(m_fake.Indexed(), IsEmpty());
    EXPECT_THAT(LogRows(), IsEmpty());
}

// The device of the run before must not be ejected for a task that could not be prepared.
TEST_F(TaskProcessorTest, ARunThatCouldNotBePreparedDoesNothingForTheOneBefore) {
    Push();
    m_worker.RunOnce();
    SetEject();
    const uint64_t gone = AddTask("gone");
    TaskEventManager::GetInstance().PushEvent(gone);
    TaskEntryHandler::GetInstance().RemoveTaskEntry(gone);
    m_worker.RunOnce();
    EXPECT_THAT(m_fake.Ejected(), IsEmpty());
    EXPECT_THAT(m_fake.Indexed(), ElementsAre(m_share + "/holiday"));
}

TEST_F(TaskProcessorTest, WithoutAHandlerTheRunIsASystemError) {
    m_strategy->has_handlers = false;
    Push();
    m_worker.RunOnce();
    EXPECT_EQ(0, m_runs);
    EXPECT_TRUE(
        m_log.Has("[ERR] TaskProcessor (-1): Failed to GetTaskHandler [task: " + Id() + "]"));
    EXPECT_EQ(ERR_SYSTEM, Row(m_task).error);
}

TEST_F(TaskProcessorTest, WithoutAStartRowTheTaskIsNotRun) {
    LogDB::GetInstance().Close();
    Push();
    m_worker.RunOnce();
    EXPECT_EQ(0, m_runs);
    EXPECT_EQ(ERR_SYSTEM, Row(m_task).error);
    // The start row and the end row.
    EXPECT_EQ(2, m_log.Count("[ERR] TaskProcessor (-1): Failed to add log info to log db for '" +
                             Id() + "'"));
}

TEST_F(TaskProcessorTest, FailuresToRecordDoNotChangeTheAction) {
    Push();
    m_on_run = [this](ScriptedTaskHandler&) {
        TaskDB::GetInstance().Close();
        m_fake.FailCall("KELDLnxGetHostname", KELDERR_SYSTEM, FakeKeld::ALWAYS);
        return ERR_SUCCESS;
    };
    m_worker.RunOnce();
    EXPECT_TRUE(m_log.Has("[ERR] Failed to update task info for '" + Id() + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get task info for '" + Id() + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to send notification for '" + Id() + "'"));
    EXPECT_TRUE(IsNowhere());
    EXPECT_THAT(m_fake.Indexed(), IsEmpty());
}

TEST_F(TaskProcessorTest, TheDeviceIsEjectedWhenItIsSetToBe) {
    SetEject();
    Push();
    m_worker.RunOnce();
    EXPECT_THAT(m_fake.Ejected(), ElementsAre("sdb"));
    EXPECT_THAT(m_fake.Programs(),
                ElementsAre(ElementsAre("/lib/udev/script/rdx_util.sh", "eject", "sdb")));
    EXPECT_TRUE(m_log.Has("[INFO] Eject USB for usb '1', usb_share_path = '" + m_usb +
                          "', dev_path = '/dev/sdb1'"));
}

TEST_F(TaskProcessorTest, AFailedEjectIsAWarningAndTheTaskStaysGood) {
    SetEject();
    const struct {
        const char* call;
        std::string lines[3];
    } cases[] = {
        {"KELDVolPathToDevPath",   {"Failed to get dev_path for '" + m_usb + "'"}              },
        {"DiskPartitionNumRemove", {"Failed to get keld_dev_name for '" + m_usb + "'"}         },
        {"KELDExtStgPullOut",
         {"Failed to eject USB for '" + m_usb + "'", "Failed to eject usb for '" + m_usb + "'"}},
        {"KLIBCExec",
         {"Fail to eject RDX device [sdb]", "Failed to eject usb for '" + m_usb + "'"}         },
    };
    for (const auto& c : cases) {
        m_log.Clear();
        m_fake.FailCall(c.call);
        Push();
        m_worker.RunOnce();
        for (const std::string& line : c.lines) {
            if (!line.empty()) {
                EXPECT_TRUE(m_log.Has("[ERR] " + line)) << c.call << ": " << line;
            }
        }
        EXPECT_TRUE(m_log.Has("[WARN] Failed to process eject USB for task '" + Id() + "', ignore"))
            << c.call;
        EXPECT_TRUE(IsNowhere());
        EXPECT_EQ(ERR_SUCCESS, Row(m_task).error);
        EXPECT_EQ(TASK_RUN_STATE_IDLE, State());
    }
}

TEST_F(TaskProcessorTest, PauseAndResumeShowInTheStateOfTheTaskInHand) {
    Push();
    m_on_run = [this](ScriptedTaskHandler& handler) {
        m_worker.Pause();
        EXPECT_EQ(TASK_RUN_STATE_CANCELING, State());
        EXPECT_EQ(PROCESSOR_PAUSED, handler.GetProcessorStatus());
        m_worker.Resume();
        EXPECT_EQ(TASK_RUN_STATE_RUNNING, State());
        EXPECT_EQ(PROCESSOR_RUNNING, handler.GetProcessorStatus());
        return ERR_SUCCESS;
    };
    m_worker.RunOnce();
    EXPECT_EQ(1, m_runs);
    m_log.Clear();
    m_worker.Pause();
    m_worker.Resume();
    EXPECT_EQ(2, m_log.Count("[WARN] Can not find task entry for task_id '0'"));
    EXPECT_EQ(TASK_RUN_STATE_IDLE, State());
}

TEST_F(TaskProcessorTest, AbortReachesTheHandlerOfThatTaskOnly) {
    Push();
    m_on_run = [this](ScriptedTaskHandler& handler) {
        m_worker.Abort(m_task + 1, nullptr);
        EXPECT_EQ(0, handler.GetAbortFlag()->load());
        m_worker.Abort(m_task, nullptr);
        EXPECT_EQ(1, handler.GetAbortFlag()->load());
        return ERR_INTERRUPTED;
    };
    m_worker.RunOnce();
    EXPECT_EQ(1, m_runs);
}

TEST_F(TaskProcessorTest, StopEndsARunThroughTheFlagAndTheStatus) {
    Push();
    m_on_run = [this](ScriptedTaskHandler& handler) {
        m_worker.Stop();
        EXPECT_EQ(1, handler.GetAbortFlag()->load());
        EXPECT_EQ(PROCESSOR_STOPPED, handler.GetProcessorStatus());
        return ERR_PROCESS_STOPPED;
    };
    m_worker.RunOnce();
    EXPECT_EQ(m_task, m_worker.GetCurrentTaskId());
}

TEST_F(TaskProcessorTest, APausedWorkerTakesNothing) {
    Push();
    m_worker.Pause();
    m_worker.RunOnce();
    EXPECT_EQ(0, m_runs);
    EXPECT_FALSE(TaskEventManager::GetInstance().IsReadyQueueEmpty());
}

}  // namespace
