#include "client/run-watcher.h"

#include <gtest/gtest.h>

namespace {

constexpr time_t NOON = 1'800'000'000;

PObject Task(uint64_t id, const char* status, time_t finish_time = 0, int error = 0) {
    PObject task;
    task["id"] = id;
    task["task_status"] = status;
    task["latest_finish_time"] = static_cast<uint64_t>(finish_time);
    task["error_code"] = error;
    return task;
}

PObject Progress(uint64_t run, uint64_t task_id, uint64_t files, uint64_t bytes) {
    PObject progress;
    progress["run"] = run;
    progress["task_id"] = task_id;
    progress["start_time"] = NOON;
    progress["files"] = files;
    progress["bytes"] = bytes;
    return progress;
}

}  // namespace

TEST(RunWatcherTest, WaitsForARunAndEndsWithIt) {
    RunWatcher watcher(3);
    watcher.Update({Task(3, "initial")}, Progress(0, 0, 0, 0), NOON);
    EXPECT_FALSE(watcher.HasEnded());
    watcher.Update({Task(3, "waiting")}, Progress(0, 0, 0, 0), NOON + 1);
    EXPECT_FALSE(watcher.HasEnded());
    watcher.Update({Task(3, "copying")}, Progress(1, 3, 2, 100), NOON + 2);
    EXPECT_FALSE(watcher.HasEnded());
    watcher.Update({Task(3, "successful")}, Progress(1, 3, 9, 900), NOON + 3);
    EXPECT_TRUE(watcher.HasEnded());
    EXPECT_FALSE(watcher.HasFailed());
    ASSERT_EQ(1U, watcher.Looks().size());
    EXPECT_EQ(9U, watcher.Looks()[0].files);
    EXPECT_EQ(3U, watcher.Looks()[0].seconds);
}

TEST(RunWatcherTest, ARunBetweenTwoLooksIsSeen) {
    RunWatcher watcher(3);
    watcher.Update({Task(3, "successful")}, Progress(7, 3, 1, 1), NOON);
    EXPECT_FALSE(watcher.HasEnded()) << "that run was before";
    watcher.Update({Task(3, "failed", NOON, 2)}, Progress(8, 3, 0, 0), NOON + 1);
    EXPECT_TRUE(watcher.HasEnded());
    EXPECT_TRUE(watcher.HasFailed());
}

TEST(RunWatcherTest, ARunThatEndsWithItsDeviceEjectedIsJudgedByItsResult) {
    for (const int error : {0, 5}) {
        RunWatcher watcher(3);
        watcher.Update({Task(3, "copying", NOON - 100)}, Progress(1, 3, 2, 100), NOON);
        watcher.Update({Task(3, "unmounted", NOON + 1, error)}, Progress(1, 3, 9, 900), NOON + 1);
        EXPECT_TRUE(watcher.HasEnded());
        EXPECT_EQ(error != 0, watcher.HasFailed());
        EXPECT_EQ(9U, watcher.Looks().at(0).files);
    }
}

TEST(RunWatcherTest, ATaskTakenOutOfTheQueueHasNotRun) {
    RunWatcher watcher(3);
    watcher.Update({Task(3, "waiting", NOON - 100)}, Progress(1, 3, 2, 100), NOON);
    watcher.Update({Task(3, "successful", NOON - 100)}, Progress(2, 4, 0, 0), NOON + 1);
    EXPECT_TRUE(watcher.HasEnded());
    EXPECT_TRUE(watcher.HasFailed()) << "that success is of an earlier run";
    EXPECT_FALSE(watcher.Looks().at(0).has_progress);
}

TEST(RunWatcherTest, AWaitingTaskThatRunsBetweenTwoLooksHasRun) {
    RunWatcher watcher(3);
    watcher.Update({Task(3, "waiting", NOON - 100)}, Progress(1, 4, 2, 100), NOON);
    // Another run has begun since: only the time tells.
    watcher.Update({Task(3, "successful", NOON)}, Progress(3, 4, 0, 0), NOON + 1);
    EXPECT_TRUE(watcher.HasEnded());
    EXPECT_FALSE(watcher.HasFailed());
}

