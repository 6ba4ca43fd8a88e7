// Shares that are renamed, restored and transformed, while the workers stand still.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>

#include "db/task-db.h"
#include "event/event-generator.h"
#include "event/event-manager.h"
#include "processor/task-event-manager.h"
#include "share-fixture.h"
#include "utils/confined-path.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr char BEFORE[] = "pre_path_change";
constexpr char AFTER[] = "post_path_change";

class ShareTest : public OnShares<CommandTest> {
protected:
    // A second task of a device, which commands do not make.
    uint64_t AddSecondTask(uint64_t task_id, const std::string& share) {
        TaskInfo second = Task(task_id);
        second.hub_share_name = share;
        EXPECT_EQ(0, TaskDB::GetInstance().AddTaskInfo(second, second.id));
        std::filesystem::copy(TaskFolder(task_id), TaskFolder(second.id));
        LoadEntries();
        EXPECT_TRUE(IsLoaded(second.id));
        m_log.Clear();
        return second.id;
    }
    // The share of the same name on another volume; gives its path there.
    std::string PutShareOnVolume(const std::string& share, const std::string& volume) {
        const std::string path = m_dir.MakeDir(volume + "/" + share);
        m_fake.AddShare({.name = share, .path = path, .volume = m_dir / volume});
        return path;
    }
};

// --- What all of them refuse, and what they pass over

struct Hook {
    const char* name;
    const char* handler;
};

const Hook HOOKS[] = {
    {"pre_path_change",       "HandleShareRemoveEntry"},
    {"post_path_change",      "HandleSharePathChange" },
    {"pre_delete",            "HandleShareDelete"     },
    {"pre_encrypt",           "HandleShareUnmounted"  },
    {"post_decrypt",          "HandleShareMounted"    },
    {"pre_snapshot_restore",  "HandleShareRemoveEntry"},
    {"post_snapshot_restore", "HandleShareReloadEntry"},
    {"pre_transform",         "HandleShareRemoveEntry"},
    {"post_transform",        "HandleShareReloadEntry"},
};

TEST_F(ShareTest, HooksWithoutAShareNameAreInvalid) {
    const uint64_t task_id = AddOn("photos", "a");
    const std::string nothing_before_nul("\0photos", 7);
    for (const Hook& hook : HOOKS) {
        for (const PObject& request : {PObject(), PObject("text"), ShareRequest("", "photos"),
                                       ShareRequest(nothing_before_nul, "photos")}) {
            m_log.Clear();
            EXPECT_EQ(-1, Notify(hook.name, request)) << hook.name << " " << request.ToText();
            EXPECT_THAT(Told(),
                        ElementsAre(std::string("[ERR] ") + hook.handler + ": Invalid parameter"));
        }
    }
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_EQ("photos", Task(task_id).hub_share_name);
}

// A cleared default task has an empty share name, which no hook may take for its own.
TEST_F(ShareTest, APathChangeNeedsBothNames) {
    AddOn("photos", "a");
    EXPECT_EQ(-1, ShareHook(AFTER, "photos"));
    EXPECT_EQ(-1, ShareHook(AFTER, "", "photos"));
    EXPECT_THAT(Told(), ElementsAre("[ERR] HandleSharePathChange: Invalid parameter",
                                    "[ERR] HandleSharePathChange: Invalid parameter"));
}

TEST_F(ShareTest, AnyHookForAShareWithoutTasksIsAQuietSuccess) {
    const uint64_t task_id = AddOn("photos", "a");
    AddShare("music");
    for (const Hook& hook : HOOKS) {
        EXPECT_EQ(0, ShareHook(hook.name, "music", "films")) << hook.name;
    }
    EXPECT_THAT(Told(), IsEmpty());
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_EQ(0, m_fake.CallCount("KELDMountVolAllEnum"));
}

TEST_F(ShareTest, AShareIsTheOneOfExactlyThatName) {
    const uint64_t task_id = AddOn("photos", "a");
    for (const char* name : {"Photos", "photo", "photos ", "photos%", "%", "' OR '1'='1"}) {
        EXPECT_EQ(0, ShareHook(BEFORE, name)) << name;
    }
    EXPECT_THAT(Told(), IsEmpty());
    EXPECT_TRUE(IsLoaded(task_id));
}

