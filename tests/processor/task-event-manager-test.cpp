#include "processor/task-event-manager.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/log-capture.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class TaskEventManagerTest : public testing::Test {
protected:
    // 0 when there is none.
    uint64_t Pull() {
        uint64_t task_id = 0;
        const int result = m_manager.PullEvent(task_id);
        EXPECT_EQ(result == 1, task_id != 0);
        return task_id;
    }
    LogCapture m_log;
    TaskEventManager m_manager;
};

TEST_F(TaskEventManagerTest, GivesTasksInTheOrderOfTheirPushes) {
    EXPECT_TRUE(m_manager.IsReadyQueueEmpty());
    m_manager.PushEvent(5);
    m_manager.PushEvent(3);
    EXPECT_FALSE(m_manager.IsReadyQueueEmpty());
    EXPECT_TRUE(m_manager.IsProcessingSetEmpty());
    EXPECT_EQ(5U, Pull());
    EXPECT_TRUE(m_manager.IsProcessing(5));
    EXPECT_FALSE(m_manager.IsProcessing(3));
    EXPECT_EQ(3U, Pull());
    EXPECT_TRUE(m_manager.IsReadyQueueEmpty());
    EXPECT_FALSE(m_manager.IsProcessingSetEmpty());
    EXPECT_THAT(m_log.Lines(),
                ElementsAre("[INFO] TaskEventManager: push task event '5' into raedy queue",
                            "[INFO] TaskEventManager: push task event '3' into raedy queue",
                            "[DBG] TaskEventManager: PullEvent '5'",
                            "[DBG] TaskEventManager: PullEvent '3'"));
}

TEST_F(TaskEventManagerTest, AnEmptyQueueGivesNothing) {
    uint64_t task_id = 42;
    EXPECT_EQ(0, m_manager.PullEvent(task_id));
    EXPECT_EQ(42U, task_id);
    EXPECT_TRUE(m_log.Has("[DBG] TaskEventManager: m_ready_queue is empty"));
}

TEST_F(TaskEventManagerTest, TaskZeroIsInvalid) {
    m_manager.PushEvent(0);
    m_manager.RedoEvent(0);
    EXPECT_EQ(2, m_log.Count("[ERR] Invalid task event '0'"));
    EXPECT_TRUE(m_manager.IsReadyQueueEmpty());
}

TEST_F(TaskEventManagerTest, ATaskIsNotQueuedTwice) {
    m_manager.PushEvent(5);
    m_manager.PushEvent(5);
    EXPECT_TRUE(m_log.Has("[WARN] TaskEventManager: task '5' is already in ready queue"));
    EXPECT_EQ(5U, Pull());
    EXPECT_EQ(0U, Pull());
}

TEST_F(TaskEventManagerTest, ARunningTaskIsNotQueued) {
    m_manager.PushEvent(5);
    EXPECT_EQ(5U, Pull());
    m_manager.PushEvent(5);
    EXPECT_TRUE(m_log.Has("[WARN] TaskEventManager: task '5' is already in processing set"));
    EXPECT_TRUE(m_manager.IsReadyQueueEmpty());
    m_manager.DoneEvent(5);
    m_manager.PushEvent(5);
    EXPECT_EQ(5U, Pull());
}

TEST_F(TaskEventManagerTest, ARedoneTaskComesBehindThosePushedMeanwhile) {
    m_manager.PushEvent(5);
    EXPECT_EQ(5U, Pull());
    m_manager.PushEvent(6);
    m_manager.RedoEvent(5);
    EXPECT_FALSE(m_manager.IsProcessing(5));
    EXPECT_EQ(6U, Pull());
    EXPECT_EQ(5U, Pull());
}

TEST_F(TaskEventManagerTest, RedoOfAQueuedTaskWarns) {
    m_manager.PushEvent(5);
    m_manager.RedoEvent(5);
    EXPECT_TRUE(m_log.Has("[WARN] TaskEventManager: task '5' is already in ready queue"));
    EXPECT_EQ(5U, Pull());
    EXPECT_EQ(0U, Pull());
}

TEST_F(TaskEventManagerTest, RedoOfATaskThatIsNowhereQueuesIt) {
    m_manager.RedoEvent(5);
    EXPECT_TRUE(m_log.Has("[INFO] TaskEventManager: push task event '5' into raedy queue"));
    EXPECT_EQ(5U, Pull());
}

TEST_F(TaskEventManagerTest, RemoveTakesATaskOutOfEitherPlace) {
    m_manager.PushEvent(5);
    m_manager.PushEvent(6);
    EXPECT_EQ(5U, Pull());
    m_log.Clear();
    m_manager.RemoveEvent(5);
    EXPECT_THAT(m_log.Lines(), IsEmpty());
    m_manager.RemoveEvent(6);
    EXPECT_THAT(m_log.Lines(),
                ElementsAre("[INFO] TaskEventManager: Remove task_id '6' from ready queue."));
    EXPECT_TRUE(m_manager.IsReadyQueueEmpty());
    EXPECT_TRUE(m_manager.IsProcessingSetEmpty());
}

TEST_F(TaskEventManagerTest, RemoveOfATaskThatIsNowhereDoesNothing) {
    m_manager.RemoveEvent(9);
    EXPECT_THAT(m_log.Lines(), IsEmpty());
}

TEST_F(TaskEventManagerTest, DoneAfterRemoveWarns) {
    m_manager.PushEvent(5);
    EXPECT_EQ(5U, Pull());
    m_manager.RemoveEvent(5);
    m_manager.DoneEvent(5);
    EXPECT_TRUE(
        m_log.Has("[WARN] TaskEventManager: Failed to find task_id '5' in m_processing_set"));
}

}  // namespace
