#include <keld/device.h>
#include <keld/error.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <filesystem>

#include "host-fixture.h"
#include "host/block-device.h"
#include "host/eject.h"

namespace {

class Devices : public HostFixture {
protected:
    static int LocationOf(const char* name, const char* port = "") {
        KELDUSBDevInfo info{};
        snprintf(info.name, sizeof(info.name), "%s", name);
        snprintf(info.port, sizeof(info.port), "%s", port);
        return KELDUSBGetLocation(&info);
    }
};

struct NameCase {
    const char* partition;
    const char* disk;
};

constexpr NameCase kNames[] = {
    {"sdb1",         "sdb"         },
    {"sdb",          "sdb"         },
    {"sdb12",        "sdb"         },
    {"sdaa3",        "sdaa"        },
    {"sdp1",         "sdp"         },
    {"vda2",         "vda"         },
    {"mmcblk0p1",    "mmcblk0"     },
    {"mmcblk0",      "mmcblk0"     },
    {"mmcblk10p12",  "mmcblk10"    },
    {"mmcblk0boot0", "mmcblk0boot0"},
    {"nvme0n1p2",    "nvme0n1"     },
    {"nvme0n1",      "nvme0n1"     },
    {"loop0",        "loop0"       },
    {"loop0p1",      "loop0"       },
    {"loop12",       "loop12"      },
    {"md0",          "md0"         },
    {"md127p3",      "md127"       },
    {"nbd4p1",       "nbd4"        },
    {"dm-0",         "dm-0"        },
    {"sr0",          "sr0"         },
    {"zram0",        "zram0"       },
};

}  // namespace

TEST(DiskPartitionNumRemove, GivesTheDiskOfEveryKindOfName) {
    for (const NameCase& row : kNames) {
        char disk[32];
        EXPECT_EQ(0, DiskPartitionNumRemove(row.partition, disk, sizeof(disk))) << row.partition;
        EXPECT_STREQ(row.disk, disk) << row.partition;
    }
}

TEST(DiskPartitionNumRemove, RefusesWhatIsNoName) {
    char disk[32];
    for (const char* name : {"", "1", "123", "/dev/sdb1", "mapper/x"}) {
        EXPECT_GT(0, DiskPartitionNumRemove(name, disk, sizeof(disk))) << name;
    }
    EXPECT_GT(0, DiskPartitionNumRemove(nullptr, disk, sizeof(disk)));
    char small[3];
    EXPECT_GT(0, DiskPartitionNumRemove("sdb1", small, sizeof(small)));
    char exact[4];
    EXPECT_EQ(0, DiskPartitionNumRemove("sdb1", exact, sizeof(exact)));
}

TEST_F(Devices, WithoutConfigurationNoPortIsAFrontPort) {
    EXPECT_EQ(KELD_USB_LOCATION_OTHER, LocationOf("sdb", "1-1"));
    EXPECT_EQ(KELD_USB_LOCATION_OTHER, LocationOf("mmcblk0"));
}

TEST_F(Devices, TheSdSlotIsAskedBeforeTheFrontPorts) {
    Conf("[location]\nfront_usb = *\nsd_slot = mmcblk*\n");
    EXPECT_EQ(98, LocationOf("mmcblk0"));
    EXPECT_EQ(99, LocationOf("sdb", "1-1"));
    EXPECT_EQ(99, LocationOf("loop0"));
}

TEST_F(Devices, AFrontPortIsNamedByKernelNameOrUsbPort) {
    Conf("[location]\nfront_usb = sdc, 1-1.2, 2-[34]\n");
    EXPECT_EQ(99, LocationOf("sdc", "9-9"));
    EXPECT_EQ(99, LocationOf("sdb", "1-1.2"));
    EXPECT_EQ(99, LocationOf("sdb", "2-3"));
    EXPECT_EQ(0, LocationOf("sdb", "1-1.3"));
    EXPECT_EQ(0, LocationOf("sdcc", ""));
    EXPECT_GT(0, LocationOf(""));
    EXPECT_GT(0, KELDUSBGetLocation(nullptr));
}

