// Shares that are deleted, while the workers stand still.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "db/log-description.h"
#include "db/task-db.h"
#include "event/event-generator.h"
#include "event/event-manager.h"
#include "processor/task-event-manager.h"
#include "share-fixture.h"

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

namespace {

constexpr int FRONT_USB = 99;

class ShareDeleteTest : public OnShares<CommandTest> {
protected:
    int Delete(const std::string& share) { return ShareHook("pre_delete", share); }
    // A default task that serves a device at a front port.
    uint64_t LoadedDefaultTask() {
        const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID);
        PlugIn("front", "u-front", FRONT_USB);
        EXPECT_EQ(0, PostMount("front"));
        EXPECT_TRUE(IsLoaded(task_id));
        m_log.Clear();
        return task_id;
    }
    void ExpectBothGone(uint64_t task_id, uint64_t default_task) {
        EXPECT_EQ(0, Delete("photos"));
        EXPECT_FALSE(IsLoaded(task_id));
        EXPECT_FALSE(IsLoaded(default_task));
        ASSERT_THAT(Tasks(), SizeIs(1));
        EXPECT_FALSE(Task(default_task).is_enable);
        EXPECT_EQ("", Task(default_task).hub_share_name);
        EXPECT_EQ(0u, LoadedDevices());
        EXPECT_EQ(1, m_log.Count("[INFO] HandleShareDelete: share_name = photos"));
    }
};

TEST_F(ShareDeleteTest, AUsersTaskIsRemovedAltogether) {
    PlugIn("a", "u-1");
    PObject request = AddRequest("a", "u-1");
    request["schedule_enabled"] = true;
    const uint64_t task_id = Send("add_task", request)["task_id"].AsUInt64();
    ASSERT_THAT(m_fake.SchedEntries(), SizeIs(1));
    TaskEventManager::GetInstance().PushEvent(task_id);
    EventGenerator(task_id).PushScanEvent("/");
    m_log.Clear();
    EXPECT_EQ(0, Delete("photos"));
    EXPECT_THAT(Tasks(), IsEmpty());
    EXPECT_THAT(Devices(), IsEmpty());
    EXPECT_THAT(m_fake.SchedEntries(), IsEmpty());
    EXPECT_EQ(-1, access(TaskFolder(task_id).c_str(), F_OK));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ(0u, LoadedDevices());
    EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
    EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(task_id));
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_TASK_REMOVED));
    EXPECT_THAT(Told({"HandleShareDelete", "Remove Task"}),
                ElementsAre("[INFO] HandleShareDelete: share_name = photos",
                            "[NOTICE] HandleShareDelete: RemoveTask '1' because share 'photos' is "
                            "deleted",
                            "[INFO] Remove Task '1'"));
}

TEST_F(ShareDeleteTest, ADeviceThatQualifiesGoesOverToItsDefaultTask) {
    AddShare("music");
    const uint64_t default_task = AddDefaultTask(DEFAULT_USB_UUID);
    const uint64_t task_id = AddOn("music", "a", FRONT_USB);
    ASSERT_FALSE(IsLoaded(default_task));
    EXPECT_EQ(0, Delete("music"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ(MountPath("a"), Entry(default_task).src_dir_path);
}

TEST_F(ShareDeleteTest, ADefaultTaskLosesItsShareAndIsSwitchedOff) {
    const uint64_t task_id = LoadedDefaultTask();
    TaskEventManager::GetInstance().PushEvent(task_id);
    EventGenerator(task_id).PushScanEvent("/");
    TaskInfo expected = Task(task_id);
    EXPECT_EQ(0, Delete("photos"));
    expected.hub_share_name = "";
    expected.hub_folder_path = "";
    expected.is_enable = false;
    EXPECT_EQ(expected, Task(task_id));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ(0u, LoadedDevices());
    EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
    EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(task_id));
    EXPECT_EQ(0, access(TaskFolder(task_id).c_str(), F_OK));
    EXPECT_EQ("disabled", Status(task_id));
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_DEFAULT_TASK_DISABLED));
    EXPECT_THAT(Told({"HandleShareDelete", "Disable Task", "Ferrixd:"}),
                ElementsAre("[INFO] HandleShareDelete: share_name = photos",
                            "[INFO] HandleShareDelete: ClearTask '1' because share 'photos' is "
                            "deleted",
                            "[INFO] Ferrixd: PauseProcessors", "[INFO] Ferrixd: AbortTask '1'",
                            "[INFO] Ferrixd: ResumeProcessors", "[INFO] Disable Task '1'"));
}