TEST(RunWatcherTest, OneFailureAmongSeveralRunsIsKept) {
    RunWatcher watcher(std::nullopt);
    watcher.Update({Task(3, "copying"), Task(4, "waiting")}, Progress(1, 3, 1, 10), NOON);
    watcher.Update({Task(3, "failed", NOON, 2), Task(4, "copying")}, Progress(2, 4, 0, 0),
                   NOON + 1);
    EXPECT_FALSE(watcher.HasEnded());
    watcher.Update({Task(3, "failed", NOON, 2), Task(4, "successful", NOON + 2)},
                   Progress(2, 4, 1, 10), NOON + 2);
    EXPECT_TRUE(watcher.HasEnded());
    EXPECT_TRUE(watcher.HasFailed());
    EXPECT_EQ(1U, watcher.Looks().size()) << "the first was shown when it ended";
}

TEST(RunWatcherTest, AnIdleTaskDoesNotShowTheNumbersOfItsLastRun) {
    RunWatcher watcher(3);
    watcher.Update({Task(3, "successful", NOON - 100)}, Progress(1, 3, 60, 1000), NOON);
    EXPECT_FALSE(watcher.HasEnded());
    EXPECT_FALSE(watcher.Looks().at(0).has_progress);
}

TEST(RunWatcherTest, ARunOfAnotherTaskIsNotItsOwn) {
    RunWatcher watcher(3);
    watcher.Update({Task(3, "initial"), Task(4, "copying")}, Progress(1, 4, 5, 50), NOON);
    watcher.Update({Task(3, "initial"), Task(4, "successful")}, Progress(2, 4, 5, 50), NOON + 1);
    EXPECT_FALSE(watcher.HasEnded());
    ASSERT_EQ(1U, watcher.Looks().size());
    EXPECT_FALSE(watcher.Looks()[0].has_progress);
}

TEST(RunWatcherTest, AWaitingTaskDoesNotShowTheNumbersOfItsLastRun) {
    RunWatcher watcher(std::nullopt);
    watcher.Update({Task(3, "waiting")}, Progress(1, 3, 5, 50), NOON);
    ASSERT_EQ(1U, watcher.Looks().size());
    EXPECT_FALSE(watcher.Looks()[0].has_progress);
}

TEST(RunWatcherTest, WithoutATaskAllThatAreAtWorkAreFollowed) {
    RunWatcher watcher(std::nullopt);
    watcher.Update({Task(3, "copying"), Task(4, "waiting"), Task(5, "initial")},
                   Progress(1, 3, 1, 10), NOON);
    EXPECT_EQ(2U, watcher.Looks().size());
    watcher.Update({Task(3, "successful"), Task(4, "copying"), Task(5, "initial")},
                   Progress(2, 4, 0, 0), NOON + 1);
    EXPECT_FALSE(watcher.HasEnded());
    EXPECT_EQ(2U, watcher.Looks().size()) << "the one that ended is shown once more";
    watcher.Update({Task(3, "successful"), Task(4, "successful"), Task(5, "initial")},
                   Progress(2, 4, 1, 10), NOON + 2);
    EXPECT_TRUE(watcher.HasEnded());
}

TEST(RunWatcherTest, TheRateIsThatOfTheLastSeconds) {
    RunWatcher watcher(3);
    watcher.Update({Task(3, "copying")}, Progress(1, 3, 0, 0), NOON);
    EXPECT_EQ(0U, watcher.Looks()[0].bytes_per_second) << "one look tells no rate";
    for (uint64_t second = 1; second <= 20; ++second) {
        const uint64_t bytes = second <= 10 ? second * 100 : 1000 + (second - 10) * 7;
        watcher.Update({Task(3, "copying")}, Progress(1, 3, second, bytes),
                       NOON + static_cast<time_t>(second));
    }
    EXPECT_EQ(7U, watcher.Looks()[0].bytes_per_second);
    watcher.Update({Task(3, "copying")}, Progress(2, 3, 0, 0), NOON + 30);
    EXPECT_EQ(0U, watcher.Looks()[0].bytes_per_second) << "another run begins anew";
}

TEST(RunWatcherTest, AClockThatIsSetBackGivesNoNonsense) {
    RunWatcher watcher(3);
    watcher.Update({Task(3, "copying")}, Progress(1, 3, 1, 100), NOON - 100);
    watcher.Update({Task(3, "copying")}, Progress(1, 3, 2, 200), NOON - 200);
    EXPECT_EQ(0U, watcher.Looks()[0].bytes_per_second);
    EXPECT_EQ(0U, watcher.Looks()[0].seconds);
}
