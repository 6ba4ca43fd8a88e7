#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "command-fixture.h"
#include "daemon/usb-matcher.h"
#include "db/task-db.h"
#include "event/event-generator.h"
#include "event/event-manager.h"
#include "filter/file-filter.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"
#include "utils/confined-path.h"

using testing::IsEmpty;
using testing::SizeIs;

namespace {

constexpr int FRONT_USB = 99;

class MountTest : public CommandTest {
protected:
    static std::list<USBRunInfo> LoadedDevices() {
        std::list<USBRunInfo> devices;
        TaskEntryHandler::GetInstance().ListUSBEntries(devices);
        return devices;
    }
    // A device with a task of its own that is stored but not loaded.
    uint64_t AddUnloadedTask(const std::string& device, const std::string& uuid) {
        PlugIn(device, uuid);
        const uint64_t task_id = AddTask(device, uuid);
        EXPECT_EQ(0, PreUnmount(device));
        EXPECT_FALSE(IsLoaded(task_id));
        m_log.Clear();
        return task_id;
    }
    static void ChangeTask(uint64_t task_id, const std::function<void(TaskInfo&)>& change) {
        TaskInfo task = Task(task_id);
        change(task);
        ASSERT_EQ(0, TaskDB::GetInstance().UpdateTaskInfo(task));
    }
    static void RunWhenPluggedIn(uint64_t task_id) {
        USBInfo usb;
        ASSERT_EQ(1, TaskDB::GetInstance().GetUSBInfoByID(Task(task_id).usb_id, usb));
        usb.run_when_plug_in = true;
        ASSERT_EQ(0, TaskDB::GetInstance().UpdateUSBInfo(usb));
    }
    static bool IsQueued(uint64_t task_id) {
        return TaskEventManager::GetInstance().IsInReadyQueue(task_id);
    }
};

// --- A device is plugged in

TEST_F(MountTest, HooksWithoutBothKeysAreInvalid) {
    EXPECT_EQ(-1, Notify("post_mount", "", "/dev/sda1"));
    EXPECT_EQ(-1, Notify("post_mount", "/m", ""));
    EXPECT_EQ(2, m_log.Count("[ERR] HandleVolumeMount: Invalid parameter"));
    EXPECT_EQ(-1, Notify("pre_unmount", "", "/dev/sda1"));
    EXPECT_EQ(-1, Notify("pre_unmount", "/m", ""));
    EXPECT_EQ(2, m_log.Count("[ERR] HandleVolumeUnmount: Invalid parameter"));
}

TEST_F(MountTest, ADeviceWithoutAUuidIsRefused) {
    PlugIn("a", "");
    EXPECT_EQ(-1, PostMount("a"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get uuid for device '" + DevicePath("a") + "'"));
}

TEST_F(MountTest, AnUnknownDeviceGetsNothing) {
    PlugIn("a", "u-1");
    EXPECT_EQ(-1, PostMount("a"));
    EXPECT_TRUE(m_log.Has("[WARN] NO matched usb info for '" + DevicePath("a") + "'"));
    EXPECT_THAT(LoadedDevices(), IsEmpty());
}

TEST_F(MountTest, ARegistrationThatFailsEndsTheHook) {
    PlugIn("a", "u-1", FRONT_USB);  // at a front port, and there is no default task
    EXPECT_EQ(-1, PostMount("a"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to register usb for device '" + DevicePath("a") + "'"));
}

TEST_F(MountTest, AKnownDeviceGetsItsEntries) {
    const uint64_t task_id = AddUnloadedTask("a", "u-1");
    ASSERT_EQ(0, PostMount("a"));
    const TaskInfo task = Task(task_id);
    ASSERT_THAT(LoadedDevices(), SizeIs(1));
    const USBRunInfo usb = LoadedDevices().front();
    EXPECT_EQ(task.usb_id, usb.usb_id);
    EXPECT_EQ(MountPath("a"), usb.usb_share_path);
    EXPECT_EQ("u-1", usb.uuid);
    EXPECT_FALSE(usb.run_when_plug_in);
    EXPECT_TRUE(usb.eject_when_task_done);

    const TaskRunInfo entry = Entry(task_id);
    EXPECT_EQ(task_id, entry.task_id);
    EXPECT_EQ(task.usb_id, entry.usb_id);
    EXPECT_EQ("My task", entry.task_name);
    EXPECT_EQ(TASK_RUN_STATE_IDLE, entry.status);
    EXPECT_EQ(COPY_STRATEGY_MIRROR, entry.copy_strategy);
    EXPECT_EQ("photos", entry.hub_share_name);
    EXPECT_EQ(MountPath("a"), entry.src_dir_path);
    EXPECT_EQ(m_volume + "/photos", entry.dst_dir_path);
    EXPECT_EQ("", entry.version_dir);
    EXPECT_EQ(256u, entry.max_version_count);
    EXPECT_EQ(1, entry.rotation_policy);
    EXPECT_EQ(2, entry.conflict_policy);
    EXPECT_TRUE(entry.keep_dir_structure);
    EXPECT_NE(nullptr, entry.strategy_handler);
    EXPECT_NE(nullptr, entry.system_filter);
    EXPECT_NE(nullptr, entry.task_filter);
    EXPECT_EQ(nullptr, entry.file_db);
    EXPECT_FALSE(entry.is_export);
    EXPECT_EQ(MountPath("a"), entry.device_mount_path);
    EXPECT_FALSE(entry.device_identity.empty());
    EXPECT_EQ(MountPath("a"), entry.src_root->Path());
    EXPECT_EQ(m_volume + "/photos", entry.dst_root->Path());
    EXPECT_TRUE(m_log.Has("[INFO] Add task '" + std::to_string(task_id) + "'"));
    EXPECT_TRUE(m_log.Has("[INFO] src_path '" + MountPath("a") + "' and dst_path '" + m_volume +
                          "/photos' is ready (with task_id " + std::to_string(task_id) + ")"));
    EXPECT_TRUE(m_log.Has("[INFO] Mount usb device '" + DevicePath("a") +
                          "', uuid 'u-1', usb_id '" + std::to_string(task.usb_id) + "'"));
}

TEST_F(MountTest, AnExportGoesFromTheShareToTheDevice) {
    const uint64_t task_id = AddUnloadedTask("a", "u-1");
    ChangeTask(task_id, [](TaskInfo& task) {
        task.task_type = TASK_TYPE_EXPORT_GENERAL;
        task.usb_folder_path = "/backup";
        task.hub_folder_path = "/2024/";
    });
    ASSERT_EQ(0, PostMount("a"));
    const TaskRunInfo entry = Entry(task_id);
    EXPECT_TRUE(entry.is_export);
    EXPECT_EQ(m_volume + "/photos/2024", entry.src_dir_path);
    EXPECT_EQ(MountPath("a") + "/backup", entry.dst_dir_path);
    EXPECT_EQ(m_volume + "/photos", entry.src_root->Path());
    EXPECT_EQ(MountPath("a"), entry.dst_root->Path());
}

TEST_F(MountTest, TheTasksFilterIsThatOfItsFolder) {
    PlugIn("a", "u-1");
    PObject request = AddRequest("a", "u-1");
    request["black_ext"] = List({"iso"});
    const uint64_t task_id = Send("add_task", request)["task_id"].AsUInt64();
    EXPECT_NE(0, Entry(task_id).task_filter->Check("/a.iso", false));
    EXPECT_EQ(0, Entry(task_id).task_filter->Check("/a.jpg", false));
    EXPECT_EQ(0, Entry(task_id).system_filter->Check("/a.iso", false));
}

TEST_F(MountTest, NothingRunsUnlessTheDeviceIsToRunWhenPluggedIn) {
    const uint64_t task_id = AddUnloadedTask("a", "u-1");
    ASSERT_EQ(0, PostMount("a"));
    EXPECT_FALSE(IsQueued(task_id));
    ASSERT_EQ(0, PreUnmount("a"));
    m_fake.AddDevice({.mount_path = MountPath("a"), .dev_path = DevicePath("a")});
    RunWhenPluggedIn(task_id);
    ASSERT_EQ(0, PostMount("a"));
    EXPECT_TRUE(IsQueued(task_id));
    EXPECT_TRUE(m_log.Has("[INFO] Run task '" + std::to_string(task_id) + "'"));
}

TEST_F(MountTest, ATaskWhoseShareIsLockedStaysIdle) {
    const uint64_t task_id = AddUnloadedTask("a", "u-1");
    RunWhenPluggedIn(task_id);
    m_fake.LockShare("photos");
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_FALSE(IsQueued(task_id));
    EXPECT_TRUE(m_log.Has("[INFO] Task '" + std::to_string(task_id) + "' is not runnable"));
}

TEST_F(MountTest, ARepeatedMountChangesNothingAndRunsAgain) {
    const uint64_t task_id = AddUnloadedTask("a", "u-1");
    RunWhenPluggedIn(task_id);
    ASSERT_EQ(0, PostMount("a"));
    const TaskRunInfo before = Entry(task_id);
    TaskEventManager::GetInstance().RemoveEvent(task_id);
    ASSERT_EQ(0, PostMount("a"));
    EXPECT_EQ(before.task_filter, Entry(task_id).task_filter);
    EXPECT_TRUE(IsQueued(task_id));
    EXPECT_TRUE(m_log.Contains("USB entry has already been loaded for usb id"));
    EXPECT_TRUE(m_log.Has("[INFO] Task entry has already been loaded for task id '" +
                          std::to_string(task_id) + "'"));
}

TEST_F(MountTest, ADeviceThatWasPulledIsLoadedAnewWhenItComesBack) {
    const uint64_t task_id = AddUnloadedTask("a", "u-1");
    ASSERT_EQ(0, PostMount("a"));
    const TaskRunInfo before = Entry(task_id);
    TaskEventManager::GetInstance().PushEvent(task_id);
    // Pulled without a word; the same stick comes back under another kernel name.
    m_fake.AddDevice({.mount_path = MountPath("a"),
                      .dev_path = DevicePath("a"),
                      .disk = "sdz",
                      .identity = "another"});
    ASSERT_EQ(0, PostMount("a"));
    EXPECT_EQ("another", Entry(task_id).device_identity);
    EXPECT_NE(before.task_filter, Entry(task_id).task_filter);
    EXPECT_FALSE(IsQueued(task_id));
    EXPECT_THAT(LoadedDevices(), SizeIs(1));
}

TEST_F(MountTest, AnEntryLeftFromAnotherPathIsReplaced) {
    AddShare("music");
    const uint64_t task_id = AddUnloadedTask("a", "u-1");
    ChangeTask(task_id, [](TaskInfo& task) { task.hub_share_name = "gone"; });
    ASSERT_EQ(0, PostMount("a"));  // the device alone is loaded
    ASSERT_EQ(0, PreUnmount("a"));
    m_fake.Unmount(MountPath("a"));
    ChangeTask(task_id, [](TaskInfo& task) { task.hub_share_name = "music"; });
    PlugIn("b", "u-1");
    ASSERT_EQ(0, PostMount("b"));
    EXPECT_EQ(MountPath("b"), LoadedDevices().front().usb_share_path);
    EXPECT_EQ(MountPath("b"), Entry(task_id).src_dir_path);
}

// --- What keeps a task from being loaded; the device and its other tasks are loaded

struct LoadFailure {
    const char* name;
    std::function<void(TaskInfo&)> change;
    std::string line;
};

TEST_F(MountTest, ATaskThatCannotBeBuiltIsLeftOutWithItsReason) {
    const std::vector<LoadFailure> failures = {
        {"no such strategy",  [](TaskInfo& task) { task.copy_strategy = 7; },
         "[ERR] Failed to create copy strategy handler '1'."          },
        {"share has gone",    [](TaskInfo& task) { task.hub_share_name = "gone"; },
         "[ERR] Failed to get src_dir_full_path and dst_dir_full_path"},
        {"out of the share",  [](TaskInfo& task) { task.hub_folder_path = "/../music"; },
         "[ERR] Failed to get src_dir_full_path and dst_dir_full_path"},
        {"beside the share",  [](TaskInfo& task) { task.hub_folder_path = "2"; },
         "[ERR] Failed to get src_dir_full_path and dst_dir_full_path"},
        {"out of the device", [](TaskInfo& task) { task.usb_folder_path = "/a/../../.."; },
         "[ERR] Failed to get src_dir_full_path and dst_dir_full_path"},
        {"beside the device", [](TaskInfo& task) { task.usb_folder_path = "b"; },
         "[ERR] Failed to get src_dir_full_path and dst_dir_full_path"},
    };
    AddShare("music");
    const uint64_t task_id = AddUnloadedTask("a", "u-1");
    const TaskInfo good = Task(task_id);
    ASSERT_EQ(1u, task_id);
    for (const LoadFailure& failure : failures) {
        m_log.Clear();
        ChangeTask(task_id, failure.change);
        EXPECT_EQ(0, PostMount("a")) << failure.name;
        EXPECT_FALSE(IsLoaded(task_id)) << failure.name;
        EXPECT_THAT(LoadedDevices(), SizeIs(1)) << failure.name;
        EXPECT_TRUE(m_log.Has(failure.line)) << failure.name;
        EXPECT_TRUE(m_log.Has(
            "[WARN] Failed to add task entry '1', usb_share_path = " + MountPath("a") + ", ignore"))
            << failure.name;
        ASSERT_EQ(0, TaskDB::GetInstance().UpdateTaskInfo(good));
    }
    // It is taken up again at the next mount.
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_TRUE(IsLoaded(task_id));
}

TEST_F(MountTest, AMissingFilterFileKeepsATaskOut) {
    const uint64_t task_id = AddUnloadedTask("a", "u-1");
    const std::string system_filter = m_dir / "pkg/target/etc/ferrix_system.filter";
    for (const std::string& file : {TaskFolder(task_id) + "/blacklist.filter", system_filter}) {
        ASSERT_EQ(0, rename(file.c_str(), (file + ".away").c_str()));
        EXPECT_EQ(0, PostMount("a"));
        EXPECT_FALSE(IsLoaded(task_id)) << file;
        EXPECT_TRUE(m_log.Has("[ERR] Failed to load black list at '" + file + "'"));
        ASSERT_EQ(0, rename((file + ".away").c_str(), file.c_str()));
    }
    const std::string white_list = TaskFolder(task_id) + "/whitelist.filter";
    ASSERT_EQ(0, unlink(white_list.c_str()));
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to load white list at '" + white_list + "'"));
}

TEST_F(MountTest, ADeviceThatDoesNotAnswerHasNoTaskEntry) {
    const uint64_t task_id = AddUnloadedTask("a", "u-1");
    m_fake.FailCall("KELDDevIdentityGet", KELDERR_IO);
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_TRUE(IsLoaded(task_id));
}

TEST_F(MountTest, LoadingFailsWhenTheDatabaseDoes) {
    AddUnloadedTask("a", "u-1");
    DropTable("task_info_table");
    EXPECT_EQ(-1, PostMount("a"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to list task info for usb '1'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to load usb and task entry for '1', '" + MountPath("a") +
                          "', ignore"));
}

// --- Default tasks

TEST_F(MountTest, AFrontDeviceWithoutARowLoadsTheDefaultTask) {
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("a", "u-1", FRONT_USB);
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_EQ(MountPath("a"), Entry(task_id).src_dir_path);
    EXPECT_EQ(DEFAULT_USB_UUID, LoadedDevices().front().uuid);
}

TEST_F(MountTest, OnlyTheFirstOfTwoCandidatesGetsEntries) {
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("a", "u-1", FRONT_USB);
    PlugIn("b", "u-2", FRONT_USB);
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_EQ(0, PostMount("b"));
    EXPECT_EQ(MountPath("a"), Entry(task_id).src_dir_path);
    EXPECT_THAT(LoadedDevices(), SizeIs(1));
}

TEST_F(MountTest, ACandidateOfADisabledDefaultTaskIsNotLoaded) {
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID, false);
    PlugIn("a", "u-1", FRONT_USB);
    EXPECT_EQ(-1, PostMount("a"));
    EXPECT_FALSE(IsLoaded(task_id));
    std::string path;
    EXPECT_EQ(0, USBMatcher::GetInstance().GetMountPath(Task(task_id).usb_id, path));
}

TEST_F(MountTest, TheDefaultTaskIsLoadedForAMatchingDeviceAlone) {
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("a", "u-1", FRONT_USB);
    EXPECT_EQ(-1, LoadDefaultTask("", "u-1"));
    EXPECT_EQ(-1, LoadDefaultTask(MountPath("a"), ""));
    EXPECT_EQ(2, m_log.Count("[ERR] Invalid parameter"));
    EXPECT_EQ(0, LoadDefaultTask(MountPath("a"), "u-1"));  // no candidate
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_TRUE(m_log.Has("[INFO] Current device 'u-1' is NOT a DEFAULT_TASK"));
    ASSERT_EQ(0, USBMatcher::GetInstance().Register(MountPath("a"), DevicePath("a"), "u-1"));
    EXPECT_EQ(0, LoadDefaultTask(MountPath("a"), "u-1"));
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_TRUE(m_log.Has("[INFO] current uuid 'u-1' is a DEFAULT_TASK"));
}

// --- A device is unplugged

TEST_F(MountTest, UnmountingAPathWithoutAnEntryIsAQuietSuccess) {
    EXPECT_EQ(0, Notify("pre_unmount", "/nowhere", "/dev/sdx1"));
    EXPECT_TRUE(m_log.Has("[WARN] USB '/nowhere' dose not mount"));
}

TEST_F(MountTest, UnmountingForgetsACandidateThatHasNoEntry) {
    AddDefaultTask(DEFAULT_USB_UUID, false);
    PlugIn("a", "u-1", FRONT_USB);
    EXPECT_EQ(-1, PostMount("a"));
    EXPECT_EQ(0, PreUnmount("a"));
    USBInfo usb_info;
    EXPECT_EQ(0, USBMatcher::GetInstance().Match("u-1", usb_info));
    EXPECT_TRUE(m_log.Has("[WARN] uuid 'u-1' is NOT a candidate default task"));
}

TEST_F(MountTest, UnmountingTakesTheTaskOutOfTheSystem) {
    PlugIn("a", "u-1");
    const uint64_t task_id = AddTask("a", "u-1");
    TaskEventManager::GetInstance().PushEvent(task_id);
    EventGenerator(task_id).PushScanEvent("/");
    ASSERT_EQ(1u, EventManager::GetInstance().GetEventCount(task_id));
    EXPECT_EQ(0, PreUnmount("a"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_FALSE(IsQueued(task_id));
    EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(task_id));
    EXPECT_THAT(LoadedDevices(), IsEmpty());
    EXPECT_THAT(Tasks(), SizeIs(1));
    EXPECT_TRUE(m_log.Has("[INFO] Remove usb '1'"));
    EXPECT_TRUE(m_log.Has("[INFO] Unmount usb device '" + DevicePath("a") + "', usb_share_path '" +
                          MountPath("a") + "', usb_id '1'"));
    EXPECT_EQ(m_log.Count("[INFO] Ferrixd: PauseProcessors"),
              m_log.Count("[INFO] Ferrixd: ResumeProcessors"));
}

TEST_F(MountTest, ADeviceWithoutTaskEntriesKeepsItsOwnEntry) {
    PlugIn("a", "u-1");
    const uint64_t task_id = AddTask("a", "u-1");
    TaskEntryHandler::GetInstance().RemoveTaskEntry(task_id);
    EXPECT_EQ(0, PreUnmount("a"));
    EXPECT_THAT(LoadedDevices(), SizeIs(1));
    EXPECT_TRUE(
        m_log.Has("[INFO] No matched task entry for usb share path '" + MountPath("a") + "'"));
}

TEST_F(MountTest, AnEntryLeftFromAnotherPathIsNotUsedWhenEntriesAreLoaded) {
    PlugIn("a", "u-1");
    const uint64_t task_id = AddTask("a", "u-1");
    TaskEntryHandler::GetInstance().RemoveTaskEntry(task_id);
    EXPECT_EQ(0, PreUnmount("a"));
    m_fake.Unmount(MountPath("a"));
    PlugIn("b", "u-1");
    EXPECT_EQ(0, LoadEntries());
    ASSERT_THAT(LoadedDevices(), SizeIs(1));
    EXPECT_EQ(MountPath("b"), LoadedDevices().front().usb_share_path);
    EXPECT_EQ(MountPath("b"), Entry(task_id).src_dir_path);
}

}  // namespace
