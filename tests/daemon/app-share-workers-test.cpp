// Shares that move, go and are locked in the middle of a run.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <random>

#include "db/log-description.h"
#include "event/event-manager.h"
#include "processor/task-event-manager.h"
#include "share-fixture.h"
#include "workers-fixture.h"

using testing::IsEmpty;

namespace {

constexpr int INTERRUPTED = -1;
constexpr int FRONT_USB = 99;

class ShareWorkersTest : public OnShares<WorkersTest> {
protected:
    using WorkersTest::Status;
    // A task that is held up in the middle of its first copy.
    uint64_t Running(const std::shared_ptr<Gate>& gate) {
        const uint64_t task_id = AddRunningTask("a", "/in");
        EXPECT_THAT(Send("run_task", ForTask(task_id)), IsSuccess());
        gate->WaitForWorker();
        EXPECT_EQ("copying", Status(task_id));
        return task_id;
    }
    // Nothing of the task is left with the workers.
    static void ExpectLetGo(uint64_t task_id) {
        EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
        EXPECT_FALSE(TaskEventManager::GetInstance().IsProcessing(task_id));
        EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(task_id));
        EXPECT_EQ(0u, EventManager::GetInstance().GetHeldEventCount(task_id));
    }
    [[nodiscard]] size_t FilesOf(const std::string& folder) const {
        const std::filesystem::directory_iterator files(m_volume + folder);
        return static_cast<size_t>(std::distance(begin(files), end(files)));
    }
};

TEST_F(ShareWorkersTest, ARenameEndsTheRunAndTheNextOneGoesToTheNewName) {
    const auto gate = HoldCopies();
    const uint64_t task_id = Running(gate);
    EXPECT_EQ(0, ShareHook("pre_path_change", "photos"));
    ExpectLetGo(task_id);
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ(INTERRUPTED, Task(task_id).error);
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_TASK_STOPPED));
    EXPECT_EQ("failed", Status(task_id));
    MoveShare("photos", "pictures");
    EXPECT_EQ(0, ShareHook("post_path_change", "pictures", "photos"));
    ExpectLetGo(task_id);
    EXPECT_EQ(TASK_RUN_STATE_IDLE, Entry(task_id).status);
    EXPECT_EQ(INTERRUPTED, Task(task_id).error);
    m_fake.OnCall("KELDFileCopy_r", {});
    RunToTheEnd(task_id);
    EXPECT_EQ("successful", Status(task_id));
    EXPECT_EQ(20u, FilesOf("/pictures/in"));
    EXPECT_FALSE(std::filesystem::exists(m_volume + "/photos"));
}

TEST_F(ShareWorkersTest, ATaskOfAnotherShareRunsOnThroughARename) {
    AddShare("music");
    const auto gate = std::make_shared<Gate>();
    m_fake.OnCall("KELDFileCopy_r", [gate] { gate->Hold([] { return false; }); });
    const uint64_t running = Running(gate);
    const uint64_t other = AddOn("music", "b");
    ASSERT_THAT(Send("run_task", ForTask(other)), IsSuccess());
    EXPECT_EQ(0, ShareHook("pre_path_change", "music"));
    ExpectLetGo(other);
    EXPECT_EQ("copying", Status(running));
    MoveShare("music", "songs");
    EXPECT_EQ(0, ShareHook("post_path_change", "songs", "music"));
    gate->Open();
    WaitUntil([&] { return Status(running) == "successful"; });
    EXPECT_EQ(20u, FilesOf("/photos/in"));
}

TEST_F(ShareWorkersTest, ALockCancelsTheRunAndAnUnlockStartsNothing) {
    const auto gate = HoldCopies();
    const uint64_t task_id = Running(gate);
    EXPECT_EQ(0, ShareHook("pre_encrypt", "photos"));
    ExpectLetGo(task_id);
    m_fake.LockShare("photos");
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_EQ("failed", Status(task_id));
    EXPECT_FALSE(OnlyTask()["is_task_runnable"].AsBool());
    m_fake.OnCall("KELDFileCopy_r", {});
    m_fake.LockShare("photos", false);
    EXPECT_EQ(0, ShareHook("post_decrypt", "photos"));
    ExpectLetGo(task_id);
    EXPECT_TRUE(OnlyTask()["is_task_runnable"].AsBool());
    RunToTheEnd(task_id);
    EXPECT_EQ("successful", Status(task_id));
}