TEST_F(ShareTest, TasksThatCannotBeListedFailEveryHook) {
    AddOn("photos", "a");
    DropTable("task_info_table");
    for (const Hook& hook : HOOKS) {
        m_log.Clear();
        EXPECT_EQ(-1, ShareHook(hook.name, "100%s", "100%s")) << hook.name;
        EXPECT_TRUE(m_log.Has("[ERR] Failed to list all task info for share name '100%s'"))
            << hook.name;
        EXPECT_FALSE(m_log.Contains(hook.handler)) << hook.name;
        EXPECT_FALSE(m_log.Contains("PauseProcessors")) << hook.name;
    }
}

// --- Out of the system

TEST_F(ShareTest, TasksLeaveTheSystemBeforeAChangeAndTheirRowsStay) {
    for (const char* hook : {"pre_path_change", "pre_snapshot_restore", "pre_transform"}) {
        const std::string device = std::string("of-") + hook;
        const uint64_t task_id = AddOn("photos", device);
        const TaskInfo before = Task(task_id);
        TaskEventManager::GetInstance().PushEvent(task_id);
        EventGenerator(task_id).PushScanEvent("/");
        ASSERT_EQ(1u, EventManager::GetInstance().GetEventCount(task_id));
        EXPECT_EQ(0, ShareHook(hook, "photos"));
        EXPECT_FALSE(IsLoaded(task_id)) << hook;
        EXPECT_EQ(0u, LoadedDevices()) << hook;
        EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id)) << hook;
        EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(task_id)) << hook;
        EXPECT_EQ(before, Task(task_id)) << hook;
        EXPECT_EQ("unmounted", Status(task_id)) << hook;
    }
}

TEST_F(ShareTest, TheStepsBeforeAChangeComeInTheirOrder) {
    AddOn("photos", "a");
    AddOn("photos", "b");
    EXPECT_EQ(0, ShareHook(BEFORE, "photos"));
    EXPECT_THAT(Told({"Share", "Ferrixd:", "Remove usb"}),
                ElementsAre("[INFO] HandleShareRemoveEntry: share_name = photos",
                            "[INFO] Ferrixd: PauseProcessors", "[INFO] Ferrixd: AbortTask '1'",
                            "[INFO] Remove usb '1'", "[INFO] Ferrixd: AbortTask '2'",
                            "[INFO] Remove usb '2'", "[INFO] Ferrixd: ResumeProcessors"));
}

