// "remove_task".
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "add-task-fixture.h"
#include "db/log-description.h"
#include "db/task-db.h"
#include "event/event-generator.h"
#include "event/event-manager.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"

using testing::IsEmpty;
using testing::SizeIs;

namespace {

constexpr int FRONT_USB = 99;

class RemoveTaskTest : public AddTaskTest {
protected:
    void ExpectResumed() {
        EXPECT_EQ(1, m_log.Count("[INFO] Ferrixd: PauseProcessors"));
        EXPECT_EQ(1, m_log.Count("[INFO] Ferrixd: ResumeProcessors"));
    }
    uint64_t Added() {
        const uint64_t task_id = AddTask("a", "u-1");
        m_log.Clear();
        return task_id;
    }
};

TEST_F(RemoveTaskTest, TakesAwayAllThatAddTaskMade) {
    const uint64_t task_id = Added();
    TaskEventManager::GetInstance().PushEvent(task_id);
    EventGenerator(task_id).PushScanEvent("/");
    EXPECT_EQ("null", Send("remove_task", ForTask(task_id)).ToText());
    EXPECT_THAT(Tasks(), IsEmpty());
    EXPECT_THAT(Devices(), IsEmpty());
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_TRUE(TaskEntryHandler::GetInstance().IsUSBEntryEmpty());
    EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
    EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(task_id));
    EXPECT_THAT(m_fake.SchedEntries(), IsEmpty());
    EXPECT_EQ(-1, access(TaskFolder(task_id).c_str(), F_OK));
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_TASK_REMOVED));
    EXPECT_TRUE(m_log.Has("[INFO] Remove Task '1'"));
    ExpectResumed();
}

TEST_F(RemoveTaskTest, WorksForADeviceThatIsAway) {
    const uint64_t task_id = Added();
    ASSERT_EQ(0, PreUnmount("a"));
    m_fake.Unmount(MountPath("a"));
    m_log.Clear();
    EXPECT_THAT(Send("remove_task", ForTask(task_id)), IsSuccess());
    EXPECT_THAT(Tasks(), IsEmpty());
    EXPECT_THAT(Devices(), IsEmpty());
    EXPECT_EQ(0, m_fake.CallCount("KELDVolPathToDevPath"));
    ExpectResumed();
}

TEST_F(RemoveTaskTest, WithoutAnIdIsRefused) {
    EXPECT_THAT(Send("remove_task"), IsError(1, "Invalid parameter"));
    EXPECT_EQ(0, m_log.Count("[INFO] Ferrixd: PauseProcessors"));
}

TEST_F(RemoveTaskTest, AnUnknownTaskIsRefused) {
    EXPECT_THAT(Send("remove_task", ForTask(7)), IsError(6, "Task id does not exist"));
    EXPECT_THAT(Send("remove_task", ForTask(0)), IsError(6, "Task id does not exist"));
    PObject request;
    request["task_id"] = "not a number";
    EXPECT_THAT(Send("remove_task", request), IsError(6, "Task id does not exist"));
    EXPECT_EQ(0, m_log.Count("[INFO] Ferrixd: PauseProcessors"));
}

TEST_F(RemoveTaskTest, ADefaultTaskCannotBeRemoved) {
    for (const char* uuid : {DEFAULT_USB_UUID, DEFAULT_SD_UUID}) {
        const uint64_t task_id = AddDefaultTask(uuid);
        const TaskInfo before = Task(task_id);
        EXPECT_THAT(Send("remove_task", ForTask(task_id)),
                    IsError(11, "Default Task can not be removed"));
        EXPECT_TRUE(
            m_log.Has("[ERR] Default Task '" + std::to_string(task_id) + "' can not be removed"));
        EXPECT_EQ(before, Task(task_id));
        EXPECT_EQ(0, access(TaskFolder(task_id).c_str(), F_OK));
    }
}

TEST_F(RemoveTaskTest, APluggedInDeviceGoesOverToTheDefaultTask) {
    const uint64_t default_id = AddDefaultTask(DEFAULT_USB_UUID);
    TaskInfo default_task = Task(default_id);
    m_dir.MakeDir("v1/photos/d");
    m_dir.MakeDir("v1/photos/b");
    default_task.hub_folder_path = "/d";
    ASSERT_EQ(0, TaskDB::GetInstance().UpdateTaskInfo(default_task));
    PlugIn("b", "u-2", FRONT_USB);
    PObject request = AddRequest("b", "u-2");
    request["hub_folder_path"] = "/b";
    const uint64_t task_id = Send("add_task", request)["task_id"].AsUInt64();
    ASSERT_TRUE(IsLoaded(task_id));
    EXPECT_THAT(Send("remove_task", ForTask(task_id)), IsSuccess());
    EXPECT_TRUE(IsLoaded(default_id));
    EXPECT_EQ(MountPath("b"), Entry(default_id).src_dir_path);
}

