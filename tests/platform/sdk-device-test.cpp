#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <keld/keyfile.h>

#include <fstream>
#include <map>
#include <string>
#include <vector>

#include "sdk-wrapper-fixture.h"

using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

namespace {

TEST_F(SdkWrapperTest, TheDevicePathOfAVolumeIsFound) {
    m_fake.AddDevice({.mount_path = "/media/stick", .dev_path = "/dev/sdb1"});
    std::string dev_path;
    EXPECT_EQ(0, SDK::GetDevPath("/media/stick", dev_path));
    EXPECT_EQ("/dev/sdb1", dev_path);
}

TEST_F(SdkWrapperTest, AVolumeWithoutADeviceIsAFailure) {
    std::string dev_path = "before";
    EXPECT_EQ(-1, SDK::GetDevPath("", dev_path));
    EXPECT_EQ(-1, SDK::GetDevPath("/nowhere", dev_path));
    EXPECT_EQ("before", dev_path);
    EXPECT_THAT(m_log.Lines(), ElementsAre("[ERR] path is empty",
                                           "[ERR] KELDVolPathToDevPath: failed to get dev path for "
                                           "'/nowhere', [ret = -1]"));
}

TEST_F(SdkWrapperTest, ADeviceNameIsTakenWithOrWithoutDev) {
    const std::vector<std::pair<std::string, std::string>> cases = {
        {"/dev/sdb1",    "sdb"    },
        {"sdb1",         "sdb"    },
        {"/dev/sdb",     "sdb"    },
        {"/dev/loop0p1", "loop0"  },
        {"/dev/loop0",   "loop0"  },
        {"mmcblk0p1",    "mmcblk0"},
        {"nvme0n1p2",    "nvme0n1"},
    };
    for (const auto& [dev_path, expected] : cases) {
        std::string name;
        EXPECT_EQ(0, SDK::GetKELDDevName(dev_path, name)) << dev_path;
        EXPECT_EQ(expected, name) << dev_path;
    }
}

TEST_F(SdkWrapperTest, ADevicePathWithoutANameIsRefused) {
    std::string name = "before";
    EXPECT_EQ(-1, SDK::GetKELDDevName("", name));
    EXPECT_EQ(-1, SDK::GetKELDDevName("/dev/mapper/x", name));
    EXPECT_EQ(-1, SDK::GetKELDDevName("/dev/" + std::string(64, 'x'), name));
    EXPECT_EQ("before", name);
    EXPECT_TRUE(m_log.Has("[ERR] dev_path is empty"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove disk partition number for '/dev/mapper/x'"));
}

TEST_F(SdkWrapperTest, FrontPortsAreTheUsbPortAndTheSdSlot) {
    m_fake.AddDevice({.mount_path = "/media/a", .dev_path = "/dev/sda1", .location = 99});
    m_fake.AddDevice({.mount_path = "/media/b", .dev_path = "/dev/mmcblk0p1", .location = 98});
    m_fake.AddDevice({.mount_path = "/media/c", .dev_path = "/dev/sdc1", .location = 0});
    bool is_usb_dev = false;
    EXPECT_TRUE(SDK::IsFrontPortDevice("sda", is_usb_dev));
    EXPECT_TRUE(is_usb_dev);
    EXPECT_TRUE(SDK::IsFrontPortDevice("mmcblk0", is_usb_dev));
    EXPECT_FALSE(is_usb_dev);
    EXPECT_FALSE(SDK::IsFrontPortDevice("sdc", is_usb_dev));
    m_fake.FailCall("KELDUSBGetLocation");
    EXPECT_FALSE(SDK::IsFrontPortDevice("sda", is_usb_dev));
    EXPECT_THAT(m_log.Lines(), IsEmpty());
    EXPECT_FALSE(SDK::IsFrontPortDevice("", is_usb_dev));
    EXPECT_FALSE(SDK::IsFrontPortDevice("sdx", is_usb_dev));
    EXPECT_THAT(m_log.Lines(),
                ElementsAre("[ERR] keld_dev_name is empty",
                            "[ERR] Fail to get USB dev info for keld dev name 'sdx', "
                            "keld_err = '1536'"));
}

TEST_F(SdkWrapperTest, PartitionsAreCounted) {
    m_fake.AddDevice({.mount_path = "/media/a", .dev_path = "/dev/sda1", .partitions = 3});
    EXPECT_EQ(3, SDK::GetPartitionCount("sda"));
    EXPECT_EQ(-1, SDK::GetPartitionCount(""));
    EXPECT_EQ(-1, SDK::GetPartitionCount("sdx"));
    EXPECT_THAT(m_log.Lines(), ElementsAre("[ERR] keld_dev_name is empty",
                                           "[ERR] Fail to get disk partion layout of [sdx]"));
}

TEST_F(SdkWrapperTest, MountedVolumesAreAMapFromMountPathToDevicePath) {
    m_fake.AddDevice({.mount_path = "/media/b", .dev_path = "/dev/sdb1"});
    m_fake.AddDevice({.mount_path = "/media/a", .dev_path = "/dev/sda1"});
    m_fake.AddDevice({.mount_path = "/media/c", .dev_path = "/dev/sdc1", .mounted = false});
    std::map<std::string, std::string> volumes = {
        {"old", "one"}
    };
    EXPECT_EQ(0, SDK::GetMountedVolumes(volumes));
    EXPECT_THAT(volumes, ElementsAre(Pair("/media/a", "/dev/sda1"), Pair("/media/b", "/dev/sdb1")));
    EXPECT_THAT(m_fake.CallsOf("KELDMountVolAllEnum")[0], ElementsAre("0", "4"));
    EXPECT_EQ(1, m_fake.CallCount("KELDMountVolInfoFree"));
}

TEST_F(SdkWrapperTest, NoMountedVolumeIsNoFailureButAnErrorIs) {
    std::map<std::string, std::string> volumes;
    EXPECT_EQ(0, SDK::GetMountedVolumes(volumes));
    EXPECT_THAT(volumes, IsEmpty());
    volumes["old"] = "one";
    m_fake.FailCall("KELDMountVolAllEnum", KELDERR_IO);
    EXPECT_EQ(-1, SDK::GetMountedVolumes(volumes));
    EXPECT_THAT(volumes, IsEmpty());
}

TEST_F(SdkWrapperTest, ADeviceIsPresentUntilItIsPulledOrAnotherIsThere) {
    m_fake.AddDevice({.mount_path = "/media/a", .dev_path = "/dev/sda1"});
    std::string identity;
    ASSERT_EQ(0, SDK::GetDeviceIdentity("/media/a", identity));
    EXPECT_FALSE(identity.empty());
    EXPECT_TRUE(SDK::IsDevicePresent("/media/a", identity));
    EXPECT_FALSE(SDK::IsDevicePresent("/media/a", "another"));
    EXPECT_FALSE(SDK::IsDevicePresent("/media/a", ""));
    m_fake.FailCall("KELDDevIsPresent");
    EXPECT_FALSE(SDK::IsDevicePresent("/media/a", identity));
    m_fake.Pull("/media/a");
    EXPECT_FALSE(SDK::IsDevicePresent("/media/a", identity));
    std::string none = "before";
    EXPECT_EQ(-1, SDK::GetDeviceIdentity("/media/a", none));
    EXPECT_EQ("before", none);
}

TEST_F(SdkWrapperTest, EjectPassesTheDiskAndItsResult) {
    EXPECT_EQ(0, SDK::EjectDevice("sda"));
    EXPECT_THAT(m_fake.CallsOf("KELDExtStgPullOut")[0], ElementsAre("sda", "4"));
    m_fake.FailCall("KELDExtStgPullOut");
    EXPECT_EQ(-1, SDK::EjectDevice("sda"));
}

class GetUUIDTest : public SdkWrapperTest {
protected:
    // A small file system in a file: the prober reads it like a device.
    std::string MakeFileSystem(const std::string& uuid) {
        const std::string path = m_dir / "image";
        std::ofstream(path).close();
        EXPECT_EQ(0, truncate(path.c_str(), 1 << 20));
        const std::string command =
            "mke2fs -q -t ext4 -O ^has_journal -U " + uuid + " " + path + " >/dev/null 2>&1";
        EXPECT_EQ(0, system(command.c_str()));
        return path;
    }
    std::string MakeEmptyDevice() { return m_dir.Write("image", std::string(1 << 16, '\0')); }
    void WriteKeyFile(const std::string& uuid) {
        m_dir.MakeDir("usb/@eaDir");
        const std::string file = m_dir / "usb/@eaDir/.KeldoranFerrix.config";
        ASSERT_EQ(0,
                  KLIBCFileSetKeyValue(file.c_str(), "uuid", uuid.c_str(), KELD_KEY_VALUE_FORMAT));
    }
};

TEST_F(GetUUIDTest, IsThatOfTheFileSystemInLowerCase) {
    const std::string image = MakeFileSystem("3E6BE9DE-8139-11D1-9106-A43F08D823A6");
    WriteKeyFile("not-this");
    std::string uuid;
    ASSERT_EQ(0, SDK::GetUUID(m_dir / "usb", image, uuid));
    EXPECT_EQ("3e6be9de-8139-11d1-9106-a43f08d823a6", uuid);
    EXPECT_TRUE(
        m_log.Has("[DBG] blk_uuid = 3e6be9de-8139-11d1-9106-a43f08d823a6, uuid = "
                  "3e6be9de-8139-11d1-9106-a43f08d823a6"));
}

TEST_F(GetUUIDTest, IsThatOfTheKeyFileInLowerCaseWhenTheFileSystemHasNone) {
    const std::string device = MakeEmptyDevice();
    WriteKeyFile("KEY-FILE-Uuid-01");
    std::string uuid;
    ASSERT_EQ(0, SDK::GetUUID(m_dir / "usb", device, uuid));
    EXPECT_EQ("key-file-uuid-01", uuid);
}

TEST_F(GetUUIDTest, FailsWhenThereIsNeither) {
    const std::string device = MakeEmptyDevice();
    std::string uuid = "before";
    EXPECT_EQ(-1, SDK::GetUUID(m_dir / "usb", device, uuid));
    EXPECT_EQ("before", uuid);
    EXPECT_TRUE(
        m_log.Has("[ERR] GetUUID: Failed to read uuid from ferrix copy config " + (m_dir / "usb")));
}

TEST_F(GetUUIDTest, FailsForAnEmptyKey) {
    const std::string device = MakeEmptyDevice();
    WriteKeyFile("");
    std::string uuid;
    EXPECT_EQ(-1, SDK::GetUUID(m_dir / "usb", device, uuid));
}

TEST_F(GetUUIDTest, FailsForADeviceThatCannotBeOpened) {
    std::string uuid;
    EXPECT_EQ(-1, SDK::GetUUID(m_dir / "usb", m_dir / "nothing", uuid));
    EXPECT_TRUE(m_log.Has("[ERR] GetUUID: failed to open device: " + (m_dir / "nothing") +
                          ", No such file or directory"));
}

TEST_F(GetUUIDTest, FailsForEmptyPaths) {
    std::string uuid;
    EXPECT_EQ(-1, SDK::GetUUID("", "/dev/sdb1", uuid));
    EXPECT_EQ(-1, SDK::GetUUID("/media/a", "", uuid));
    EXPECT_EQ(2, m_log.Count("[ERR] usb_share_path or dev_path is empty"));
}

}  // namespace