TEST_F(ShareWorkersTest, ADeletionEndsTheRunAndLeavesNothing) {
    const auto gate = HoldCopies();
    const uint64_t task_id = Running(gate);
    EXPECT_EQ(0, ShareHook("pre_delete", "photos"));
    ExpectLetGo(task_id);
    EXPECT_THAT(Tasks(), IsEmpty());
    EXPECT_THAT(Devices(), IsEmpty());
    EXPECT_EQ(0u, LoadedDevices());
    EXPECT_FALSE(std::filesystem::exists(TaskFolder(task_id)));
}

TEST_F(ShareWorkersTest, ADefaultTaskIsClearedInTheMiddleOfItsRun) {
    const auto gate = HoldCopies();
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("front", "u-front", FRONT_USB);
    for (int i = 0; i < 20; ++i) m_dir.Write("m/front/f" + std::to_string(i), "content");
    ASSERT_EQ(0, PostMount("front"));
    ASSERT_THAT(Send("run_task", ForTask(task_id)), IsSuccess());
    gate->WaitForWorker();
    EXPECT_EQ(0, ShareHook("pre_delete", "photos"));
    ExpectLetGo(task_id);
    const TaskInfo task = Task(task_id);
    EXPECT_EQ("", task.hub_share_name);
    EXPECT_EQ("", task.hub_folder_path);
    EXPECT_FALSE(task.is_enable);
    EXPECT_EQ(INTERRUPTED, task.error);
    EXPECT_EQ("disabled", Status(task_id));
}

// Two tasks on two shares, which are renamed, locked, restored and taken at random while they run.
TEST_F(ShareWorkersTest, SharesThatMoveAtRandomDuringRunsLeaveNothingBehind) {
    std::mt19937 random(4);
    std::string names[] = {"photos", "music"};
    AddShare("music");
    uint64_t tasks[] = {AddOn("photos", "a"), AddOn("music", "b")};
    for (const char* device : {"m/a/f", "m/b/f"}) {
        for (int i = 0; i < 20; ++i) m_dir.Write(device + std::to_string(i), "content");
    }
    for (int round = 0; round < 100; ++round) {
        const size_t at = random() % 2;
        Send("run_task", ForTask(tasks[0]));
        Send("run_task", ForTask(tasks[1]));
        usleep(random() % 4000);
        switch (random() % 4) {
            case 0: {
                const std::string name = "share" + std::to_string(round);
                EXPECT_EQ(0, ShareHook("pre_path_change", names[at]));
                ExpectLetGo(tasks[at]);
                MoveShare(names[at], name);
                EXPECT_EQ(0, ShareHook("post_path_change", name, names[at]));
                names[at] = name;
                break;
            }
            case 1:
                EXPECT_EQ(0, ShareHook("pre_encrypt", names[at]));
                ExpectLetGo(tasks[at]);
                m_fake.LockShare(names[at]);
                EXPECT_THAT(Send("run_task", ForTask(tasks[at])),
                            IsError(11, "Task is not runnable"));
                m_fake.LockShare(names[at], false);
                EXPECT_EQ(0, ShareHook("post_decrypt", names[at]));
                break;
            case 2:
                EXPECT_EQ(0, ShareHook("pre_snapshot_restore", names[at]));
                ExpectLetGo(tasks[at]);
                EXPECT_FALSE(IsLoaded(tasks[at]));
                EXPECT_EQ(0, ShareHook("post_snapshot_restore", names[at]));
                break;
            default: {
                const uint64_t gone = tasks[at];
                EXPECT_EQ(0, ShareHook("pre_delete", names[at]));
                ExpectLetGo(gone);
                EXPECT_FALSE(std::filesystem::exists(TaskFolder(gone)));
                tasks[at] = AddOn(names[at], at == 0 ? "a" : "b");
                EXPECT_NE(gone, tasks[at]);
                break;
            }
        }
        ASSERT_EQ(2u, Tasks().size());
        EXPECT_EQ(2u, LoadedDevices());
        EXPECT_EQ(names[at], Entry(tasks[at]).hub_share_name);
        EXPECT_EQ(names[at], Task(tasks[at]).hub_share_name);
    }
    EXPECT_GT(LogRows(LogDescription::LOG_DESC_TASK_STOPPED), 10u);
    for (size_t at : {0, 1}) {
        RunToTheEnd(tasks[at]);
        EXPECT_EQ("successful", Status(tasks[at]));
        EXPECT_EQ(20u, FilesOf("/" + names[at] + (at == 0 ? "/a" : "/b")));
    }
}

}  // namespace
