#include "strategy/run-progress.h"

#include <gtest/gtest.h>

#include <thread>
#include <vector>

TEST(RunProgressTest, ThereIsNoneBeforeTheFirstRun) {
    const RunProgress progress;
    EXPECT_EQ(0U, progress.Get().run);
    EXPECT_EQ(0U, progress.Get().task_id);
}

TEST(RunProgressTest, ARunBeginsAnewAndCountsItsOwnFiles) {
    RunProgress progress;
    progress.Begin(3);
    progress.CountFile(3, 100);
    progress.CountFile(3, 0);
    progress.CountFile(4, 5);  // of a task that was dropped in between
    EXPECT_EQ(1U, progress.Get().run);
    EXPECT_EQ(2U, progress.Get().files);
    EXPECT_EQ(100U, progress.Get().bytes);
    EXPECT_NE(0, progress.Get().start_time);
    progress.Begin(3);
    EXPECT_EQ(2U, progress.Get().run);
    EXPECT_EQ(0U, progress.Get().files);
    EXPECT_EQ(0U, progress.Get().bytes);
}

TEST(RunProgressTest, ItIsReadWhileItIsCounted) {
    RunProgress progress;
    progress.Begin(3);
    std::thread worker([&progress] {
        for (int i = 0; i < 10000; ++i) progress.CountFile(3, 7);
    });
    while (progress.Get().files < 10000) {
        const RunProgress::Snapshot now = progress.Get();
        ASSERT_EQ(now.files * 7, now.bytes);
        std::this_thread::yield();
    }
    worker.join();
}
