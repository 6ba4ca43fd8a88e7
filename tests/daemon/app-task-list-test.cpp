// "list_task" and "list_entry".
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <map>

#include "command-fixture.h"
#include "db/task-db.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"

using testing::SizeIs;

namespace {

class ListTaskTest : public CommandTest {
protected:
    PObject ListAll() { return Send("list_task"); }
    // The description of the one task there is.
    PObject Only() {
        const PObject response = ListAll();
        EXPECT_THAT(response["task_list"].AsArray(), SizeIs(1));
        return response["task_list"][0];
    }
    std::string Status() { return Only()["task_status"].AsString(); }
    static void SetResult(uint64_t task_id, int error, uint32_t time) {
        ASSERT_EQ(0, TaskDB::GetInstance().SetTaskResult(task_id, error, time));
    }
    static void SetState(uint64_t task_id, int state) {
        ASSERT_EQ(0, TaskEntryHandler::GetInstance().SetTaskState(task_id, state));
    }
};

TEST_F(ListTaskTest, AnEmptyDatabaseGivesAnEmptyArray) {
    const PObject response = ListAll();
    EXPECT_TRUE(response["task_list"].IsArray());
    EXPECT_EQ("{\"task_list\": []}", response.ToText());
}

TEST_F(ListTaskTest, EveryKeyIsThereWithItsKind) {
    PlugIn("a", "u-1");
    AddTask("a", "u-1");
    const PObject task = Only();
    const std::map<std::string, PObject::Kind> keys = {
        {"id",                    PObject::KIND_INTEGER},
        {"type",                  PObject::KIND_INTEGER},
        {"task_name",             PObject::KIND_STRING },
        {"copy_strategy",         PObject::KIND_INTEGER},
        {"keep_dir_structure",    PObject::KIND_INTEGER},
        {"smart_create_date_dir", PObject::KIND_INTEGER},
        {"rename_photo_video",    PObject::KIND_INTEGER},
        {"remove_src_file",       PObject::KIND_INTEGER},
        {"conflict_policy",       PObject::KIND_INTEGER},
        {"enable_rotation",       PObject::KIND_INTEGER},
        {"max_version_count",     PObject::KIND_INTEGER},
        {"rotation_policy",       PObject::KIND_INTEGER},
        {"latest_finish_time",    PObject::KIND_INTEGER},
        {"is_default_task",       PObject::KIND_INTEGER},
        {"uuid",                  PObject::KIND_STRING },
        {"run_when_plug_in",      PObject::KIND_INTEGER},
        {"eject_when_task_done",  PObject::KIND_INTEGER},
        {"producer",              PObject::KIND_STRING },
        {"product",               PObject::KIND_STRING },
        {"task_status",           PObject::KIND_STRING },
        {"is_usb_mounted",        PObject::KIND_INTEGER},
        {"is_hub_mounted",        PObject::KIND_INTEGER},
        {"is_task_runnable",      PObject::KIND_INTEGER},
        {"error_code",            PObject::KIND_INTEGER},
        {"source_path",           PObject::KIND_STRING },
        {"destination_path",      PObject::KIND_STRING },
        {"usb_share_name",        PObject::KIND_STRING },
        {"schedule_id",           PObject::KIND_INTEGER},
        {"copy_file_path",        PObject::KIND_STRING },
    };
    EXPECT_THAT(task.AsMap(), SizeIs(keys.size()));
    for (const auto& [key, kind] : keys) {
        EXPECT_TRUE(task.HasMember(key)) << key;
        EXPECT_EQ(kind, task[key].GetKind()) << key;
    }
}

TEST_F(ListTaskTest, TheDescriptionTellsTheTaskItsDeviceAndItsPaths) {
    m_dir.MakeDir("v1/photos/in");
    PlugIn("a", "u-1");
    PObject request = AddRequest("a", "u-1");
    request["usb_folder_path"] = "/DCIM";
    request["hub_folder_path"] = "/in";
    ASSERT_THAT(Send("add_task", request), IsSuccess());
    SetResult(1, 0, 4000000000u);
    const PObject task = Only();
    EXPECT_EQ(1u, task["id"].AsUInt64());
    EXPECT_EQ(1, task["type"].AsInt32());
    EXPECT_EQ("My task", task["task_name"].AsString());
    EXPECT_EQ(2, task["copy_strategy"].AsInt32());
    EXPECT_EQ(256u, task["max_version_count"].AsUInt64());
    EXPECT_EQ(4000000000u, task["latest_finish_time"].AsUInt64());
    EXPECT_FALSE(task["is_default_task"].AsBool());
    EXPECT_EQ("u-1", task["uuid"].AsString());
    EXPECT_EQ("Maker", task["producer"].AsString());
    EXPECT_EQ("Stick", task["product"].AsString());
    EXPECT_TRUE(task["eject_when_task_done"].AsBool());
    EXPECT_FALSE(task["run_when_plug_in"].AsBool());
    EXPECT_EQ("/DCIM", task["source_path"].AsString());
    EXPECT_EQ("/photos/in", task["destination_path"].AsString());
    EXPECT_EQ("a", task["usb_share_name"].AsString());
    EXPECT_EQ(Task(1).schedule_id, task["schedule_id"].AsInt64());
    EXPECT_EQ("", task["copy_file_path"].AsString());
    EXPECT_TRUE(task["is_usb_mounted"].AsBool());
    EXPECT_TRUE(task["is_hub_mounted"].AsBool());
    EXPECT_TRUE(task["is_task_runnable"].AsBool());
}

TEST_F(ListTaskTest, ADefaultTaskIsKnownAsOne) {
    AddDefaultTask(DEFAULT_SD_UUID);
    EXPECT_TRUE(Only()["is_default_task"].AsBool());
    EXPECT_EQ(-1, Only()["schedule_id"].AsInt64());
}

TEST_F(ListTaskTest, TheStatusOfALoadedTaskFollowsItsRunState) {
    PlugIn("a", "u-1");
    const uint64_t task_id = AddTask("a", "u-1");
    EXPECT_EQ("initial", Status());
    TaskEventManager::GetInstance().PushEvent(task_id);
    EXPECT_EQ("waiting", Status());
    SetState(task_id, TASK_RUN_STATE_RUNNING);
    EXPECT_EQ("copying", Status());
    EXPECT_EQ("", Only()["copy_file_path"].AsString());
    SetState(task_id, TASK_RUN_STATE_CANCELING);
    EXPECT_EQ("canceling", Status());
    SetState(task_id, 7);
    EXPECT_EQ("na", Status());
    SetState(task_id, TASK_RUN_STATE_IDLE);
    TaskEventManager::GetInstance().RemoveEvent(task_id);
    SetResult(task_id, -2, 0);
    EXPECT_EQ("failed", Status());
    EXPECT_EQ(-2, Only()["error_code"].AsInt32());
    SetResult(task_id, 0, 1700000000);
    EXPECT_EQ("successful", Status());
}

TEST_F(ListTaskTest, ATaskOfAnUnmountedDeviceIsUnmountedOrFailed) {
    PlugIn("a", "u-1");
    const uint64_t task_id = AddTask("a", "u-1");
    ASSERT_EQ(0, PreUnmount("a"));
    EXPECT_EQ("unmounted", Status());
    SetResult(task_id, 0, 1700000000);
    EXPECT_EQ("unmounted", Status());
    SetResult(task_id, -19, 0);
    EXPECT_EQ("failed", Status());
    const PObject task = Only();
    EXPECT_FALSE(task["is_usb_mounted"].AsBool());
    EXPECT_FALSE(task["is_hub_mounted"].AsBool());
    EXPECT_FALSE(task["is_task_runnable"].AsBool());
    EXPECT_EQ("", task["usb_share_name"].AsString());
}

TEST_F(ListTaskTest, ADeviceThatLeftWithoutAHookIsNotMounted) {
    PlugIn("a", "u-1");
    AddTask("a", "u-1");
    m_fake.Unmount(MountPath("a"));
    EXPECT_EQ("unmounted", Status());
    EXPECT_FALSE(Only()["is_usb_mounted"].AsBool());
}

TEST_F(ListTaskTest, ALockedShareMakesItsTaskUnmountedAndNotRunnable) {
    PlugIn("a", "u-1");
    AddTask("a", "u-1");
    m_fake.LockShare("photos");
    const PObject task = Only();
    EXPECT_EQ("unmounted", task["task_status"].AsString());
    EXPECT_TRUE(task["is_usb_mounted"].AsBool());
    EXPECT_FALSE(task["is_hub_mounted"].AsBool());
    EXPECT_FALSE(task["is_task_runnable"].AsBool());
}

TEST_F(ListTaskTest, ADisabledTaskIsDisabledWhateverElseHolds) {
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID, false);
    SetResult(task_id, -2, 0);
    EXPECT_EQ("disabled", Status());
}

