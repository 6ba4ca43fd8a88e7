// What "link" finds already mounted.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "command-fixture.h"
#include "processor/task-event-manager.h"

namespace {

class LinkEntriesTest : public CommandTest {};

TEST_F(LinkEntriesTest, LoadsWhatIsMountedAndStartsNothing) {
    PlugIn("a", "u-1");
    PlugIn("b", "u-2");
    const uint64_t first = AddTask("a", "u-1");
    PObject request = AddRequest("b", "u-2");
    request["task_type"] = 2;
    request["run_when_plug_in"] = true;
    const uint64_t second = Send("add_task", request)["task_id"].AsUInt64();
    ForgetEntries();
    EXPECT_EQ(0, LoadEntries());
    EXPECT_TRUE(IsLoaded(first));
    EXPECT_TRUE(IsLoaded(second));
    EXPECT_TRUE(TaskEventManager::GetInstance().IsReadyQueueEmpty());
}

TEST_F(LinkEntriesTest, GoesOnBehindEachDeviceThatCannotBeLoaded) {
    PlugIn("z", "u-9");
    const uint64_t task_id = AddTask("z", "u-9");
    ForgetEntries();
    PlugIn("a", "");         // without a uuid and without a key file
    PlugIn("b", "u-2", 99);  // at a front port, but there is no default task
    PlugIn("c", "u-3");      // unknown
    m_log.Clear();
    EXPECT_EQ(0, LoadEntries());
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_TRUE(m_log.Has("[WARN] Failed to get uuid for device '" + DevicePath("a") +
                          "', ignore this device"));
    EXPECT_TRUE(m_log.Has("[WARN] Failed to register usb for device '" + DevicePath("b") +
                          "', ignore this device"));
    EXPECT_TRUE(
        m_log.Has("[WARN] NO matched usb info for '" + DevicePath("c") + "', ignore this device"));
}

TEST_F(LinkEntriesTest, IsNoFailureWhenTheEntriesOfADeviceCannotBeRead) {
    PlugIn("a", "u-1");
    ASSERT_NE(0u, AddTask("a", "u-1"));
    ForgetEntries();
    DropTable("task_info_table");
    EXPECT_EQ(0, LoadEntries());
    EXPECT_TRUE(m_log.Has("[WARN] Failed to load usb and task entry for '1', '" + MountPath("a") +
                          "', ignore"));
}

TEST_F(LinkEntriesTest, IsNoFailureWhenTheMountsCannotBeRead) {
    PlugIn("a", "u-1");
    const uint64_t task_id = AddTask("a", "u-1");
    ForgetEntries();
    m_fake.FailCall("KELDMountVolAllEnum");
    EXPECT_EQ(0, LoadEntries());
    EXPECT_FALSE(IsLoaded(task_id));
}

}  // namespace