TEST_F(Devices, WhatIsNoDeviceHasNoInformation) {
    KELDUSBDevInfo info{};
    for (const char* name : {"", "nosuchdisk", "../block/loop0", "/dev/loop0", "."}) {
        EXPECT_GT(0, KELDUSBDevGetInfo(name, &info)) << name;
        EXPECT_GT(0, DiskPartitionsLayoutGet(name, nullptr, 0)) << name;
        EXPECT_GT(0, KELDExtStgPullOut(name, 4)) << name;
    }
    EXPECT_GT(0, KELDUSBDevGetInfo(nullptr, &info));
    EXPECT_GT(0, DiskPartitionsLayoutGet(nullptr, nullptr, 0));
    EXPECT_GT(0, KELDExtStgPullOut(nullptr, 4));
}

TEST(PluggedIn, TheKernelsWordTheGlobsAndTheSystemDiskDecide) {
    keld_host::BlockDevice disk;
    disk.name = "sdb1";
    disk.node = "/dev/sdb1";
    disk.disk = "sdb";
    keld_host::HostConf conf;
    EXPECT_FALSE(IsPluggedIn(disk, conf, {}));
    for (bool keld_host::BlockDevice::*flag :
         {&keld_host::BlockDevice::isRemovable, &keld_host::BlockDevice::isUsb,
          &keld_host::BlockDevice::isMmc}) {
        keld_host::BlockDevice other = disk;
        other.*flag = true;
        EXPECT_TRUE(IsPluggedIn(other, conf, {}));
        EXPECT_FALSE(IsPluggedIn(other, conf, {"sdb"}));
    }
    conf.removableDevices = {"/dev/sdb1"};
    EXPECT_TRUE(IsPluggedIn(disk, conf, {}));
    conf.removableDevices = {"/dev/sdb"};
    EXPECT_TRUE(IsPluggedIn(disk, conf, {}));
    EXPECT_FALSE(IsPluggedIn(disk, conf, {"sdb"}));
    conf.removableDevices = {"sdb*"};
    EXPECT_FALSE(IsPluggedIn(disk, conf, {}));
}

TEST(PluggedIn, TheSystemsOwnFoldersHoldNoUsersDevice) {
    for (const char* folder :
         {"/", "/boot", "/boot/firmware", "/boot/efi", "/usr", "/usr/local", "/home"}) {
        EXPECT_TRUE(keld_host::IsSystemFolder(folder)) << folder;
    }
    for (const char* folder : {"/media/usb", "/mnt", "/run/media/u/STICK", "/home/u/stick",
                               "/bootx", "/volumeUSB1/usbshare", "/tmp/x"}) {
        EXPECT_FALSE(keld_host::IsSystemFolder(folder)) << folder;
    }
}

// A device in a folder that looks like sysfs, under the scratch folder's own file system.
class Presence : public HostFixture {
protected:
    void SetUp() override {
        struct stat info {};
        ASSERT_EQ(0, stat(m_dir.Path().c_str(), &info));
        if (major(info.st_dev) == 0) GTEST_SKIP() << "the scratch folder is on no block device";
        m_node = "sys/devices/disk/part";
        m_dir.MakeDir(m_node);
        m_dir.MakeDir("sys/dev/block");
        m_dir.Write("sys/devices/disk/diskseq", "41\n");
        m_dir.Write(m_node + "/size", "2048\n");
        const std::string link = m_dir / ("sys/dev/block/" + std::to_string(major(info.st_dev)) +
                                          ":" + std::to_string(minor(info.st_dev)));
        ASSERT_EQ(0, symlink((m_dir / m_node).c_str(), link.c_str()));
        keld_host::HostPaths paths;
        paths.sysfs = m_dir / "sys";
        keld_host::SetPaths(paths);
        m_dir.MakeDir("root");
        ASSERT_EQ(0, KELDDevIdentityGet(Root(), m_identity, sizeof(m_identity)));
        ASSERT_EQ(1, KELDDevIsPresent(Root(), m_identity));
    }
    const char* Root() {
        m_root = m_dir / "root";
        return m_root.c_str();
    }

    std::string m_node;
    std::string m_root;
    char m_identity[KELD_DEV_IDENTITY_SIZE] = "";
};

TEST_F(Presence, ADeviceWhoseNodeHasGoneIsGoneThoughItsFolderStillLists) {
    std::filesystem::remove_all(m_dir / m_node);
    EXPECT_EQ(0, KELDDevIsPresent(Root(), m_identity));
    char identity[KELD_DEV_IDENTITY_SIZE];
    EXPECT_GT(0, KELDDevIdentityGet(Root(), identity, sizeof(identity)));
}