TEST_F(ShareDeleteTest, AClearedTaskIsSwitchedOffThoughItsRowCannotBeWritten) {
    const uint64_t task_id = LoadedDefaultTask();
    BreakTable("task_info_table", "UPDATE");
    EXPECT_EQ(0, Delete("photos"));
    EXPECT_TRUE(m_log.Has("[ERR] HandleSharePathChange: Failed to UpdateTaskInfo 'photos' -> ''"));
    EXPECT_EQ("photos", Task(task_id).hub_share_name);
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ(0u, LoadedDevices());
}

TEST_F(ShareDeleteTest, AClearedTaskServesNothingUntilItHasAShareAgain) {
    const uint64_t task_id = LoadedDefaultTask();
    EXPECT_EQ(0, Delete("photos"));
    EXPECT_EQ(-1, PostMount("front"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_THAT(Send("set_task_setting", ImportSetting(task_id, {})), IsSuccess());
    EXPECT_THAT(Send("enable_task", ForTask(task_id)), IsSuccess());
    EXPECT_EQ(m_volume + "/photos", Entry(task_id).dst_dir_path);
}

// Whichever comes first in the list, the device does not end up with a task on the deleted share.
TEST_F(ShareDeleteTest, AUsersTaskAndALaterDefaultTaskGoTogether) {
    const uint64_t task_id = AddOn("photos", "a", FRONT_USB);
    ExpectBothGone(task_id, AddDefaultTask(DEFAULT_USB_UUID));
    EXPECT_TRUE(m_log.Has("[INFO] Add task '2'"));  // it had the device for a moment
}

TEST_F(ShareDeleteTest, AnEarlierDefaultTaskAndAUsersTaskGoTogether) {
    const uint64_t default_task = AddDefaultTask(DEFAULT_USB_UUID, false);
    const uint64_t task_id = AddOn("photos", "a", FRONT_USB);
    ASSERT_EQ(0, TaskDB::GetInstance().SetTaskEnable(default_task, true));
    ExpectBothGone(task_id, default_task);
    EXPECT_FALSE(m_log.Contains("Add task"));
}

TEST_F(ShareDeleteTest, EveryTaskOfTheShareGoesAndNoOther) {
    AddShare("music");
    AddOn("photos", "one");
    const uint64_t other = AddOn("music", "other");
    AddOn("photos", "two");
    EXPECT_EQ(0, Delete("photos"));
    ASSERT_THAT(Tasks(), SizeIs(1));
    EXPECT_EQ(other, Tasks().front().id);
    EXPECT_TRUE(IsLoaded(other));
    EXPECT_EQ(1, m_log.Count("[INFO] HandleShareDelete: share_name = photos"));
}

TEST_F(ShareDeleteTest, ATaskWhoseDeviceIsAwayIsRemovedToo) {
    AddOn("photos", "a");
    ASSERT_EQ(0, PreUnmount("a"));
    EXPECT_EQ(0, Delete("photos"));
    EXPECT_THAT(Tasks(), IsEmpty());
}

TEST_F(ShareDeleteTest, ARemovalThatFailsIsToldAndTheOthersGoOn) {
    AddOn("photos", "one");
    const uint64_t two = AddOn("photos", "two");
    m_fake.FailCall("KELDVolPathToDevPath");  // the first device cannot be offered to another task
    EXPECT_EQ(0, Delete("photos"));
    EXPECT_TRUE(m_log.Has("[WARN] Failed to remove task for '1', ignore"));
    EXPECT_FALSE(m_log.Has("[WARN] Failed to remove task for '2', ignore"));
    EXPECT_FALSE(IsLoaded(two));
    EXPECT_THAT(Tasks(), IsEmpty());
    EXPECT_EQ(m_log.Count("[INFO] Ferrixd: PauseProcessors"),
              m_log.Count("[INFO] Ferrixd: ResumeProcessors"));
}

}  // namespace
