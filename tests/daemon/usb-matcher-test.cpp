#include "daemon/usb-matcher.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "command-fixture.h"
#include "db/task-db.h"
#include "platform/utility.h"

namespace {

constexpr int FRONT_USB = 99;
constexpr int SD_SLOT = 98;
constexpr int REAR = 0;

class USBMatcherTest : public CommandTest {
protected:
    int Register(const std::string& name, const std::string& uuid) {
        return m_matcher.Register(MountPath(name), DevicePath(name), uuid);
    }
    // The uuid of the row that serves a device; empty when none does.
    std::string Match(const std::string& uuid) {
        USBInfo usb_info;
        return m_matcher.Match(uuid, usb_info) == 1 ? usb_info.uuid : "";
    }
    uint64_t UsbIdOf(uint64_t task_id) { return Task(task_id).usb_id; }

    USBMatcher& m_matcher = USBMatcher::GetInstance();
};

TEST_F(USBMatcherTest, RegisterRefusesEmptyArguments) {
    EXPECT_EQ(-1, m_matcher.Register("", "/dev/sda1", "u"));
    EXPECT_EQ(-1, m_matcher.Register("/m", "", "u"));
    EXPECT_EQ(-1, m_matcher.Register("/m", "/dev/sda1", ""));
    EXPECT_EQ(3, m_log.Count("[ERR] Invalid parameter"));
}

TEST_F(USBMatcherTest, ADeviceWithARowOfItsOwnNeedsNoFrontPort) {
    PlugIn("a", "u-1", REAR);
    ASSERT_NE(0u, AddTask("a", "u-1"));
    m_fake.ForgetCalls();
    EXPECT_EQ(1, Register("a", "u-1"));
    EXPECT_TRUE(m_log.Has("[INFO] Get matched usb info for 'u-1'"));
    EXPECT_EQ(0, m_fake.CallCount("KELDUSBDevGetInfo"));
    EXPECT_EQ(0, m_fake.CallCount("DiskPartitionsLayoutGet"));
    EXPECT_EQ("u-1", Match("u-1"));
    EXPECT_TRUE(m_log.Has("[INFO] Current uuid 'u-1' match a USER_TASK"));
}

TEST_F(USBMatcherTest, ADeviceInARearPortIsNoCandidate) {
    AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("a", "u-1", REAR);
    EXPECT_EQ(2, Register("a", "u-1"));
    EXPECT_TRUE(m_log.Contains("is NOT at front port"));
    EXPECT_TRUE(m_log.Has("[INFO] Current device '" + DevicePath("a") + "' is NOT default task"));
    EXPECT_EQ("", Match("u-1"));
    EXPECT_TRUE(m_log.Has("[WARN] uuid 'u-1' is NOT a candidate default task"));
}

TEST_F(USBMatcherTest, AFrontUsbDeviceMatchesTheUsbDefault) {
    AddDefaultTask(DEFAULT_USB_UUID);
    AddDefaultTask(DEFAULT_SD_UUID);
    PlugIn("a", "u-1", FRONT_USB);
    EXPECT_EQ(0, Register("a", "u-1"));
    EXPECT_EQ(DEFAULT_USB_UUID, Match("u-1"));
    EXPECT_TRUE(m_log.Contains("is at front port and type is 'USB'"));
    EXPECT_TRUE(m_log.Has("[INFO] Default task exists for 'u-1'"));
    EXPECT_TRUE(m_log.Has("[INFO] Current uuid 'u-1' match a DEFAULT_TASK"));
}

TEST_F(USBMatcherTest, ACardInTheSlotMatchesTheSdDefault) {
    AddDefaultTask(DEFAULT_USB_UUID);
    AddDefaultTask(DEFAULT_SD_UUID);
    PlugIn("card", "u-2", SD_SLOT);
    bool is_usb_dev = true;
    EXPECT_TRUE(IsDefaultTaskDevice(DevicePath("card"), is_usb_dev));
    EXPECT_FALSE(is_usb_dev);
    EXPECT_EQ(0, Register("card", "u-2"));
    EXPECT_EQ(DEFAULT_SD_UUID, Match("u-2"));
    EXPECT_TRUE(m_log.Contains("is at front port and type is 'SDCard'"));
}

TEST_F(USBMatcherTest, OnlyOneOrTwoPartitionsQualify) {
    AddDefaultTask(DEFAULT_USB_UUID);
    const std::vector<std::pair<int, int>> cases = {
        {-1, 2},
        {0,  2},
        {1,  0},
        {2,  0},
        {3,  2}
    };
    for (const auto& [partitions, expected] : cases) {
        const std::string name(1, static_cast<char>('b' + partitions));
        PlugIn(name, name, FRONT_USB, partitions);
        EXPECT_EQ(expected, Register(name, name)) << partitions << " partitions";
    }
    EXPECT_TRUE(m_log.Contains("with 3 partition"));
    EXPECT_TRUE(m_log.Contains("with -1 partition"));
}

TEST_F(USBMatcherTest, AModelWithoutDefaultTasksHasNoCandidates) {
    AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("a", "u-1", FRONT_USB);
    m_fake.SetCapability("ferrix", false);
    InitDeviceSupport();
    EXPECT_EQ(2, Register("a", "u-1"));
    EXPECT_TRUE(m_log.Has("[INFO] HUB does NOT support default task"));
}

TEST_F(USBMatcherTest, EachStepOfTheFrontPortTestMayFail) {
    AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("a", "u-1", FRONT_USB);
    bool is_usb_dev = false;
    EXPECT_FALSE(IsDefaultTaskDevice("", is_usb_dev));
    for (const char* call : {"DiskPartitionNumRemove", "KELDUSBDevGetInfo", "KELDUSBGetLocation",
                             "DiskPartitionsLayoutGet"}) {
        m_fake.FailCall(call);
        EXPECT_EQ(2, Register("a", "u-1")) << call;
        EXPECT_EQ("", Match("u-1")) << call;
    }
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get keld_dev_name for '" + DevicePath("a") + "'"));
    EXPECT_EQ(0, Register("a", "u-1"));
}

TEST_F(USBMatcherTest, RegisterFailsWhenTheDefaultRowIsMissing) {
    PlugIn("a", "u-1", FRONT_USB);
    PlugIn("card", "u-2", SD_SLOT);
    EXPECT_EQ(-1, Register("a", "u-1"));
    EXPECT_TRUE(m_log.Has("[ERR] Usb info does not exist for uuid  'FERRIX_DEFAULT_USB_UUID'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get usb info for default task 'USB'"));
    EXPECT_EQ(-1, Register("card", "u-2"));
    EXPECT_TRUE(m_log.Has("[ERR] Usb info does not exist for uuid  'FERRIX_DEFAULT_SD_UUID'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get usb info for default task 'SDCard'"));
}

TEST_F(USBMatcherTest, AFailedReadIsAnErrorForThisDevice) {
    AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("a", "u-1", FRONT_USB);
    DropTable("usb_info_table");
    EXPECT_EQ(-1, Register("a", "u-1"));
    USBInfo usb_info;
    EXPECT_EQ(-1, m_matcher.Match("u-1", usb_info));
    EXPECT_EQ(2, m_log.Count("[ERR] Failed to get usb info for uuid 'u-1'"));
    EXPECT_EQ(-1, m_matcher.Match("", usb_info));
    EXPECT_TRUE(m_log.Has("[ERR] Invalid parameter"));
}

TEST_F(USBMatcherTest, ACandidateWhoseDefaultRowHasGoneIsAFailure) {
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID);
    const uint64_t usb_id = UsbIdOf(task_id);
    PlugIn("a", "u-1", FRONT_USB);
    ASSERT_EQ(0, Register("a", "u-1"));
    ASSERT_EQ(0, TaskDB::GetInstance().RemoveUSBInfo(usb_id));
    USBInfo usb_info;
    EXPECT_EQ(-1, m_matcher.Match("u-1", usb_info));
    EXPECT_TRUE(
        m_log.Has("[ERR] Failed to get usb info for usb id '" + std::to_string(usb_id) + "'"));
}

