#include "processor/barrier.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

#include "processor/barrier-slot.h"
#include "support/log-capture.h"

namespace {

TEST(BarrierTest, WaitReturnsAtOnceWhenNobodyIsRegistered) {
    Barrier barrier;
    barrier.Wait();
    barrier.Register(1);
    barrier.Reach(1);
    barrier.Wait();
}

TEST(BarrierTest, WaitReturnsWhenAllHaveComeBy) {
    Barrier barrier;
    constexpr int kThreads = 8;
    std::atomic<int> reached{0};
    for (int i = 0; i < kThreads; ++i) barrier.Register(i);
    std::vector<std::thread> threads;
    for (int i = 0; i < kThreads; ++i) {
        threads.emplace_back([&, i] {
            ++reached;
            barrier.Reach(i);
        });
    }
    barrier.Wait();
    EXPECT_EQ(kThreads, reached);
    for (std::thread& thread : threads) thread.join();
}

TEST(BarrierTest, MayBeDestroyedAsSoonAsWaitReturns) {
    for (int i = 0; i < 500; ++i) {
        std::thread worker;
        {
            Barrier barrier;
            barrier.Register(1);
            worker = std::thread([&barrier] { barrier.Reach(1); });
            barrier.Wait();
        }
        worker.join();
    }
}

TEST(BarrierTest, LogsBothSides) {
    LogCapture log;
    Barrier barrier;
    barrier.Register(5);
    barrier.Reach(5);
    EXPECT_TRUE(log.Has("[DBG] Processor 5 register barrier"));
    EXPECT_TRUE(log.Has("[DBG] Processor 5 reach barrier"));
}

TEST(BarrierSlotTest, AWorkerOutsideItsLoopIsNotWaitedFor) {
    BarrierSlot slot;
    Barrier barrier;
    slot.Put(&barrier, 1);
    EXPECT_EQ(nullptr, slot.Take());
    slot.Open();
    slot.Close(1);
    slot.Put(&barrier, 1);
    barrier.Wait();
}

TEST(BarrierSlotTest, KeepsABarrierUntilItIsTaken) {
    BarrierSlot slot;
    Barrier barrier;
    slot.Open();
    slot.Put(nullptr, 1);
    EXPECT_EQ(nullptr, slot.Take());
    slot.Put(&barrier, 1);
    EXPECT_EQ(&barrier, slot.Take());
    EXPECT_EQ(nullptr, slot.Take());
    barrier.Reach(1);
    barrier.Wait();
}

TEST(BarrierSlotTest, ClosingReachesAPendingBarrier) {
    BarrierSlot slot;
    Barrier barrier;
    slot.Open();
    slot.Put(&barrier, 1);
    slot.Close(1);
    barrier.Wait();
}

}  // namespace