TEST_F(RemoveTaskTest, APluggedInDeviceThatDoesNotQualifyIsLeftAlone) {
    AddDefaultTask(DEFAULT_USB_UUID);
    TaskInfo other = Tasks().front();
    m_dir.MakeDir("v1/photos/d");
    other.hub_folder_path = "/d";
    m_dir.MakeDir("v1/photos/a");
    ASSERT_EQ(0, TaskDB::GetInstance().UpdateTaskInfo(other));
    const PObject response = Add([](PObject& request) { request["hub_folder_path"] = "/a"; });
    EXPECT_THAT(Send("remove_task", ForTask(response["task_id"].AsUInt64())), IsSuccess());
    EXPECT_TRUE(TaskEntryHandler::GetInstance().IsTaskEntryEmpty());
    EXPECT_TRUE(m_log.Has("[INFO] Current device 'u-1' is NOT a DEFAULT_TASK"));
}

// Failures on the way: the error is told, the other steps are made, the processors are resumed.

TEST_F(RemoveTaskTest, ARowThatCannotBeRemovedStaysAndTheRestGoes) {
    const uint64_t task_id = Added();
    BreakTable("task_info_table", "DELETE");
    // The device row cannot go either: its trigger removes the task.
    EXPECT_THAT(Send("remove_task", ForTask(task_id)),
                IsError(2, "Failed to RemoveUSBInfo from DB"));
    EXPECT_THAT(Tasks(), SizeIs(1));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_THAT(m_fake.SchedEntries(), IsEmpty());
    EXPECT_EQ(-1, access(TaskFolder(task_id).c_str(), F_OK));
    ExpectResumed();
}

TEST_F(RemoveTaskTest, AScheduleThatCannotBeRemovedIsTold) {
    const uint64_t task_id = Added();
    const int64_t schedule_id = Task(task_id).schedule_id;
    m_fake.FailCall("KELDSchedTaskRemove");
    EXPECT_THAT(Send("remove_task", ForTask(task_id)), IsError(11, "Failed to remove schedule"));
    EXPECT_TRUE(
        m_log.Has("[ERR] Failed to KELDSchedTaskRemove[" + std::to_string(schedule_id) + "]"));
    EXPECT_THAT(Tasks(), IsEmpty());
    EXPECT_EQ(-1, access(TaskFolder(task_id).c_str(), F_OK));
    ExpectResumed();
}

TEST_F(RemoveTaskTest, ATaskWithoutAScheduleNeedsNone) {
    EXPECT_THAT(Add([](PObject& request) { request["schedule_json_str"] = "{broken"; }),
                IsError(11, "Failed to CreateSchedule"));
    EXPECT_THAT(Send("remove_task", ForTask(1)), IsSuccess());
    EXPECT_EQ(0, m_fake.CallCount("KELDSchedTaskRemove"));
}

TEST_F(RemoveTaskTest, AFolderThatCannotBeRemovedIsTold) {
    const uint64_t task_id = Added();
    m_fake.OnCall("KELDSchedTaskRemove", [this] {
        const std::string parent = m_volume + "/@Ferrix/task";
        ASSERT_EQ(0, rename(parent.c_str(), (parent + ".away").c_str()));
        ASSERT_EQ(0, symlink(parent.c_str(), parent.c_str()));  // a loop
    });
    EXPECT_THAT(Send("remove_task", ForTask(task_id)), IsError(11, "Failed to remove task folder"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove task folder '" + TaskFolder(task_id) + "'"));
    EXPECT_THAT(Tasks(), IsEmpty());
    ExpectResumed();
}

TEST_F(RemoveTaskTest, ALogRowThatCannotBeWrittenIsTold) {
    const uint64_t task_id = Added();
    BreakTable("log_info_table", "INSERT");
    EXPECT_THAT(Send("remove_task", ForTask(task_id)),
                IsError(2, "Failed to add log info to log db"));
    EXPECT_THAT(Tasks(), IsEmpty());
    ExpectResumed();
}

TEST_F(RemoveTaskTest, TheLastFailureOverwritesTheEarlierOnes) {
    const uint64_t task_id = Added();
    m_fake.FailCall("KELDSchedTaskRemove");
    BreakTable("log_info_table", "INSERT");
    EXPECT_THAT(Send("remove_task", ForTask(task_id)),
                IsError(2, "Failed to add log info to log db"));
}

TEST_F(RemoveTaskTest, AFailedOfferToTheDefaultTaskIsToldAndResumes) {
    struct Case {
        const char* call;
        const char* text;
    };
    const std::vector<Case> cases = {
        {"KELDVolPathToDevPath", "Failed to get device path"    },
        {"KLIBCFileGetKeyValue", "Failed to get uuid for device"},
    };
    for (const Case& one : cases) {
        const uint64_t task_id = Added();
        if (std::string(one.call) == "KLIBCFileGetKeyValue") {
            ASSERT_EQ(0, unlink((MountPath("a") + "/@eaDir/.KeldoranFerrix.config").c_str()));
        } else {
            m_fake.FailCall(one.call);
        }
        EXPECT_THAT(Send("remove_task", ForTask(task_id)), IsError(11, one.text));
        EXPECT_THAT(Tasks(), IsEmpty());
        ExpectResumed();
    }
}

TEST_F(RemoveTaskTest, ADeviceThatCannotBeRegisteredIsTold) {
    PlugIn("a", "u-1", FRONT_USB);  // it qualifies, and there is no default task
    const uint64_t task_id = Added();
    EXPECT_THAT(Send("remove_task", ForTask(task_id)),
                IsError(11, "Failed to register usb for device"));
    EXPECT_THAT(Tasks(), IsEmpty());
    ExpectResumed();
}

}  // namespace
