// "set_task_setting" and what depends on the device being there: the live entry, the versions, the
// timetable.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <map>

#include "command-fixture.h"
#include "db/log-description.h"
#include "db/task-db.h"
#include "processor/task-entry-handler.h"
#include "utils/confined-path.h"

using testing::ElementsAre;

namespace {

using Keys = std::map<std::string, PObject>;

class LiveSettingTest : public CommandTest {
protected:
    LiveSettingTest() {
        m_dir.MakeDir("v1/photos/in");
        PlugIn("a", "u-1");
        m_task_id = AddTask("a", "u-1");
        m_log.Clear();
        m_fake.ForgetCalls();
    }
    PObject Set(const Keys& keys) {
        return Send("set_task_setting", ImportSetting(m_task_id, keys));
    }
    // Makes a folder of a version task, with a file in it.
    std::string AddVersion(const std::string& time) {
        const std::string name = "v1/photos/Ferrix Copy_" + time;
        m_dir.Write(name + "/file", "content");
        return m_dir / name;
    }
    // Makes the live entry that of a version task.
    void MakeVersionTask(int copy_strategy = COPY_STRATEGY_VERSION) {
        TaskRunInfo entry = Entry(m_task_id);
        entry.copy_strategy = copy_strategy;
        TaskEntryHandler::GetInstance().AddTaskEntry(entry);
    }
    static bool Exists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }
    std::string ScheduleName() { return m_fake.SchedEntries().begin()->second.name; }

    uint64_t m_task_id = 0;
};

TEST_F(LiveSettingTest, EverySettingReachesTheEntry) {
    AddShare("music");
    m_dir.MakeDir("v1/music/in");
    const TaskRunInfo before = Entry(m_task_id);
    EXPECT_THAT(Set({
                    {"hub_share_name",        "music"},
                    {"hub_folder_path",       "/in/" },
                    {"task_name",             "New"  },
                    {"keep_dir_structure",    false  },
                    {"smart_create_date_dir", true   },
                    {"rename_photo_video",    true   },
                    {"remove_src_file",       true   },
                    {"conflict_policy",       1      },
                    {"enable_rotation",       true   },
                    {"max_version_count",     3      },
                    {"rotation_policy",       2      }
    }),
                IsSuccess());
    const TaskRunInfo entry = Entry(m_task_id);
    EXPECT_EQ("New", entry.task_name);
    EXPECT_EQ("music", entry.hub_share_name);
    EXPECT_EQ(m_volume + "/music/in", entry.dst_dir_path);
    EXPECT_EQ(m_volume + "/music", entry.dst_root->Path());
    EXPECT_FALSE(entry.keep_dir_structure);
    EXPECT_TRUE(entry.smart_create_date_dir);
    EXPECT_TRUE(entry.rename_photo_video);
    EXPECT_TRUE(entry.remove_src_file);
    EXPECT_EQ(1, entry.conflict_policy);
    EXPECT_TRUE(entry.enable_rotation);
    EXPECT_EQ(3u, entry.max_version_count);
    EXPECT_EQ(2, entry.rotation_policy);
    // What no setting changes.
    EXPECT_EQ(before.src_dir_path, entry.src_dir_path);
    EXPECT_EQ(before.src_root, entry.src_root);
    EXPECT_EQ(before.version_dir, entry.version_dir);
    EXPECT_EQ(before.strategy_handler, entry.strategy_handler);
    EXPECT_EQ(before.task_filter, entry.task_filter);
    EXPECT_EQ(before.device_identity, entry.device_identity);
    EXPECT_EQ(before.usb_id, entry.usb_id);
}

TEST_F(LiveSettingTest, TheEntryLoadedAnewIsTheSame) {
    ASSERT_THAT(Set({
                    {"hub_folder_path", "/in"},
                    {"task_name",       "New"}
    }),
                IsSuccess());
    const TaskRunInfo changed = Entry(m_task_id);
    ASSERT_EQ(0, PreUnmount("a"));
    ASSERT_EQ(0, PostMount("a"));
    EXPECT_EQ(changed.dst_dir_path, Entry(m_task_id).dst_dir_path);
    EXPECT_EQ(changed.src_dir_path, Entry(m_task_id).src_dir_path);
    EXPECT_EQ(changed.task_name, Entry(m_task_id).task_name);
}

TEST_F(LiveSettingTest, AnExportsDestinationIsOnTheDevice) {
    PlugIn("x", "u-x");
    PObject request = AddRequest("x", "u-x");
    request["task_type"] = 2;
    const uint64_t task_id = Send("add_task", request)["task_id"].AsUInt64();
    const TaskRunInfo before = Entry(task_id);
    request = ForTask(task_id);
    request["task_type"] = 2;
    request["usb_folder_path"] = "/backup/";
    EXPECT_THAT(Send("set_task_setting", request), IsSuccess());
    EXPECT_EQ(MountPath("x") + "/backup", Entry(task_id).dst_dir_path);
    EXPECT_EQ(before.dst_root, Entry(task_id).dst_root);
    EXPECT_EQ(before.src_dir_path, Entry(task_id).src_dir_path);
}

