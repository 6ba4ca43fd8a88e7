#include "processor/task-entry-handler.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

#include "db/task-info.h"
#include "fake/fake-keld.h"
#include "strategy/task-run-info.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

class CopyStrategyHandler {};  // the registry only counts its references

namespace {

TaskRunInfo MakeTask(uint64_t task_id, uint64_t usb_id) {
    TaskRunInfo task;
    task.task_id = task_id;
    task.usb_id = usb_id;
    task.task_name = "task " + std::to_string(task_id);
    task.hub_share_name = "photos";
    return task;
}

USBRunInfo MakeUSB(uint64_t usb_id, const std::string& path) {
    USBRunInfo usb;
    usb.usb_id = usb_id;
    usb.usb_share_path = path;
    return usb;
}

std::vector<uint64_t> Ids(const std::list<TaskRunInfo>& tasks) {
    std::vector<uint64_t> ids;
    for (const TaskRunInfo& task : tasks) ids.push_back(task.task_id);
    return ids;
}

TEST(TaskEntryHandler, GivesTheSameObjectEachTime) {
    EXPECT_EQ(&TaskEntryHandler::GetInstance(), &TaskEntryHandler::GetInstance());
}

TEST(TaskEntryHandler, FindsWhatWasAddedAndNothingElse) {
    TaskEntryHandler entries;
    EXPECT_TRUE(entries.IsUSBEntryEmpty());
    EXPECT_TRUE(entries.IsTaskEntryEmpty());
    entries.AddUSBEntry(MakeUSB(3, "/volumeUSB1"));
    entries.AddTaskEntry(MakeTask(7, 3));
    EXPECT_FALSE(entries.IsUSBEntryEmpty());
    EXPECT_FALSE(entries.IsTaskEntryEmpty());

    USBRunInfo usb;
    EXPECT_EQ(0, entries.GetUSBEntry(3, usb));
    EXPECT_EQ("/volumeUSB1", usb.usb_share_path);
    TaskRunInfo task;
    EXPECT_EQ(0, entries.GetTaskEntry(7, task));
    EXPECT_EQ("task 7", task.task_name);

    EXPECT_EQ(-1, entries.GetUSBEntry(7, usb));
    EXPECT_EQ(-1, entries.GetTaskEntry(3, task));
    EXPECT_EQ("task 7", task.task_name) << "the out is unchanged";
}

TEST(TaskEntryHandler, FindsADeviceByItsExactPathInIdOrder) {
    TaskEntryHandler entries;
    entries.AddUSBEntry(MakeUSB(9, "/volumeUSB1"));
    entries.AddUSBEntry(MakeUSB(4, "/volumeUSB1"));
    entries.AddUSBEntry(MakeUSB(2, "/volumeUSB2"));
    USBRunInfo usb;
    EXPECT_EQ(0, entries.GetUSBEntryByPath("/volumeUSB1", usb));
    EXPECT_EQ(4U, usb.usb_id);
    EXPECT_EQ(-1, entries.GetUSBEntryByPath("/volumeUSB", usb));
    EXPECT_EQ(-1, entries.GetUSBEntryByPath("/volumeUSB1/", usb));
    EXPECT_EQ(-1, entries.GetUSBEntryByPath("", usb));
}

TEST(TaskEntryHandler, AddingOverAnIdReplacesTheRecordAndTheOldObjectsLiveOnInCopies) {
    TaskEntryHandler entries;
    TaskRunInfo old_task = MakeTask(7, 3);
    old_task.strategy_handler = std::make_shared<CopyStrategyHandler>();
    const std::weak_ptr<CopyStrategyHandler> old_object = old_task.strategy_handler;
    entries.AddTaskEntry(old_task);
    old_task.strategy_handler.reset();
    TaskRunInfo copy;
    ASSERT_EQ(0, entries.GetTaskEntry(7, copy));

    TaskRunInfo new_task = MakeTask(7, 5);
    entries.AddTaskEntry(new_task);
    TaskRunInfo now;
    ASSERT_EQ(0, entries.GetTaskEntry(7, now));
    EXPECT_EQ(5U, now.usb_id);
    EXPECT_EQ(nullptr, now.strategy_handler);
    EXPECT_EQ(old_object.lock(), copy.strategy_handler);
    copy = TaskRunInfo();
    EXPECT_TRUE(old_object.expired());
}

TEST(TaskEntryHandler, ACopyKeepsItsObjectsAfterTheEntryHasGone) {
    TaskEntryHandler entries;
    TaskRunInfo task = MakeTask(7, 3);
    task.strategy_handler = std::make_shared<CopyStrategyHandler>();
    const std::weak_ptr<CopyStrategyHandler> object = task.strategy_handler;
    entries.AddTaskEntry(task);
    entries.RemoveTaskEntry(7);
    EXPECT_FALSE(object.expired());
    task.strategy_handler.reset();
    EXPECT_TRUE(object.expired());
}

TEST(TaskEntryHandler, RemovingADeviceLeavesItsTasksAndRemovingNothingIsSilent) {
    TaskEntryHandler entries;
    const LogCapture log;
    entries.AddUSBEntry(MakeUSB(3, "/volumeUSB1"));
    entries.AddTaskEntry(MakeTask(7, 3));
    entries.RemoveUSBEntry(3);
    entries.RemoveUSBEntry(3);
    entries.RemoveTaskEntry(8);
    EXPECT_TRUE(entries.IsUSBEntryEmpty());
    TaskRunInfo task;
    EXPECT_EQ(0, entries.GetTaskEntry(7, task));
    entries.RemoveTaskEntry(7);
    EXPECT_TRUE(entries.IsTaskEntryEmpty());
    EXPECT_TRUE(log.Lines().empty());
}

TEST(TaskEntryHandler, SettingTheStateChangesTheEntryInPlaceAndNotTheCopies) {
    TaskEntryHandler entries;
    const LogCapture log;
    entries.AddTaskEntry(MakeTask(7, 3));
    TaskRunInfo before;
    ASSERT_EQ(0, entries.GetTaskEntry(7, before));
    EXPECT_EQ(0, entries.SetTaskState(7, TASK_RUN_STATE_RUNNING));
    EXPECT_EQ(0, entries.SetTaskVersionDir(7, "Ferrix Copy_2024-03-09_141502"));
    TaskRunInfo after;
    ASSERT_EQ(0, entries.GetTaskEntry(7, after));
    EXPECT_EQ(TASK_RUN_STATE_IDLE, before.status);
    EXPECT_EQ(TASK_RUN_STATE_RUNNING, after.status);
    EXPECT_EQ("Ferrix Copy_2024-03-09_141502", after.version_dir);
    EXPECT_TRUE(log.Has("[DBG] Set task '7' state (1)"));
    EXPECT_TRUE(log.Has("[DBG] Set task '7' version dir (Ferrix Copy_2024-03-09_141502)"));
}

TEST(TaskEntryHandler, SettingAnythingOfARemovedTaskFailsWithAWarningOnly) {
    TaskEntryHandler entries;
    const LogCapture log;
    EXPECT_EQ(-1, entries.SetTaskState(7, TASK_RUN_STATE_RUNNING));
    EXPECT_EQ(-1, entries.SetTaskVersionDir(8, "x"));
    EXPECT_EQ(-1, entries.SetTaskSettings(MakeTask(9, 3)));
    EXPECT_EQ((std::vector<std::string>{"[WARN] Can not find task entry for task_id '7'",
                                        "[WARN] Can not find task entry for task_id '8'",
                                        "[WARN] Can not find task entry for task_id '9'"}),
              log.Lines());
    EXPECT_TRUE(entries.IsTaskEntryEmpty());
}

TEST(TaskEntryHandler, NewSettingsKeepTheStateAndTheVersionFolderOfTheEntry) {
    TaskEntryHandler entries;
    entries.AddTaskEntry(MakeTask(7, 3));
    TaskRunInfo changed = MakeTask(7, 3);
    changed.task_name = "new";
    changed.dst_dir_path = "/volume1/new";
    changed.version_dir = "read before the run began";
    entries.SetTaskState(7, TASK_RUN_STATE_RUNNING);
    entries.SetTaskVersionDir(7, "Ferrix Copy_2024-03-09_141502");
    EXPECT_EQ(0, entries.SetTaskSettings(changed));
    TaskRunInfo entry;
    ASSERT_EQ(0, entries.GetTaskEntry(7, entry));
    EXPECT_EQ("new", entry.task_name);
    EXPECT_EQ("/volume1/new", entry.dst_dir_path);
    EXPECT_EQ(TASK_RUN_STATE_RUNNING, entry.status);
    EXPECT_EQ("Ferrix Copy_2024-03-09_141502", entry.version_dir);
}

// --- What a run goes by

// The name tells which settings an entry holds.
std::string RunName(const TaskEntryHandler& entries, uint64_t task_id) {
    TaskRunInfo entry;
    return entries.GetRunEntry(task_id, entry) == 0 ? entry.task_name : "none";
}

TaskRunInfo Renamed(uint64_t task_id, const std::string& name) {
    TaskRunInfo task = MakeTask(task_id, 3);
    task.task_name = name;
    return task;
}

TEST(TaskEntryHandler, ARunGoesByTheSettingsThatItBeganWith) {
    TaskEntryHandler entries;
    entries.AddTaskEntry(Renamed(7, "old"));
    EXPECT_EQ("old", RunName(entries, 7)) << "no run has begun";
    TaskRunInfo run;
    entries.SetTaskState(7, TASK_RUN_STATE_RUNNING);
    ASSERT_EQ(0, entries.StartRun(7, run));
    EXPECT_EQ("old", run.task_name);
    ASSERT_EQ(0, entries.SetTaskSettings(Renamed(7, "new")));
    EXPECT_EQ("old", RunName(entries, 7));
    // The state is that of the present: a task that is being cancelled must be seen so.
    entries.SetTaskState(7, TASK_RUN_STATE_CANCELING);
    ASSERT_EQ(0, entries.GetRunEntry(7, run));
    EXPECT_EQ("old", run.task_name);
    EXPECT_EQ(TASK_RUN_STATE_CANCELING, run.status);
    entries.SetTaskState(7, TASK_RUN_STATE_RUNNING);
    EXPECT_EQ("old", RunName(entries, 7));
}

TEST(TaskEntryHandler, ARunEndsWhenItsTaskBecomesIdleOrIsRemovedOrRunsAnew) {
    TaskEntryHandler entries;
    entries.AddTaskEntry(Renamed(7, "first"));
    TaskRunInfo run;
    ASSERT_EQ(0, entries.StartRun(7, run));
    ASSERT_EQ(0, entries.SetTaskSettings(Renamed(7, "second")));
    ASSERT_EQ(0, entries.StartRun(7, run));  // as for a retry
    EXPECT_EQ("second", run.task_name);
    ASSERT_EQ(0, entries.SetTaskSettings(Renamed(7, "third")));
    EXPECT_EQ("second", RunName(entries, 7));
    entries.SetTaskState(7, TASK_RUN_STATE_IDLE);
    EXPECT_EQ("third", RunName(entries, 7));
    ASSERT_EQ(0, entries.StartRun(7, run));
    entries.RemoveTaskEntry(7);
    EXPECT_EQ("none", RunName(entries, 7));
    entries.AddTaskEntry(Renamed(7, "fourth"));
    EXPECT_EQ("fourth", RunName(entries, 7));
}

TEST(TaskEntryHandler, ARunOfARemovedTaskDoesNotBegin) {
    TaskEntryHandler entries;
    TaskRunInfo run = MakeTask(1, 1);
    EXPECT_EQ(-1, entries.StartRun(7, run));
    EXPECT_EQ(-1, entries.GetRunEntry(7, run));
    EXPECT_EQ(1U, run.task_id) << "the out is unchanged";
}

TEST(TaskEntryHandler, ListsAreEmptiedFirstAndFilledInIdOrder) {
    TaskEntryHandler entries;
    entries.AddTaskEntry(MakeTask(9, 1));
    entries.AddTaskEntry(MakeTask(2, 2));
    entries.AddTaskEntry(MakeTask(5, 1));
    entries.AddUSBEntry(MakeUSB(8, "/b"));
    entries.AddUSBEntry(MakeUSB(1, "/a"));

    std::list<TaskRunInfo> tasks{MakeTask(100, 1)};
    entries.ListTaskEntries(tasks);
    EXPECT_EQ((std::vector<uint64_t>{2, 5, 9}), Ids(tasks));
    entries.ListTaskEntriesByUSB(1, tasks);
    EXPECT_EQ((std::vector<uint64_t>{5, 9}), Ids(tasks));
    entries.ListTaskEntriesByUSB(77, tasks);
    EXPECT_TRUE(tasks.empty());

    std::list<USBRunInfo> usbs{MakeUSB(100, "/c")};
    entries.ListUSBEntries(usbs);
    ASSERT_EQ(2U, usbs.size());
    EXPECT_EQ(1U, usbs.front().usb_id);
    EXPECT_EQ(8U, usbs.back().usb_id);
}

TEST(TaskEntryHandler, AnEmptyRegistryIsOneLineFeedAsText) {
    EXPECT_EQ("\n", TaskEntryHandler().ToString());
}

TEST(TaskEntryHandler, TheTextHoldsEveryFieldOnALineOfItsOwn) {
    TaskEntryHandler entries;
    USBRunInfo usb = MakeUSB(3, "/volumeUSB1");
    usb.uuid = "abcd";
    usb.run_when_plug_in = true;
    usb.eject_when_task_done = false;
    entries.AddUSBEntry(usb);
    TaskRunInfo task = MakeTask(18446744073709551615U, 3);
    task.status = TASK_RUN_STATE_CANCELING;
    task.copy_strategy = COPY_STRATEGY_MIRROR;
    task.dst_dir_path = "/volume1/photos";
    task.src_dir_path = "/volumeUSB1/DCIM";
    task.keep_dir_structure = true;
    task.conflict_policy = -1;
    task.version_dir = "v";
    task.enable_rotation = true;
    task.max_version_count = 12;
    task.rotation_policy = 2;
    entries.AddTaskEntry(task);
    EXPECT_EQ(
        "{\n\tusb_id: 3,\n\tusb_share_path: /volumeUSB1,\n\tuuid: abcd,\n\trun_when_plug_in: 1,\n"
        "\teject_when_task_done: 0\n}\n"
        "\n"
        "{\n\ttask_id: 18446744073709551615,\n\tusb_id: 3,\n\ttask_name: task "
        "18446744073709551615,\n\tstatus: 2,\n\tcopy_strategy: 2,\n\thub_share_name: photos,\n"
        "\tdst_dir_path: /volume1/photos,\n\tsrc_dir_path: /volumeUSB1/DCIM,\n\n"
        "\tkeep_dir_structure: 1,\n\tsmart_create_date_dir: 0,\n\trename_photo_video: 0,\n"
        "\tremove_src_file: 0,\n\tconflict_policy: -1,\n\tversion_dir: v,\n\tenable_rotation: 1,\n"
        "\tmax_version_count: 12,\n\trotation_policy: 2\n}\n",
        entries.ToString());
}

TEST(TaskEntryHandler, ManyThreadsReadAndChangeOneEntry) {
    TaskEntryHandler entries;
    TaskRunInfo task = MakeTask(7, 3);
    task.strategy_handler = std::make_shared<CopyStrategyHandler>();
    const std::weak_ptr<CopyStrategyHandler> object = task.strategy_handler;
    entries.AddTaskEntry(task);
    std::atomic<int> wrong{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([&, t] {
            for (int i = 0; i < 500; ++i) {
                TaskRunInfo copy;
                if (entries.GetTaskEntry(7, copy) == 0 && copy.strategy_handler == nullptr) ++wrong;
                if (t == 0) entries.SetTaskVersionDir(7, std::string(i % 40, 'x'));
                if (t == 1) entries.SetTaskState(7, i % 3);
                if (t == 2 && i % 10 == 0) entries.RemoveTaskEntry(7);
                if (t == 2 && i % 10 == 5) entries.AddTaskEntry(task);
                if (t == 3 && entries.ToString().empty()) ++wrong;
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(0, wrong.load());
    entries.RemoveTaskEntry(7);
    task.strategy_handler.reset();
    EXPECT_TRUE(object.expired()) << "no copy may leak a reference";
}

// The mounts of a task, asked through the one registry of the process.
class TaskMounts : public testing::Test {
protected:
    TaskMounts() : m_fake(FakeKeld::Reset()) {
        m_fake.AddShare({.name = "photos", .path = m_dir.MakeDir("volume1/photos")});
        m_fake.AddDevice({.mount_path = m_dir.MakeDir("usb"), .dev_path = "/dev/sdb1"});
        m_entries.AddUSBEntry(MakeUSB(3, m_dir / "usb"));
        m_entries.AddTaskEntry(MakeTask(7, 3));
    }
    ~TaskMounts() override {
        m_entries.RemoveTaskEntry(7);
        m_entries.RemoveUSBEntry(3);
    }
    bool IsUSBMounted() { return IsTaskUSBMounted(7, m_usb_id, m_share_name, m_path); }

    TempDir m_dir;
    FakeKeld& m_fake;
    TaskEntryHandler& m_entries = TaskEntryHandler::GetInstance();
    LogCapture m_log;
    uint64_t m_usb_id = 99;
    std::string m_share_name = "unchanged";
    std::string m_path = "unchanged";
};

TEST_F(TaskMounts, AShareIsMountedUnlessItIsLocked) {
    EXPECT_TRUE(IsShareMounted("photos"));
    m_fake.LockShare("photos");
    EXPECT_FALSE(IsShareMounted("photos"));
}

TEST_F(TaskMounts, AnUnknownShareIsNotMounted) {
    EXPECT_FALSE(IsShareMounted("nothing"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get share info 'nothing'"));
}

TEST_F(TaskMounts, ATaskWithoutAnEntryHasNoShare) {
    EXPECT_TRUE(IsTaskShareMounted(7));
    m_entries.RemoveTaskEntry(7);
    EXPECT_FALSE(IsTaskShareMounted(7));
}

TEST_F(TaskMounts, TheDeviceOfATaskIsMountedWhileItsPathIsAShare) {
    EXPECT_TRUE(IsUSBMounted());
    EXPECT_EQ(3U, m_usb_id);
    EXPECT_EQ("usb", m_share_name);
    EXPECT_EQ(m_dir / "usb", m_path);
}

TEST_F(TaskMounts, TheOutsAreFilledOnlyForAMountedDevice) {
    m_fake.Unmount(m_dir / "usb");
    EXPECT_FALSE(IsUSBMounted());
    m_entries.RemoveUSBEntry(3);
    EXPECT_FALSE(IsUSBMounted());
    m_entries.RemoveTaskEntry(7);
    EXPECT_FALSE(IsUSBMounted());
    EXPECT_EQ(99U, m_usb_id);
    EXPECT_EQ("unchanged", m_share_name);
    EXPECT_EQ("unchanged", m_path);
}

TEST_F(TaskMounts, ATaskIsRunnableWithItsDeviceAndItsShareMounted) {
    EXPECT_TRUE(IsTaskRunnable(true, 7));
    EXPECT_FALSE(IsTaskRunnable(false, 7));
    m_fake.LockShare("photos");
    EXPECT_FALSE(IsTaskRunnable(true, 7));
}

}  // namespace