TEST_F(ShareTest, TasksOfOtherSharesStay) {
    AddShare("music");
    const uint64_t task_id = AddOn("photos", "a");
    const uint64_t other = AddOn("music", "b");
    ASSERT_THAT(Send("run_task", ForTask(other)), IsSuccess());
    EXPECT_EQ(0, ShareHook(BEFORE, "photos"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_TRUE(IsLoaded(other));
    EXPECT_EQ("waiting", Status(other));
}

TEST_F(ShareTest, ADeviceStaysWithItsTaskOnAnotherShare) {
    AddShare("music");
    const uint64_t task_id = AddOn("photos", "a");
    const uint64_t other = AddSecondTask(task_id, "music");
    const auto before = Entry(other).strategy_handler;
    EXPECT_EQ(0, ShareHook(BEFORE, "photos"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ(1u, LoadedDevices());
    EXPECT_EQ(0, ShareHook(AFTER, "photos", "photos"));
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_EQ(before, Entry(other).strategy_handler);  // passed over as loaded
}

TEST_F(ShareTest, ATaskWhoseDeviceIsAwayIsNoHindrance) {
    const uint64_t task_id = AddOn("photos", "a");
    ASSERT_EQ(0, PreUnmount("a"));
    m_fake.Unmount(MountPath("a"));
    RenameShare("photos", "pictures");
    EXPECT_EQ("pictures", Task(task_id).hub_share_name);
    EXPECT_FALSE(IsLoaded(task_id));
    PlugIn("a", "u-a");
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_EQ(m_volume + "/pictures/a", Entry(task_id).dst_dir_path);
}

// The hook table itself never passes this type.
TEST_F(ShareTest, ATypeOfPrePathChangeMeansTheOldName) {
    const uint64_t task_id = AddOn("photos", "a");
    PObject request = ShareRequest("photos", "music");
    request["type"] = "pre_path_change";
    EXPECT_EQ(0, Notify(BEFORE, request));
    EXPECT_TRUE(IsLoaded(task_id));
    request = ShareRequest("music", "photos");
    EXPECT_EQ(0, Notify(BEFORE, request));  // of any other type
    EXPECT_TRUE(IsLoaded(task_id));
    request["type"] = "pre_path_change";
    EXPECT_EQ(0, Notify(BEFORE, request));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_TRUE(m_log.Has("[INFO] HandleShareRemoveEntry: share_name = photos"));
    PObject without = ShareRequest("photos");
    without["type"] = "pre_path_change";
    EXPECT_EQ(-1, Notify(BEFORE, without));
    EXPECT_TRUE(m_log.Has("[ERR] HandleShareRemoveEntry: Invalid parameter"));
}

// --- Back again

TEST_F(ShareTest, ATaskFollowsARenamedShare) {
    const uint64_t task_id = AddOn("photos", "a");
    TaskInfo expected = Task(task_id);
    ASSERT_THAT(Send("run_task", ForTask(task_id)), IsSuccess());
    m_fake.ForgetCalls();
    RenameShare("photos", "pictures");
    expected.hub_share_name = "pictures";
    EXPECT_EQ(expected, Task(task_id));
    ASSERT_TRUE(IsLoaded(task_id));
    const TaskRunInfo entry = Entry(task_id);
    EXPECT_EQ("pictures", entry.hub_share_name);
    EXPECT_EQ(m_volume + "/pictures/a", entry.dst_dir_path);
    EXPECT_EQ(m_volume + "/pictures", entry.dst_root->Path());
    EXPECT_EQ(MountPath("a"), entry.src_dir_path);
    EXPECT_EQ(TASK_RUN_STATE_IDLE, entry.status);
    EXPECT_EQ(1u, LoadedDevices());
    EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
    EXPECT_EQ("initial", Status(task_id));
    EXPECT_TRUE(
        m_log.Has("[INFO] HandleSharePathChange: origin_share_name = photos, "
                  "share_name = pictures"));
    EXPECT_THAT(m_fake.CallsOf("KELDMountVolAllEnum"), testing::SizeIs(1));
}

TEST_F(ShareTest, AnExportFollowsARenamedShare) {
    m_dir.MakeDir("v1/photos/deep");
    PlugIn("x", "u-x");
    PObject request = AddRequest("x", "u-x");
    request["task_type"] = static_cast<int>(TASK_TYPE_EXPORT_GENERAL);
    request["hub_folder_path"] = "/deep";
    const uint64_t task_id = Send("add_task", request)["task_id"].AsUInt64();
    RenameShare("photos", "pictures");
    EXPECT_EQ(m_volume + "/pictures/deep", Entry(task_id).src_dir_path);
    EXPECT_EQ(MountPath("x"), Entry(task_id).dst_dir_path);
}

TEST_F(ShareTest, EveryTaskOfARenamedShareFollowsAndNoOther) {
    AddShare("music");
    const uint64_t one = AddOn("photos", "one");
    const uint64_t two = AddOn("photos", "two");
    const uint64_t other = AddOn("music", "other");
    const auto before = Entry(other).strategy_handler;
    RenameShare("photos", "it's 100%s\n\xff");
    for (const uint64_t task_id : {one, two}) {
        EXPECT_EQ("it's 100%s\n\xff", Task(task_id).hub_share_name);
        EXPECT_EQ("it's 100%s\n\xff", Entry(task_id).hub_share_name);
    }
    EXPECT_EQ("music", Task(other).hub_share_name);
    EXPECT_EQ(before, Entry(other).strategy_handler);
}

TEST_F(ShareTest, APathChangeOfTheSameNameReloadsWithoutAnUpdate) {
    const uint64_t task_id = AddOn("photos", "a");
    EXPECT_EQ(0, ShareHook(BEFORE, "photos"));
    BreakTable("task_info_table", "UPDATE");  // it would fail
    EXPECT_EQ(0, ShareHook(AFTER, "photos", "photos"));
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_TRUE(
        m_log.Has("[INFO] HandleSharePathChange: origin_share_name = photos, share_name = photos"));
}

TEST_F(ShareTest, AnUpdateThatFailsEndsTheHook) {
    const uint64_t task_id = AddOn("photos", "a");
    EXPECT_EQ(0, ShareHook(BEFORE, "photos"));
    MoveShare("photos", "pictures");
    BreakTable("task_info_table", "UPDATE");
    EXPECT_EQ(-1, ShareHook(AFTER, "pictures", "photos"));
    EXPECT_TRUE(
        m_log.Has("[ERR] HandleSharePathChange: Failed to UpdateHUBShareName 'photos' -> "
                  "'pictures'"));
    EXPECT_EQ("photos", Task(task_id).hub_share_name);
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_FALSE(m_log.Contains("origin_share_name"));
}

TEST_F(ShareTest, TasksComeBackAfterARestoreAndATransformation) {
    for (const char* kind : {"snapshot_restore", "transform"}) {
        const uint64_t task_id = AddOn("photos", kind);
        EXPECT_EQ(0, ShareHook(std::string("pre_") + kind, "photos"));
        EXPECT_FALSE(IsLoaded(task_id));
        m_log.Clear();
        EXPECT_EQ(0, ShareHook(std::string("post_") + kind, "photos"));
        EXPECT_TRUE(IsLoaded(task_id)) << kind;
        EXPECT_EQ(TASK_RUN_STATE_IDLE, Entry(task_id).status);
        EXPECT_TRUE(m_log.Has("[INFO] HandleShareReloadEntry: share_name = photos"));
    }
}

TEST_F(ShareTest, ReloadingStartsNothing) {
    const uint64_t task_id = AddOn("photos", "a");
    PObject trigger = ForTask(task_id);
    trigger["run_when_plug_in"] = true;
    trigger["schedule_json_str"] = "{}";
    ASSERT_THAT(Send("set_trigger_time_setting", trigger), IsSuccess());
    RenameShare("photos", "pictures");
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
}

// --- Devices that come and go meanwhile

TEST_F(ShareTest, ADeviceThatLeavesDuringTheChangeIsNotLoaded) {
    const uint64_t task_id = AddOn("photos", "a");
    EXPECT_EQ(0, ShareHook(BEFORE, "photos"));
    EXPECT_EQ(0, PreUnmount("a"));
    m_fake.Unmount(MountPath("a"));
    MoveShare("photos", "pictures");
    EXPECT_EQ(0, ShareHook(AFTER, "pictures", "photos"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ(0u, LoadedDevices());
    EXPECT_EQ("pictures", Task(task_id).hub_share_name);
}

TEST_F(ShareTest, ADeviceThatComesWhenTheShareHasMovedGetsItsTaskAfterTheChange) {
    const uint64_t task_id = AddOn("photos", "a");
    EXPECT_EQ(0, ShareHook(BEFORE, "photos"));
    MoveShare("photos", "pictures");
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ(0, ShareHook(AFTER, "pictures", "photos"));
    EXPECT_EQ(m_volume + "/pictures/a", Entry(task_id).dst_dir_path);
}

TEST_F(ShareTest, ADeviceThatComesBeforeTheShareMovesIsLoadedAnew) {
    const uint64_t task_id = AddOn("photos", "a");
    EXPECT_EQ(0, ShareHook(BEFORE, "photos"));
    EXPECT_EQ(0, PostMount("a"));
    ASSERT_TRUE(IsLoaded(task_id));
    ASSERT_THAT(Send("run_task", ForTask(task_id)), IsSuccess());
    MoveShare("photos", "pictures");
    m_log.Clear();
    EXPECT_EQ(0, ShareHook(AFTER, "pictures", "photos"));
    EXPECT_EQ("pictures", Entry(task_id).hub_share_name);
    EXPECT_EQ(m_volume + "/pictures/a", Entry(task_id).dst_dir_path);
    EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
    EXPECT_TRUE(m_log.Has("[NOTICE] Task '1' was loaded for share 'photos', it is loaded anew"));
    EXPECT_EQ(1, m_log.Count("[INFO] Ferrixd: PauseProcessors"));
    EXPECT_EQ(1, m_log.Count("[INFO] Ferrixd: ResumeProcessors"));
}

// The share keeps its name, and goes to another volume.
TEST_F(ShareTest, ADeviceThatComesBeforeTheShareChangesItsVolumeIsLoadedAnew) {
    for (const char* kind : {"path_change", "snapshot_restore", "transform"}) {
        const std::string device = std::string("of-") + kind;
        AddShare("photos");
        const uint64_t task_id = AddOn("photos", device);
        EXPECT_EQ(0, ShareHook(std::string("pre_") + kind, "photos"));
        EXPECT_EQ(0, PostMount(device));
        ASSERT_TRUE(IsLoaded(task_id)) << kind;
        ASSERT_THAT(Send("run_task", ForTask(task_id)), IsSuccess());
        const std::string place = PutShareOnVolume("photos", "v2");
        EXPECT_EQ(0, ShareHook(std::string("post_") + kind, "photos", "photos"));
        EXPECT_EQ(place + "/" + device, Entry(task_id).dst_dir_path) << kind;
        EXPECT_EQ(place, Entry(task_id).dst_root->Path()) << kind;
        EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id)) << kind;
        EXPECT_EQ(m_log.Count("[INFO] Ferrixd: PauseProcessors"),
                  m_log.Count("[INFO] Ferrixd: ResumeProcessors"));
        ASSERT_EQ(0, PreUnmount(device));
        m_fake.Unmount(MountPath(device));
    }
}

TEST_F(ShareTest, AnExportThatComesBeforeTheShareChangesItsVolumeIsLoadedAnew) {
    PlugIn("x", "u-x");
    PObject request = AddRequest("x", "u-x");
    request["task_type"] = static_cast<int>(TASK_TYPE_EXPORT_GENERAL);
    const uint64_t task_id = Send("add_task", request)["task_id"].AsUInt64();
    EXPECT_EQ(0, ShareHook("pre_transform", "photos"));
    EXPECT_EQ(0, PostMount("x"));
    ASSERT_TRUE(IsLoaded(task_id));
    const std::string place = PutShareOnVolume("photos", "v2");
    EXPECT_EQ(0, ShareHook("post_transform", "photos"));
    EXPECT_EQ(place, Entry(task_id).src_dir_path);
    EXPECT_EQ(place, Entry(task_id).src_root->Path());
}

TEST_F(ShareTest, AnEntryOfTheRightNameAndPlaceIsKeptAndGoesOn) {
    AddShare("music");
    const uint64_t task_id = AddOn("photos", "a");
    PlugIn("x", "u-x");
    PObject request = AddRequest("x", "u-x");
    request["task_type"] = static_cast<int>(TASK_TYPE_EXPORT_GENERAL);
    const uint64_t export_id = Send("add_task", request)["task_id"].AsUInt64();
    // Settings that were changed while the entries live.
    const uint64_t changed_id = AddOn("photos", "b");
    ASSERT_THAT(Send("set_task_setting", ImportSetting(changed_id,
                                                       {
                                                           {"hub_share_name", "music"}
    })),
                IsSuccess());
    for (const uint64_t id : {task_id, export_id, changed_id}) {
        ASSERT_THAT(Send("run_task", ForTask(id)), IsSuccess());
    }
    const auto before = Entry(task_id).strategy_handler;
    m_log.Clear();
    for (const char* share : {"photos", "music"}) {
        EXPECT_EQ(0, ShareHook(AFTER, share, share));
        EXPECT_EQ(0, ShareHook("post_transform", share));
    }
    EXPECT_EQ(before, Entry(task_id).strategy_handler);
    for (const uint64_t id : {task_id, export_id, changed_id}) {
        EXPECT_TRUE(TaskEventManager::GetInstance().IsInReadyQueue(id)) << id;
    }
    EXPECT_FALSE(m_log.Contains("PauseProcessors"));
}

TEST_F(ShareTest, AShareThatCannotBeAskedForItsPlaceDropsNothing) {
    const uint64_t task_id = AddOn("photos", "a");
    const auto before = Entry(task_id).strategy_handler;
    m_fake.RemoveShare("photos");
    EXPECT_EQ(0, ShareHook(AFTER, "photos", "photos"));
    EXPECT_EQ(0, ShareHook("post_snapshot_restore", "photos"));
    EXPECT_EQ(before, Entry(task_id).strategy_handler);
}

TEST_F(ShareTest, AShareThatIsNotThereAfterTheChangeLeavesItsTasksOut) {
    const uint64_t task_id = AddOn("photos", "a");
    EXPECT_EQ(0, ShareHook(BEFORE, "photos"));
    m_fake.RemoveShare("photos");
    EXPECT_EQ(0, ShareHook(AFTER, "pictures", "photos"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ("pictures", Task(task_id).hub_share_name);
    // The next event of the share takes it up.
    AddShare("pictures");
    EXPECT_EQ(0, ShareHook("post_snapshot_restore", "pictures"));
    EXPECT_TRUE(IsLoaded(task_id));
}

TEST_F(ShareTest, ADefaultTaskFollowsItsShareToo) {
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("front", "u-front", 99);
    ASSERT_EQ(0, PostMount("front"));
    ASSERT_TRUE(IsLoaded(task_id));
    RenameShare("photos", "pictures");
    EXPECT_EQ(m_volume + "/pictures", Entry(task_id).dst_dir_path);
    EXPECT_TRUE(Task(task_id).is_enable);
}

}  // namespace