TEST_F(LiveSettingTest, AShareThatCannotBeOpenedLeavesTheDestinationWhereItIs) {
    // The request passes for an export, whose destination is not checked.
    EXPECT_THAT(Set({
                    {"task_type",      2        },
                    {"hub_share_name", "nowhere"},
                    {"task_name",      "New"    }
    }),
                IsSuccess());
    EXPECT_EQ(m_volume + "/photos", Entry(m_task_id).dst_dir_path);
    EXPECT_EQ("nowhere", Entry(m_task_id).hub_share_name);
    EXPECT_EQ("New", Entry(m_task_id).task_name);
    // So nothing runs there: the share is asked for before each run.
    EXPECT_THAT(Send("run_task", ForTask(m_task_id)), IsError(11, "Task is not runnable"));
}

TEST_F(LiveSettingTest, TheRunStateAndTheVersionFolderOfARunStay) {
    TaskEntryHandler& entries = TaskEntryHandler::GetInstance();
    ASSERT_EQ(0, entries.SetTaskState(m_task_id, TASK_RUN_STATE_RUNNING));
    ASSERT_EQ(0, entries.SetTaskVersionDir(m_task_id, "Ferrix Copy_2024-03-09_141502"));
    EXPECT_THAT(Set({
                    {"task_name", "New"}
    }),
                IsSuccess());
    EXPECT_EQ(TASK_RUN_STATE_RUNNING, Entry(m_task_id).status);
    EXPECT_EQ("Ferrix Copy_2024-03-09_141502", Entry(m_task_id).version_dir);
}

// The worker may begin a run between the reading of the entry and its replacing. With the state
// that was read, no file of the run would ever be copied.
TEST_F(LiveSettingTest, ARunThatBeginsMeanwhileKeepsItsState) {
    int calls = 0;
    m_fake.OnCall("KELDShareGet", [&] {
        if (++calls != 2) return;  // the first is the check of the destination
        ASSERT_EQ(0,
                  TaskEntryHandler::GetInstance().SetTaskState(m_task_id, TASK_RUN_STATE_RUNNING));
    });
    EXPECT_THAT(Set({
                    {"task_name", "New"}
    }),
                IsSuccess());
    m_fake.OnCall("KELDShareGet", {});
    ASSERT_GE(calls, 2);
    EXPECT_EQ(TASK_RUN_STATE_RUNNING, Entry(m_task_id).status);
    EXPECT_EQ("New", Entry(m_task_id).task_name);
}

// --- Without the device

TEST_F(LiveSettingTest, AnUnpluggedTaskTakesItsRowAtTheNextMount) {
    ASSERT_EQ(0, PreUnmount("a"));
    EXPECT_THAT(Set({
                    {"hub_folder_path", "/in"}
    }),
                IsSuccess());
    EXPECT_TRUE(m_log.Has("[INFO] Task '1' does not match"));
    EXPECT_EQ("/in", Task(m_task_id).hub_folder_path);
    ASSERT_EQ(0, PostMount("a"));
    EXPECT_EQ(m_volume + "/photos/in", Entry(m_task_id).dst_dir_path);
}

// The timetable keeps the old name until a later rename: required, although it looks like a slip.
TEST_F(LiveSettingTest, ARenameOfAnUnpluggedTaskDoesNotReachTheTimetable) {
    ASSERT_EQ(0, PreUnmount("a"));
    EXPECT_THAT(Set({
                    {"task_name", "New"}
    }),
                IsSuccess());
    EXPECT_EQ("New", Task(m_task_id).task_name);
    EXPECT_EQ("My task", ScheduleName());
    ASSERT_EQ(0, PostMount("a"));
    EXPECT_THAT(Set({
                    {"task_name", "New"}
    }),
                IsSuccess());  // no rename any more
    EXPECT_EQ("My task", ScheduleName());
    EXPECT_THAT(Set({
                    {"task_name", "Newer"}
    }),
                IsSuccess());
    EXPECT_EQ("Newer", ScheduleName());
}

TEST_F(LiveSettingTest, ATaskWithoutItsDevicesEntryKeepsItsOwn) {
    TaskEntryHandler::GetInstance().RemoveUSBEntry(Task(m_task_id).usb_id);
    EXPECT_THAT(Set({
                    {"task_name", "New"}
    }),
                IsSuccess());
    EXPECT_TRUE(m_log.Has("[INFO] USB '1' dose not mount"));
    EXPECT_EQ("New", Task(m_task_id).task_name);
    EXPECT_EQ("My task", Entry(m_task_id).task_name);
    EXPECT_EQ("My task", ScheduleName());
}

// --- The timetable

