// Shares that are locked and unlocked, while the workers stand still.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "event/event-generator.h"
#include "event/event-manager.h"
#include "processor/task-event-manager.h"
#include "share-fixture.h"

using testing::ElementsAre;

namespace {

class ShareLockTest : public OnShares<CommandTest> {
protected:
    void Lock(const std::string& share) {
        EXPECT_EQ(0, ShareHook("pre_encrypt", share));
        m_fake.LockShare(share);
    }
    void Unlock(const std::string& share) {
        m_fake.LockShare(share, false);
        EXPECT_EQ(0, ShareHook("post_decrypt", share));
    }
};

TEST_F(ShareLockTest, ATaskIsCancelledAndItsEntriesStay) {
    const uint64_t task_id = AddOn("photos", "a");
    ASSERT_THAT(Send("run_task", ForTask(task_id)), IsSuccess());
    EventGenerator(task_id).PushScanEvent("/");
    const auto before = Entry(task_id).strategy_handler;
    Lock("photos");
    EXPECT_EQ(before, Entry(task_id).strategy_handler);
    EXPECT_EQ(1u, LoadedDevices());
    EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
    EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(task_id));
    EXPECT_EQ("unmounted", Status(task_id));
    EXPECT_THAT(Send("run_task", ForTask(task_id)), IsError(11, "Task is not runnable"));
}

TEST_F(ShareLockTest, ATaskReturnsByItselfAndIsNotStarted) {
    const uint64_t task_id = AddOn("photos", "a");
    ASSERT_THAT(Send("run_task", ForTask(task_id)), IsSuccess());
    Lock("photos");
    m_log.Clear();
    Unlock("photos");
    EXPECT_THAT(Told(), ElementsAre("[INFO] HandleShareMounted: share_name = photos, do nothing"));
    EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
    EXPECT_EQ("initial", Status(task_id));
    EXPECT_THAT(Send("run_task", ForTask(task_id)), IsSuccess());
}

TEST_F(ShareLockTest, EveryTaskOfTheShareIsCancelledInTurn) {
    AddShare("music");
    AddOn("photos", "one");
    const uint64_t other = AddOn("music", "other");
    AddOn("photos", "two");
    ASSERT_THAT(Send("run_task", ForTask(other)), IsSuccess());
    m_log.Clear();
    Lock("photos");
    EXPECT_THAT(
        Told({"Share", "Cancel"}),
        ElementsAre(
            "[INFO] HandleShareUnmounted: share_name = photos",
            "[INFO] HandleShareUnmounted: CancelTask '1' because HUB share 'photos' is unmounted",
            "[INFO] Cancel Task '1'",
            "[INFO] HandleShareUnmounted: CancelTask '3' because HUB share 'photos' is unmounted",
            "[INFO] Cancel Task '3'"));
    EXPECT_EQ("waiting", Status(other));
}

TEST_F(ShareLockTest, ATaskThatIsNotLoadedIsPassedOver) {
    AddOn("photos", "away");
    const uint64_t there = AddOn("photos", "there");
    ASSERT_EQ(0, PreUnmount("away"));
    ASSERT_THAT(Send("run_task", ForTask(there)), IsSuccess());
    Lock("photos");
    EXPECT_TRUE(m_log.Has("[ERR] Task '1' does not match"));
    EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(there));
}

}  // namespace
