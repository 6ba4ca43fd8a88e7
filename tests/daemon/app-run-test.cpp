// "run_task", "cancel_task", the copy button and the global setting, while the workers stand still.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "command-fixture.h"
#include "event/event-generator.h"
#include "event/event-manager.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

class RunTest : public CommandTest {
protected:
    RunTest() {
        PlugIn("a", "u-1");
        m_task_id = AddTask("a", "u-1");
        m_log.Clear();
    }
    PObject Run(uint64_t task_id) { return Send("run_task", ForTask(task_id)); }
    PObject Cancel(uint64_t task_id) { return Send("cancel_task", ForTask(task_id)); }
    std::string Status(uint64_t task_id) {
        return Send("get_task_setting", ForTask(task_id))["task_status"].AsString();
    }
    // Another device with a task of its own, on a folder of its own.
    uint64_t AddOther(const std::string& name) {
        m_dir.MakeDir("v1/photos/" + name);
        PlugIn(name, "u-" + name);
        PObject request = AddRequest(name, "u-" + name);
        request["hub_folder_path"] = "/" + name;
        const PObject response = Send("add_task", request);
        EXPECT_THAT(response, IsSuccess());
        return response["task_id"].AsUInt64();
    }
    static bool IsQueued(uint64_t task_id) {
        return TaskEventManager::GetInstance().IsInReadyQueue(task_id);
    }

    uint64_t m_task_id = 0;
};

class CancelTest : public RunTest {};

class CopyButtonTest : public RunTest {
protected:
    // The first task would take the whole share.
    CopyButtonTest() { Send("remove_task", ForTask(m_task_id)); }
};

// --- "run_task"

TEST_F(RunTest, ARunnableTaskIsQueued) {
    EXPECT_EQ("null", Run(m_task_id).ToText());
    EXPECT_TRUE(IsQueued(m_task_id));
    EXPECT_EQ("waiting", Status(m_task_id));
    const std::vector<std::string> lines = m_log.Lines();
    const auto queued = std::find(lines.begin(), lines.end(), "[INFO] Run task '1'");
    ASSERT_NE(lines.end(), queued);
    EXPECT_NE(lines.end(), std::find(queued, lines.end(), "[INFO] Run Task '1'"));
}

TEST_F(RunTest, WithoutATaskIdItIsRefused) {
    EXPECT_THAT(Send("run_task"), IsError(1, "Invalid parameter"));
    EXPECT_TRUE(m_log.Has("[ERR] Invalid parameter"));
    EXPECT_THAT(Send("run_task", PObject("text")), IsError(1, "Invalid parameter"));
}

TEST_F(RunTest, AnIdOfNoTaskIsNotRunnable) {
    PObject text = ForTask(0);
    text["task_id"] = "1";  // a text is no id
    for (const PObject& request : {ForTask(0), ForTask(99), ForTask(UINT64_MAX), text}) {
        EXPECT_THAT(Send("run_task", request), IsError(11, "Task is not runnable"))
            << request.ToText();
    }
    EXPECT_TRUE(m_log.Has("[ERR] Task '99' is not runnable"));
    EXPECT_TRUE(TaskEventManager::GetInstance().IsReadyQueueEmpty());
}

TEST_F(RunTest, AnUnpluggedDeviceMakesATaskNotRunnable) {
    ASSERT_EQ(0, PreUnmount("a"));
    EXPECT_THAT(Run(m_task_id), IsError(11, "Task is not runnable"));
    EXPECT_TRUE(m_log.Has("[ERR] Task '1' is not runnable"));
    EXPECT_FALSE(IsQueued(m_task_id));
}

TEST_F(RunTest, ADeviceThatWentWithoutAWordMakesATaskNotRunnable) {
    m_fake.Unmount(MountPath("a"));
    EXPECT_THAT(Run(m_task_id), IsError(11, "Task is not runnable"));
}

TEST_F(RunTest, ALockedOrMissingShareMakesATaskNotRunnable) {
    m_fake.LockShare("photos");
    EXPECT_THAT(Run(m_task_id), IsError(11, "Task is not runnable"));
    m_fake.LockShare("photos", false);
    m_fake.RemoveShare("photos");
    EXPECT_THAT(Run(m_task_id), IsError(11, "Task is not runnable"));
    EXPECT_FALSE(IsQueued(m_task_id));
}

TEST_F(RunTest, ATaskWithoutItsDevicesEntryIsNotRunnable) {
    TaskEntryHandler::GetInstance().RemoveUSBEntry(Task(m_task_id).usb_id);
    EXPECT_THAT(Run(m_task_id), IsError(11, "Task is not runnable"));
}

TEST_F(RunTest, ATaskThatIsQueuedOrRunsIsRunnableAndNotQueuedTwice) {
    TaskEventManager& queue = TaskEventManager::GetInstance();
    ASSERT_THAT(Run(m_task_id), IsSuccess());
    EXPECT_THAT(Run(m_task_id), IsSuccess());
    EXPECT_TRUE(m_log.Has("[WARN] TaskEventManager: task '1' is already in ready queue"));
    uint64_t task_id = 0;
    ASSERT_EQ(1, queue.PullEvent(task_id));
    EXPECT_THAT(Run(m_task_id), IsSuccess());
    EXPECT_TRUE(m_log.Has("[WARN] TaskEventManager: task '1' is already in processing set"));
    EXPECT_EQ(0, queue.PullEvent(task_id));
    queue.DoneEvent(m_task_id);
}

// --- "cancel_task"