TEST_F(LiveSettingTest, ARenameReachesTheTimetable) {
    EXPECT_THAT(Set({
                    {"task_name", "New"}
    }),
                IsSuccess());
    EXPECT_EQ("New", ScheduleName());
}

TEST_F(LiveSettingTest, OnlyARenameReachesTheTimetable) {
    EXPECT_THAT(Set({
                    {"conflict_policy", 1}
    }),
                IsSuccess());
    EXPECT_EQ(0, m_fake.CallCount("KELDSchedTaskLoad"));
}

TEST_F(LiveSettingTest, ATimetableThatCannotBeRenamedIsAFailureAfterTheRowIsWritten) {
    m_fake.FailCall("KELDSchedTaskSave");
    EXPECT_THAT(Set({
                    {"task_name", "New"}
    }),
                IsError(11, "Failed to UpdateScheduleName"));
    EXPECT_TRUE(m_log.Has("[ERR] UpdateScheduleName() failed"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set task info for task '1'"));
    EXPECT_EQ("New", Task(m_task_id).task_name);
    EXPECT_EQ("New", Entry(m_task_id).task_name);
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_TASK_SETTING_CHANGED));
}

// It has no timetable, and the scheduler is asked all the same.
TEST_F(LiveSettingTest, ARenameOfAPluggedInDefaultTaskFailsAtTheSchedulerAfterTheRowIsWritten) {
    Send("remove_task", ForTask(m_task_id));
    m_task_id = AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("front", "u-front", 99);
    ASSERT_EQ(0, PostMount("front"));
    m_fake.ForgetCalls();
    EXPECT_THAT(Set({
                    {"task_name", "New"}
    }),
                IsError(11, "Failed to UpdateScheduleName"));
    EXPECT_THAT(m_fake.CallsOf("KELDSchedTaskLoad"), ElementsAre(ElementsAre("-1")));
    EXPECT_EQ("New", Task(m_task_id).task_name);
    EXPECT_EQ("New", Entry(m_task_id).task_name);
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_TASK_RENAMED));
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_TASK_SETTING_CHANGED));
}

// --- Versions

TEST_F(LiveSettingTest, ALoweredNumberOfVersionsPrunesAtOnce) {
    MakeVersionTask();
    const std::string oldest = AddVersion("2024-01-01_000000");
    const std::string middle = AddVersion("2024-01-02_000000");
    const std::string newest = AddVersion("2024-01-03_000000");
    EXPECT_THAT(Set({
                    {"enable_rotation",   true},
                    {"max_version_count", 2   }
    }),
                IsSuccess());
    EXPECT_FALSE(Exists(oldest));
    EXPECT_TRUE(Exists(middle));
    EXPECT_TRUE(Exists(newest));
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_ROTATED));
}

TEST_F(LiveSettingTest, NothingIsPrunedWithoutRotationOrForOtherStrategies) {
    const std::string oldest = AddVersion("2024-01-01_000000");
    AddVersion("2024-01-02_000000");
    EXPECT_THAT(Set({
                    {"enable_rotation",   true},
                    {"max_version_count", 1   }
    }),
                IsSuccess());
    EXPECT_TRUE(Exists(oldest)) << "a mirror";
    MakeVersionTask();
    EXPECT_THAT(Set({
                    {"enable_rotation", false}
    }),
                IsSuccess());
    EXPECT_TRUE(Exists(oldest)) << "rotation is off";
}

TEST_F(LiveSettingTest, NothingIsPrunedWhenNothingChangesOrTheDeviceIsAway) {
    MakeVersionTask();
    ASSERT_THAT(Set({
                    {"enable_rotation",   true},
                    {"max_version_count", 1   }
    }),
                IsSuccess());
    const std::string oldest = AddVersion("2024-01-01_000000");
    AddVersion("2024-01-02_000000");
    EXPECT_THAT(Set({
                    {"max_version_count", 1}
    }),
                IsSuccess());
    EXPECT_TRUE(Exists(oldest));
    ASSERT_EQ(0, PreUnmount("a"));
    EXPECT_THAT(Set({
                    {"max_version_count", 0}
    }),
                IsSuccess());
    EXPECT_TRUE(Exists(oldest));
}

TEST_F(LiveSettingTest, ARotationThatFailsIsLoggedAndTheStepsGoOn) {
    MakeVersionTask();
    const std::string oldest = AddVersion("2024-01-01_000000");
    AddVersion("2024-01-02_000000");
    EXPECT_THAT(Set({
                    {"enable_rotation",   true },
                    {"max_version_count", 1    },
                    {"rotation_policy",   77   }, // there is no such policy
                    {"task_name",         "New"}
    }),
                IsSuccess());
    EXPECT_TRUE(m_log.Has("[ERR] SetTask: Failed to handle rotation for task '1'"));
    EXPECT_TRUE(Exists(oldest));
    EXPECT_EQ("New", ScheduleName());
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_TASK_SETTING_CHANGED));
}

}  // namespace
