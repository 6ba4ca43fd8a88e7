#include "processor/processor.h"

#include <gtest/gtest.h>
#include <pthread.h>

#include <atomic>
#include <thread>

#include "processor/retry-counter.h"
#include "utils/error-code.h"

namespace {

// Works until it is stopped.
class Worker : public Processor {
public:
    void Run() override {
        seen_id = GetID();
        while (GetStatus() != PROCESSOR_STOPPED) {
            if (GetStatus() == PROCESSOR_PAUSED) {
                SleepOneStep();
            } else {
                is_waiting = true;
                last_wait = Wait(5);
            }
        }
    }
    std::atomic<int> seen_id{-2};
    std::atomic<int> last_wait{7};
    std::atomic<bool> is_waiting{false};
};

class ProcessorTest : public testing::Test {
protected:
    ~ProcessorTest() override { Processor::SetWaitStepForTest(100000); }
};

TEST_F(ProcessorTest, IsStoppedAndHasNoIdBeforeItsStart) {
    Processor processor;
    EXPECT_EQ(PROCESSOR_STOPPED, processor.GetStatus());
    EXPECT_EQ(-1, processor.GetID());
    EXPECT_EQ(-1, processor.Join());
    EXPECT_EQ(0, processor.Init());
    EXPECT_EQ(0, processor.SetAbortFlag(true));
}

TEST_F(ProcessorTest, StartGivesRisingIdsAndRefusesAStartedOne) {
    Worker first;
    Worker second;
    ASSERT_EQ(0, first.Start());
    ASSERT_EQ(0, second.Start());
    EXPECT_EQ(-1, first.Start());
    EXPECT_EQ(first.GetID() + 1, second.GetID());
    EXPECT_EQ(PROCESSOR_RUNNING, first.GetStatus());
    const int first_id = first.GetID();
    for (Worker* worker : {&first, &second}) {
        worker->Stop();
        EXPECT_EQ(0, worker->Join());
        EXPECT_EQ(PROCESSOR_STOPPED, worker->GetStatus());
        EXPECT_EQ(-1, worker->GetID());
        EXPECT_EQ(-1, worker->Join());
    }
    EXPECT_EQ(first_id, first.seen_id);  // the thread sees its id from the start
    ASSERT_EQ(0, first.Start());         // the count is never lowered
    EXPECT_EQ(first_id + 2, first.GetID());
    first.Stop();
    first.Join();
}

TEST_F(ProcessorTest, AThreadThatEndsByItselfIsStopped) {
    Processor processor;
    ASSERT_EQ(0, processor.Start());
    EXPECT_EQ(0, processor.Join());
    EXPECT_EQ(PROCESSOR_STOPPED, processor.GetStatus());
}

TEST_F(ProcessorTest, AThreadThatCannotBeMadeLeavesItStopped) {
    pthread_attr_t usual;
    ASSERT_EQ(0, pthread_getattr_default_np(&usual));
    pthread_attr_t huge;
    ASSERT_EQ(0, pthread_attr_init(&huge));
    ASSERT_EQ(0, pthread_attr_setstacksize(&huge, SIZE_MAX / 4 / 4096 * 4096));
    ASSERT_EQ(0, pthread_setattr_default_np(&huge));
    Worker worker;
    const int result = worker.Start();
    ASSERT_EQ(0, pthread_setattr_default_np(&usual));
    EXPECT_EQ(-1, result);
    EXPECT_EQ(PROCESSOR_STOPPED, worker.GetStatus());
    EXPECT_EQ(-1, worker.GetID());
    EXPECT_EQ(-1, worker.Join());
    pthread_attr_destroy(&huge);
    pthread_attr_destroy(&usual);
}

TEST_F(ProcessorTest, PauseAndResumeSetTheStatus) {
    Processor processor;
    EXPECT_EQ(0, processor.Pause());
    EXPECT_EQ(PROCESSOR_PAUSED, processor.GetStatus());
    EXPECT_EQ(0, processor.Resume());
    EXPECT_EQ(PROCESSOR_RUNNING, processor.GetStatus());
    EXPECT_EQ(0, processor.Stop());
    EXPECT_EQ(PROCESSOR_STOPPED, processor.GetStatus());
}

// Another thread's pause and resume may come just behind a stop.
TEST_F(ProcessorTest, AStopIsNotTakenBackUntilTheNextStart) {
    Worker worker;
    ASSERT_EQ(0, worker.Start());
    worker.Stop();
    worker.Pause();
    EXPECT_EQ(PROCESSOR_STOPPED, worker.GetStatus());
    worker.Resume();
    EXPECT_EQ(PROCESSOR_STOPPED, worker.GetStatus());
    EXPECT_EQ(0, worker.Join());
    ASSERT_EQ(0, worker.Start());
    worker.Pause();
    EXPECT_EQ(PROCESSOR_PAUSED, worker.GetStatus());
    worker.Stop();
    EXPECT_EQ(0, worker.Join());
}

TEST_F(ProcessorTest, WaitEndsAtOnceWithoutTimeOrWithoutRunning) {
    Processor processor;
    EXPECT_EQ(0, processor.Wait(0));
    EXPECT_EQ(-1, processor.Wait(1000000));
    processor.Pause();
    EXPECT_EQ(-1, processor.Wait(1000000));
    Processor::SetWaitStepForTest(0);
    processor.Resume();
    EXPECT_EQ(0, processor.Wait(3));
}

TEST_F(ProcessorTest, APauseEndsAWait) {
    Processor::SetWaitStepForTest(20000);
    Worker worker;
    ASSERT_EQ(0, worker.Start());
    while (!worker.is_waiting) std::this_thread::yield();
    worker.Pause();
    while (worker.last_wait == 7) std::this_thread::yield();
    EXPECT_EQ(-1, worker.last_wait);
    worker.Stop();
    worker.Join();
}

TEST(RetryCounterTest, TurnsTheFourthRetryIntoDone) {
    RetryCounter counter;
    for (int round = 0; round < 2; ++round) {
        for (int i = 0; i < 3; ++i) {
            EXPECT_FALSE(counter.IsUsedUp());
            EXPECT_EQ(ERROR_ACTION_RETRY, counter.Count(ERROR_ACTION_RETRY));
        }
        EXPECT_TRUE(counter.IsUsedUp());
        EXPECT_EQ(ERROR_ACTION_DONE, counter.Count(ERROR_ACTION_RETRY));
    }
}

TEST(RetryCounterTest, OtherActionsPassAndStartAnew) {
    for (const int other : {ERROR_ACTION_DONE, ERROR_ACTION_REDO, ERROR_ACTION_NONE}) {
        RetryCounter counter;
        for (int i = 0; i < 3; ++i) EXPECT_EQ(1, counter.Count(ERROR_ACTION_RETRY));
        EXPECT_EQ(other, counter.Count(other));
        EXPECT_FALSE(counter.IsUsedUp());
        EXPECT_EQ(ERROR_ACTION_RETRY, counter.Count(ERROR_ACTION_RETRY));
    }
}

TEST(RetryCounterTest, ResetForgets) {
    RetryCounter counter;
    for (int i = 0; i < 3; ++i) EXPECT_EQ(1, counter.Count(ERROR_ACTION_RETRY));
    counter.Reset();
    EXPECT_EQ(ERROR_ACTION_RETRY, counter.Count(ERROR_ACTION_RETRY));
}

}  // namespace