TEST_F(USBMatcherTest, EnablingTheDefaultTaskTakesEffectWithoutANewMount) {
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID, false);
    PlugIn("a", "u-1", FRONT_USB);
    EXPECT_EQ(0, Register("a", "u-1"));
    USBInfo usb_info;
    EXPECT_EQ(0, m_matcher.Match("u-1", usb_info));
    EXPECT_TRUE(m_log.Has("[WARN] Default task is NOT enable, usb id '" +
                          std::to_string(UsbIdOf(task_id)) + "'"));
    ASSERT_EQ(0, TaskDB::GetInstance().SetTaskEnable(task_id, true));
    EXPECT_EQ(1, m_matcher.Match("u-1", usb_info));
    EXPECT_EQ(DEFAULT_USB_UUID, usb_info.uuid);
}

TEST_F(USBMatcherTest, ADefaultTaskThatCannotBeListedIsNotEnabled) {
    AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("a", "u-1", FRONT_USB);
    ASSERT_EQ(0, Register("a", "u-1"));
    DropTable("task_info_table");
    USBInfo usb_info;
    EXPECT_EQ(0, m_matcher.Match("u-1", usb_info));
    EXPECT_TRUE(m_log.Contains("Default task is NOT enable"));
}

TEST_F(USBMatcherTest, TheMountPathIsThatOfTheFirstUuid) {
    const uint64_t usb_id = UsbIdOf(AddDefaultTask(DEFAULT_USB_UUID));
    PlugIn("a", "zz", FRONT_USB);
    PlugIn("b", "aa", FRONT_USB);
    ASSERT_EQ(0, Register("a", "zz"));
    ASSERT_EQ(0, Register("b", "aa"));
    std::string path;
    EXPECT_EQ(0, m_matcher.GetMountPath(usb_id, path));
    EXPECT_EQ(MountPath("b"), path);
    m_matcher.RemoveByUUID("aa");
    m_matcher.RemoveByUUID("nobody");
    EXPECT_EQ(0, m_matcher.GetMountPath(usb_id, path));
    EXPECT_EQ(MountPath("a"), path);
    EXPECT_EQ(-1, m_matcher.GetMountPath(usb_id + 1, path));
    EXPECT_EQ(MountPath("a"), path);
    EXPECT_TRUE(m_log.Has("[ERR] No mounted usb for usb_id '" + std::to_string(usb_id + 1) + "'"));
}

