// TaskDB: devices, and their tasks as pairs.
#include "db/task-db-fixture.h"

namespace {

// --- Devices

TEST_F(TaskDBTest, DeviceReadsBackAsItWasAdded) {
    USBInfo info;
    info.uuid = "1234-ABCD";
    info.run_when_plug_in = true;
    info.eject_when_task_done = false;
    info.producer = "maker";
    info.product = "stick";
    ASSERT_EQ(0, m_db.AddUSBInfo(info, info.id));
    EXPECT_EQ(1u, info.id);
    USBInfo by_id;
    EXPECT_EQ(1, m_db.GetUSBInfoByID(info.id, by_id));
    EXPECT_EQ(info, by_id);
    USBInfo by_uuid;
    EXPECT_EQ(1, m_db.GetUSBInfoByUUID("1234-ABCD", by_uuid));
    EXPECT_EQ(info, by_uuid);
}

TEST_F(TaskDBTest, UpdatedDeviceReadsBack) {
    USBInfo info;
    info.uuid = "old";
    ASSERT_EQ(0, m_db.AddUSBInfo(info, info.id));
    AddUSB("other");
    info.uuid = "new";
    info.run_when_plug_in = true;
    info.eject_when_task_done = false;
    info.producer = "p";
    info.product = "q";
    EXPECT_EQ(0, m_db.UpdateUSBInfo(info));
    USBInfo read;
    EXPECT_EQ(1, m_db.GetUSBInfoByID(info.id, read));
    EXPECT_EQ(info, read);
    EXPECT_EQ("new|other", Raw("SELECT uuid FROM usb_info_table ORDER BY id"));
}

TEST_F(TaskDBTest, UnknownDeviceIsAbsentAndLeavesTheRecordUntouched) {
    USBInfo info;
    info.product = "untouched";
    EXPECT_EQ(0, m_db.GetUSBInfoByID(77, info));
    EXPECT_EQ(0, m_db.GetUSBInfoByUUID("unknown", info));
    EXPECT_EQ("untouched", info.product);
    EXPECT_TRUE(info.eject_when_task_done);
}

TEST_F(TaskDBTest, UuidIsStoredOnce) {
    AddUSB("u");
    const LogCapture log;
    USBInfo info;
    info.uuid = "u";
    uint64_t id = 5;
    EXPECT_EQ(-1, m_db.AddUSBInfo(info, id));
    EXPECT_EQ(5u, id);
    EXPECT_TRUE(log.Has("[ERR] sqlite3_exec: [19] UNIQUE constraint failed: usb_info_table.uuid"));
}

TEST_F(TaskDBTest, ListOfDevicesReplacesTheCallersList) {
    AddUSB("a");
    AddUSB("b");
    std::list<USBInfo> list(5);
    ASSERT_EQ(0, m_db.ListUSBInfo(list));
    ASSERT_EQ(2u, list.size());
    EXPECT_EQ("a", list.front().uuid);
    EXPECT_EQ("b", list.back().uuid);
}

// --- Devices and tasks live as pairs

TEST_F(TaskDBTest, DeletingTheOnlyTaskOfADeviceDeletesTheDevice) {
    const uint64_t usb = AddUSB("u");
    const uint64_t other = AddUSB("other");
    AddTask(other);
    EXPECT_EQ(0, m_db.RemoveTaskInfo(AddTask(usb)));
    USBInfo info;
    EXPECT_EQ(0, m_db.GetUSBInfoByID(usb, info));
    EXPECT_EQ(1, m_db.GetUSBInfoByID(other, info));
}

TEST_F(TaskDBTest, DeletingOneOfTwoTasksKeepsTheDevice) {
    const uint64_t usb = AddUSB("u");
    AddTask(usb);
    EXPECT_EQ(0, m_db.RemoveTaskInfo(AddTask(usb)));
    USBInfo info;
    EXPECT_EQ(1, m_db.GetUSBInfoByID(usb, info));
}

TEST_F(TaskDBTest, DeletingADeviceDeletesAllItsTasks) {
    const uint64_t usb = AddUSB("u");
    AddTask(usb);
    AddTask(usb);
    const uint64_t other = AddTask(AddUSB("other"));
    const LogCapture log;
    EXPECT_EQ(0, m_db.RemoveUSBInfo(usb));
    EXPECT_EQ(std::to_string(other), Raw("SELECT id FROM task_info_table"));
    EXPECT_EQ("other", Raw("SELECT uuid FROM usb_info_table"));
    EXPECT_TRUE(log.Lines().empty());
}

TEST_F(TaskDBTest, IdsOfRemovedRowsAreNotGivenAgain) {
    const uint64_t first = AddUSB("u");
    EXPECT_EQ(0, m_db.RemoveUSBInfo(first));
    EXPECT_EQ(first + 1, AddUSB("u"));
    const uint64_t task = AddTask(1);
    EXPECT_EQ(0, m_db.RemoveTaskInfo(task));
    EXPECT_EQ(task + 1, AddTask(1));
}

}  // namespace