TEST_F(CancelTest, AQueuedTaskLeavesTheQueueWithItsEvents) {
    ASSERT_THAT(Run(m_task_id), IsSuccess());
    EventGenerator(m_task_id).PushScanEvent("/");
    EXPECT_EQ("null", Cancel(m_task_id).ToText());
    EXPECT_FALSE(IsQueued(m_task_id));
    EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(m_task_id));
    EXPECT_EQ("initial", Status(m_task_id));
    EXPECT_TRUE(m_log.Has("[INFO] Cancel Task '1'"));
}

TEST_F(CancelTest, AnIdleTaskStaysAsItIs) {
    const TaskInfo before = Task(m_task_id);
    EXPECT_EQ("null", Cancel(m_task_id).ToText());
    EXPECT_EQ(before, Task(m_task_id));
    EXPECT_TRUE(IsLoaded(m_task_id));
    EXPECT_EQ(TASK_RUN_STATE_IDLE, Entry(m_task_id).status);
    EXPECT_EQ("initial", Status(m_task_id));
}

TEST_F(CancelTest, OtherTasksStayInTheQueue) {
    Send("remove_task", ForTask(m_task_id));
    const uint64_t one = AddOther("one");
    const uint64_t two = AddOther("two");
    ASSERT_THAT(Run(one), IsSuccess());
    ASSERT_THAT(Run(two), IsSuccess());
    EventGenerator(two).PushScanEvent("/");
    EXPECT_THAT(Cancel(one), IsSuccess());
    EXPECT_FALSE(IsQueued(one));
    EXPECT_TRUE(IsQueued(two));
    EXPECT_EQ(1u, EventManager::GetInstance().GetEventCount(two));
}

TEST_F(CancelTest, ATaskWithoutAnEntryIsRefused) {
    EXPECT_THAT(Cancel(99), IsError(8, "Task does not match"));
    EXPECT_TRUE(m_log.Has("[ERR] Task '99' does not match"));
    ASSERT_EQ(0, PreUnmount("a"));
    EXPECT_THAT(Cancel(m_task_id), IsError(8, "Task does not match"));
    EXPECT_THAT(Cancel(0), IsError(8, "Task does not match"));
}

TEST_F(CancelTest, WithoutATaskIdItIsRefused) {
    EXPECT_THAT(Send("cancel_task"), IsError(1, "Invalid parameter"));
    EXPECT_TRUE(m_log.Has("[ERR] Invalid parameter"));
    EXPECT_EQ(0, m_log.Count("[INFO] Ferrixd: PauseProcessors"));
}

TEST_F(CancelTest, TheStepsComeInTheirOrder) {
    ASSERT_THAT(Run(m_task_id), IsSuccess());
    m_log.Clear();
    ASSERT_THAT(Cancel(m_task_id), IsSuccess());
    std::vector<std::string> steps;
    for (const std::string& line : m_log.Lines()) {
        if (line.find("Ferrixd: ") != std::string::npos ||
            line.find("from ready queue") != std::string::npos ||
            line.find("NotifyHWController: cur_led_status = 1, new_led_status = 2") !=
                std::string::npos ||
            line.find("Cancel Task") != std::string::npos) {
            steps.push_back(line.substr(line.find(']') + 2));
        }
    }
    EXPECT_THAT(steps, ElementsAre("Ferrixd: PauseProcessors", "Ferrixd: AbortTask '1'",
                                   "TaskEventManager: Remove task_id '1' from ready queue.",
                                   "NotifyHWController: cur_led_status = 1, new_led_status = 2",
                                   "Ferrixd: ResumeProcessors", "Cancel Task '1'"));
}

// --- The copy button

TEST_F(CopyButtonTest, EveryTaskOfEveryMountedDeviceRuns) {
    const uint64_t one = AddOther("one");
    const uint64_t two = AddOther("two");
    const uint64_t away = AddOther("away");
    ASSERT_EQ(0, PreUnmount("away"));
    EXPECT_EQ(0, PressButton());
    EXPECT_TRUE(m_log.Has("[INFO] HandleFerrix: ferrix button press"));
    EXPECT_TRUE(IsQueued(one));
    EXPECT_TRUE(IsQueued(two));
    EXPECT_FALSE(IsQueued(away));
}

TEST_F(CopyButtonTest, ATaskThatIsNotRunnableIsLoggedAndTheOthersRun) {
    const uint64_t gone = AddOther("gone");
    const uint64_t there = AddOther("there");
    m_fake.Unmount(MountPath("gone"));
    EXPECT_EQ(0, PressButton());
    EXPECT_TRUE(m_log.Has("[ERR] Task '" + std::to_string(gone) + "' is not runnable"));
    EXPECT_FALSE(IsQueued(gone));
    EXPECT_TRUE(IsQueued(there));
}

TEST_F(CopyButtonTest, WithNoDeviceMountedNothingHappens) {
    EXPECT_EQ(0, PressButton());
    EXPECT_TRUE(TaskEventManager::GetInstance().IsReadyQueueEmpty());
    EXPECT_FALSE(m_log.Contains("Run Task"));
}

TEST_F(CopyButtonTest, ADefaultTaskRunsForTheDeviceThatItServes) {
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("front", "u-front", 99);
    ASSERT_EQ(0, PostMount("front"));
    EXPECT_EQ(0, PressButton());
    EXPECT_TRUE(IsQueued(task_id));
}

TEST_F(CopyButtonTest, PressedTwiceItQueuesOnce) {
    const uint64_t one = AddOther("one");
    EXPECT_EQ(0, PressButton());
    EXPECT_EQ(0, PressButton());
    uint64_t task_id = 0;
    EXPECT_EQ(1, TaskEventManager::GetInstance().PullEvent(task_id));
    EXPECT_EQ(one, task_id);
    EXPECT_EQ(0, TaskEventManager::GetInstance().PullEvent(task_id));
    TaskEventManager::GetInstance().DoneEvent(one);
}

}  // namespace