TEST_F(ListTaskTest, ATaskWithoutADeviceRowIsLeftOut) {
    TaskInfo stray;
    stray.usb_id = 77;
    uint64_t id = 0;
    ASSERT_EQ(0, TaskDB::GetInstance().AddTaskInfo(stray, id));
    PlugIn("a", "u-1");
    const uint64_t task_id = AddTask("a", "u-1");
    EXPECT_EQ(task_id, Only()["id"].AsUInt64());
    EXPECT_TRUE(
        m_log.Has("[WARN] Failed to get task response for '" + std::to_string(id) + "', ignore"));
}

TEST_F(ListTaskTest, TasksThatCannotBeListedAreAnError) {
    DropTable("task_info_table");
    EXPECT_THAT(ListAll(), IsError(2, "Failed to list tasks  from DB"));
}

TEST_F(ListTaskTest, ListEntryWritesTheDumpsToTheLogAndAnswersNothing) {
    PlugIn("a", "u-1");
    AddTask("a", "u-1");
    AddDefaultTask(DEFAULT_USB_UUID, false);
    PlugIn("b", "u-2", 99);
    ASSERT_EQ(-1, PostMount("b"));
    m_log.Clear();
    EXPECT_EQ("null", Send("list_entry").ToText());
    EXPECT_TRUE(m_log.Contains("usb_share_path: " + MountPath("a")));
    EXPECT_TRUE(m_log.Contains("task_name: My task"));
    EXPECT_TRUE(m_log.Contains("candidate 'u-2'"));
}

}  // namespace
