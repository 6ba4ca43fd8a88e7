// Both stores under many threads: what each thread wrote is there, and every list is one snapshot.
#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <thread>

#include "db/log-db.h"
#include "db/log-wrapper.h"
#include "db/task-db.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace {

constexpr int kThreads = 6;
constexpr int kRounds = 40;

void RunThreads(const std::function<void(int)>& work) {
    std::vector<std::thread> threads;
    for (int i = 0; i < kThreads; ++i) threads.emplace_back(work, i);
    for (std::thread& thread : threads) thread.join();
}

TEST(ThreadsTest, TasksOfAllThreadsAreStoredUnderIdsOfTheirOwn) {
    const TempDir dir;
    TaskDB db;
    ASSERT_EQ(0, db.Init(dir / "task-db.sqlite"));
    RunThreads([&](int thread) {
        for (int round = 0; round < kRounds; ++round) {
            USBInfo usb;
            usb.uuid = std::to_string(thread) + "-" + std::to_string(round);
            ASSERT_EQ(0, db.AddUSBInfo(usb, usb.id));
            TaskInfo task;
            task.usb_id = usb.id;
            task.task_name = usb.uuid;
            ASSERT_EQ(0, db.AddTaskInfo(task, task.id));
            ASSERT_EQ(0, db.SetTaskResult(task.id, -thread, 1 + round));
            TaskInfo read;
            ASSERT_EQ(1, db.GetTaskInfo(task.id, read));
            EXPECT_EQ(usb.uuid, read.task_name);
            EXPECT_EQ(-thread, read.error);
            if (round % 2 == 0) {
                ASSERT_EQ(0, db.RemoveTaskInfo(task.id));
                EXPECT_EQ(0, db.GetUSBInfoByID(usb.id, usb));
            }
        }
    });
    std::list<TaskInfo> tasks;
    std::list<USBInfo> usbs;
    ASSERT_EQ(0, db.ListAllTaskInfo(tasks));
    ASSERT_EQ(0, db.ListUSBInfo(usbs));
    EXPECT_EQ(static_cast<size_t>(kThreads * kRounds / 2), tasks.size());
    EXPECT_EQ(tasks.size(), usbs.size());
}

TEST(ThreadsTest, ListIsOneSnapshotWhileAShareIsRenamed) {
    const TempDir dir;
    TaskDB db;
    ASSERT_EQ(0, db.Init(dir / "task-db.sqlite"));
    TaskInfo task;
    task.hub_share_name = "a";
    for (int i = 0; i < 20; ++i) ASSERT_EQ(0, db.AddTaskInfo(task, task.id));
    std::atomic<bool> is_done = false;
    std::thread renamer([&] {
        for (int round = 0; round < kRounds; ++round) {
            EXPECT_EQ(0, db.UpdateHUBShareName("a", "b"));
            EXPECT_EQ(0, db.UpdateHUBShareName("b", "a"));
        }
        is_done = true;
    });
    int lists = 0;
    while (!is_done || lists == 0) {
        std::list<TaskInfo> list;
        ASSERT_EQ(0, db.ListAllTaskInfo(list));
        ASSERT_EQ(20u, list.size());
        for (const TaskInfo& each : list) {
            ASSERT_EQ(list.front().hub_share_name, each.hub_share_name);
        }
        ++lists;
    }
    renamer.join();
}

TEST(ThreadsTest, RowsOfAllThreadsReachTheLogAndTheLimitHolds) {
    const TempDir dir;
    LogDB& db = LogDB::GetInstance();
    ASSERT_EQ(0, db.Init(dir / "log-db.sqlite"));
    LogFilter filter;
    filter.description_ids = {LogDescription::LOG_DESC_TASK_ADDED};
    RunThreads([&](int thread) {
        for (int round = 0; round < kRounds; ++round) {
            LogInfo info;
            info.SetTaskId(static_cast<uint64_t>(thread) + 1);
            ASSERT_EQ(
                0, info.SetDescription(LogDescription::LOG_DESC_TASK_ADDED, std::to_string(round)));
            ASSERT_EQ(0, AddLog(info));
        }
    });
    uint64_t count = 0;
    EXPECT_EQ(0, db.CountLogInfo(filter, count));
    EXPECT_EQ(static_cast<uint64_t>(kThreads * kRounds), count);
    ASSERT_EQ(0, db.SetRotateCount(10));
    RunThreads([&](int thread) {
        for (int round = 0; round < kRounds; ++round) {
            LogInfo info;
            info.SetTaskId(static_cast<uint64_t>(thread) + 1);
            ASSERT_EQ(0, info.SetDescription(LogDescription::LOG_DESC_TASK_ADDED, "x"));
            ASSERT_EQ(0, AddLog(info));
            std::vector<LogInfo> rows;
            ASSERT_EQ(0, db.ListLogInfo(filter, rows));
            EXPECT_EQ(10u, rows.size());
        }
    });
    db.Close();
}

// The daemon and another program of the package may meet at a file that neither has made yet.
TEST(ThreadsTest, OneFreshFileMayBeOpenedByManyConnectionsAtOnce) {
    const LogCapture log;
    for (int round = 0; round < 20; ++round) {
        const TempDir dir;
        RunThreads([&](int thread) {
            TaskDB db;
            ASSERT_EQ(0, db.Init(dir / "task-db.sqlite"));
            USBInfo usb;
            usb.uuid = std::to_string(thread);
            EXPECT_EQ(0, db.AddUSBInfo(usb, usb.id));
        });
    }
    EXPECT_EQ(std::vector<std::string>(), log.Lines());
}

TEST(ThreadsTest, StoresMayBeOpenedAndClosedWhileOthersCall) {
    const TempDir dir;
    TaskDB db;
    RunThreads([&](int thread) {
        for (int round = 0; round < kRounds; ++round) {
            if (thread == 0) {
                EXPECT_EQ(0, db.Init(dir / "task-db.sqlite"));
                db.Close();
            } else {
                TaskInfo task;
                EXPECT_LE(db.GetTaskInfo(1, task), 0);  // absent, or closed
            }
        }
    });
}

}  // namespace