TEST_F(USBMatcherTest, UnregisteringAPathForgetsEveryCandidateOfIt) {
    const uint64_t usb_id = UsbIdOf(AddDefaultTask(DEFAULT_USB_UUID));
    PlugIn("a", "u-1", FRONT_USB);
    ASSERT_EQ(0, Register("a", "u-1"));
    ASSERT_EQ(0, Register("a", "u-2"));
    m_matcher.UnregisterByPath("/another");
    std::string path;
    EXPECT_EQ(0, m_matcher.GetMountPath(usb_id, path));
    m_matcher.UnregisterByPath(MountPath("a"));
    EXPECT_EQ(-1, m_matcher.GetMountPath(usb_id, path));
    EXPECT_EQ("", Match("u-1"));
    EXPECT_EQ("", Match("u-2"));
}

TEST_F(USBMatcherTest, ALaterCandidateOfAUuidReplacesTheEarlierOne) {
    const uint64_t usb_id = UsbIdOf(AddDefaultTask(DEFAULT_USB_UUID));
    PlugIn("a", "u-1", FRONT_USB);
    PlugIn("b", "u-1", FRONT_USB);
    ASSERT_EQ(0, Register("a", "u-1"));
    ASSERT_EQ(0, Register("b", "u-1"));
    std::string path;
    EXPECT_EQ(0, m_matcher.GetMountPath(usb_id, path));
    EXPECT_EQ(MountPath("b"), path);
    m_matcher.Dump();
    EXPECT_TRUE(m_log.Contains("'u-1'"));
    m_matcher.Clear();
    EXPECT_EQ(-1, m_matcher.GetMountPath(usb_id, path));
}

}  // namespace