TEST_F(Presence, ADriveWhoseMediumWasTakenOutIsGone) {
    m_dir.Write(m_node + "/size", "0\n");
    EXPECT_EQ(0, KELDDevIsPresent(Root(), m_identity));
}

TEST_F(Presence, AnotherDiskUnderTheSameNumberIsAnother) {
    m_dir.Write("sys/devices/disk/diskseq", "42\n");
    EXPECT_EQ(0, KELDDevIsPresent(Root(), m_identity));
    m_dir.Write("sys/devices/disk/diskseq", "41\n");
    EXPECT_EQ(1, KELDDevIsPresent(Root(), m_identity));
}

TEST_F(Presence, APathThatDoesNotAnswerIsGone) {
    ASSERT_EQ(0, rmdir(Root()));
    EXPECT_EQ(0, KELDDevIsPresent(Root(), m_identity));
}

TEST_F(Presence, AFolderOfAnotherFileSystemIsAnother) {
    EXPECT_EQ(0, KELDDevIsPresent("/proc", m_identity));
}

TEST_F(Presence, AFolderBelowTheSameFileSystemIsTheSameDevice) {
    EXPECT_EQ(1, KELDDevIsPresent(m_dir.MakeDir("root/below").c_str(), m_identity));
}

TEST_F(Presence, ABadIdentityCannotBeTold) {
    for (const char* identity : {"", "1 fs=1:2", "x", "2 fs=1:2 block=1:2 sequence=1 node=1"}) {
        EXPECT_GT(0, KELDDevIsPresent(Root(), identity)) << identity;
    }
    EXPECT_GT(0, KELDDevIsPresent(Root(), (std::string(m_identity) + "x").c_str()));
    EXPECT_GT(0, KELDDevIsPresent(nullptr, m_identity));
    EXPECT_GT(0, KELDDevIsPresent(Root(), nullptr));
    char small[8];
    EXPECT_GT(0, KELDDevIdentityGet(Root(), small, sizeof(small)));
}

TEST(PresenceWithoutDevice, AFileSystemInMemoryIsItself) {
    char identity[KELD_DEV_IDENTITY_SIZE];
    ASSERT_EQ(0, KELDDevIdentityGet("/proc", identity, sizeof(identity)));
    EXPECT_EQ(1, KELDDevIsPresent("/proc", identity));
    EXPECT_EQ(0, KELDDevIsPresent("/sys", identity));
}

// Folders that look like those of disks in sysfs.
class PowerOffTest : public HostFixture {
protected:
    std::string Disk(const std::string& name, const std::string& host) const {
        m_dir.Write("usb1/1-1/idVendor", "abcd\n");
        m_dir.Write("usb1/1-1/remove", "");
        m_dir.Write("usb1/1-1/" + host + "/target/delete", "");
        const std::string disk = m_dir.MakeDir("usb1/1-1/" + host + "/target/block/" + name);
        EXPECT_EQ(0, symlink("../..", (disk + "/device").c_str()));
        return disk;
    }
    std::string Read(const std::string& name) const { return ReadWholeFile(m_dir / name); }
};

TEST_F(PowerOffTest, AUsbDiskIsDeletedAndItsPortSwitchedOff) {
    EXPECT_EQ(0, keld_host::PowerOff(Disk("sdb", "host1")));
    EXPECT_EQ("1", Read("usb1/1-1/host1/target/delete"));
    EXPECT_EQ("1", Read("usb1/1-1/remove"));
}

TEST_F(PowerOffTest, APortThatOtherDisksHangOnKeepsItsPower) {
    const std::string disk = Disk("sdb", "host1");
    Disk("sdc", "host2");
    EXPECT_EQ(0, keld_host::PowerOff(disk));
    EXPECT_EQ("1", Read("usb1/1-1/host1/target/delete"));
    EXPECT_EQ("", Read("usb1/1-1/host2/target/delete"));
    EXPECT_EQ("", Read("usb1/1-1/remove"));
}

TEST_F(PowerOffTest, ADiskThatTheKernelCannotSwitchOffIsNoFailure) {
    EXPECT_EQ(0, keld_host::PowerOff(m_dir.MakeDir("virtual/block/loop0")));
}
