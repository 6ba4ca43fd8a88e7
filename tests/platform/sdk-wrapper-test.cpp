#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <keld/keyfile.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdlib>
#include <fstream>
#include <thread>

#include "fake/fake-keld.h"
#include "platform/keld-sdk-wrapper.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/file-op.h"
#include "utils/per-device-value.h"

using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

namespace {

class SdkWrapperTest : public testing::Test {
protected:
    FakeKeld& m_fake = FakeKeld::Reset();
    LogCapture m_log;
    TempDir m_dir;
};

// --- The lock

// Another thread that wants the lock.
class OtherThread {
public:
    explicit OtherThread(SDK::ReentrantMutex& mutex)
        : m_thread([this, &mutex] {
              m_is_there = true;
              const SDK::ReentrantLock lock(mutex);
              m_has_entered = true;
          }) {}
    // Nothing shows from outside that it waits, so it is given time to come in where it could.
    bool HasEntered() {
        while (!m_is_there) std::this_thread::yield();
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
        return m_has_entered;
    }
    bool EntersAtLast() {
        m_thread.join();
        return m_has_entered;
    }

private:
    std::atomic<bool> m_is_there = false;
    std::atomic<bool> m_has_entered = false;
    std::thread m_thread;  // the last member: it uses the others
};

TEST_F(SdkWrapperTest, LockAndUnlockNestOnOneThread) {
    SDK::ReentrantMutex mutex;
    mutex.Lock();
    mutex.Lock();
    mutex.Unlock();
    OtherThread other(mutex);
    EXPECT_FALSE(other.HasEntered()) << "one of two locks is still held";
    mutex.Unlock();
    EXPECT_TRUE(other.EntersAtLast());
}

TEST_F(SdkWrapperTest, UnlockByAThreadThatDoesNotHoldTheLockChangesNothing) {
    SDK::ReentrantMutex mutex;
    mutex.Unlock();
    mutex.Lock();
    std::thread([&] { mutex.Unlock(); }).join();
    OtherThread other(mutex);
    EXPECT_FALSE(other.HasEntered());
    mutex.Unlock();
    EXPECT_TRUE(other.EntersAtLast());
}

TEST_F(SdkWrapperTest, OneThreadAtATimeIsInsideThePlatform) {
    std::atomic<int> inside = 0;
    std::atomic<int> most = 0;
    const auto action = [&] {
        const int now = ++inside;
        if (now > most) most = now;
        std::this_thread::yield();
        --inside;
    };
    for (const char* call : {"KLIBScemdNotify", "KELDShareGet", "KLIBCFileGetKeyValue",
                             "KLIBCFileSetKeyValue", "KELDEARemove"}) {
        m_fake.OnCall(call, action);
    }
    m_fake.AddShare({.name = "photos", .path = "/volume1/photos"});
    const auto work = [&](const std::string& name) {
        const std::string device = m_dir.MakeDir(name);
        m_dir.MakeDir(name + "/@eaDir");
        for (int i = 0; i < 300; ++i) {
            SDK::Share share;
            EXPECT_EQ(0, share.Open("photos"));
            EXPECT_EQ(0, SDK::NotifyLed(64));
            std::string value;
            EXPECT_TRUE(SetPerDeviceValue(device, "uuid", "u"));
            EXPECT_TRUE(GetPerDeviceValue(device, "uuid", value));
            EXPECT_EQ(0, FSRemove(m_dir.Write(name + "/file", "")));
        }
    };
    std::thread first(work, "first");
    std::thread second(work, "second");
    first.join();
    second.join();
    EXPECT_EQ(1, most);
}

// --- Shares

TEST_F(SdkWrapperTest, AShareIsOpenedByItsName) {
    m_fake.AddShare({.name = "photos", .path = "/volume1/photos"});
    SDK::Share share;
    EXPECT_FALSE(share.IsValid());
    ASSERT_EQ(0, share.Open("photos"));
    EXPECT_TRUE(share.IsValid());
    EXPECT_EQ("/volume1/photos", share.GetPath());
    EXPECT_EQ("/volume1", share.GetVolumePath());
}

TEST_F(SdkWrapperTest, AnUnknownShareClosesTheObjectAndIsLogged) {
    m_fake.AddShare({.name = "photos", .path = "/volume1/photos"});
    SDK::Share share;
    ASSERT_EQ(0, share.Open("photos"));
    EXPECT_EQ(-1, share.Open("nobody"));
    EXPECT_FALSE(share.IsValid());
    EXPECT_EQ("", share.GetPath());
    EXPECT_TRUE(m_log.Has("[ERR] KELDShareGet(nobody): -1, Error code 1536"));
}

TEST_F(SdkWrapperTest, EveryShareRecordIsFreedOnce) {
    m_fake.AddShare({.name = "photos", .path = "/volume1/photos"});
    {
        SDK::Share share;
        ASSERT_EQ(0, share.Open("photos"));
        ASSERT_EQ(0, share.Open("photos"));
        SDK::Share moved = std::move(share);
        EXPECT_TRUE(moved.IsValid());
    }
    EXPECT_EQ(2, m_fake.CallCount("KELDShareGet"));
    EXPECT_EQ(2, m_fake.CallCount("KELDShareFree"));
}

TEST_F(SdkWrapperTest, AClosedShareCountsAsMountedAndHasNothingElse) {
    const SDK::Share share;
    EXPECT_TRUE(share.IsMounted());
    EXPECT_FALSE(share.IsRecycleBinEnabled());
    EXPECT_FALSE(share.IsRecycleBinAdminOnly());
    EXPECT_FALSE(share.IsEncrypted());
    EXPECT_FALSE(share.IsOnUSBVolume());
    EXPECT_FALSE(share.IsReadOnlyReplica());
    EXPECT_EQ(-1, share.GetUserRight("ann"));
    EXPECT_EQ("", share.GetVolumePath());
    EXPECT_THAT(m_log.Lines(), IsEmpty());
}

TEST_F(SdkWrapperTest, ShareStatusesAreThoseOfThePlatform) {
    m_fake.AddShare({.name = "a",
                     .path = "/volume1/a",
                     .recycle_bin = true,
                     .recycle_bin_admin_only = true,
                     .locked = true,
                     .lockable = true,
                     .read_only_by_replica = true,
                     .rights = {{"ann", 2}}});
    m_fake.AddShare({.name = "b", .path = "/volumeUSB1/b"});
    SDK::Share a;
    SDK::Share b;
    ASSERT_EQ(0, a.Open("a"));
    ASSERT_EQ(0, b.Open("b"));
    EXPECT_TRUE(a.IsRecycleBinEnabled());
    EXPECT_FALSE(b.IsRecycleBinEnabled());
    EXPECT_TRUE(a.IsRecycleBinAdminOnly());
    EXPECT_FALSE(b.IsRecycleBinAdminOnly());
    EXPECT_FALSE(a.IsMounted());
    EXPECT_TRUE(b.IsMounted());
    EXPECT_TRUE(a.IsEncrypted());
    EXPECT_FALSE(b.IsEncrypted());
    EXPECT_TRUE(a.IsReadOnlyReplica());
    EXPECT_FALSE(b.IsReadOnlyReplica());
    EXPECT_THAT(m_fake.CallsOf("KELDShareAttrReadOnlyIsRegBy")[0],
                ElementsAre("a", "dhub", "share_replica_demote"));
    EXPECT_FALSE(a.IsOnUSBVolume());
    EXPECT_TRUE(b.IsOnUSBVolume());
    EXPECT_EQ(2, a.GetUserRight("ann"));
    EXPECT_EQ(-1, a.GetUserRight("bob"));
}

TEST_F(SdkWrapperTest, AStatusThatCannotBeReadIsLoggedAndIsNo) {
    m_fake.AddShare({.name = "a",
                     .path = "/volume1/a",
                     .recycle_bin = true,
                     .recycle_bin_admin_only = true,
                     .lockable = true});
    SDK::Share share;
    ASSERT_EQ(0, share.Open("a"));
    for (const char* call : {"KLIBShareRecycleStatusGet", "KLIBShareRecycleAdminOnlyStatusGet",
                             "KLIBShareIsEncryptedGet", "KLIBShareIsEncryptionGet",
                             "KELDShareAttrReadOnlyIsRegBy", "VolumePathParseEx"}) {
        m_fake.FailCall(call, KELDERR_SYSTEM);
    }
    EXPECT_FALSE(share.IsRecycleBinEnabled());
    EXPECT_FALSE(share.IsRecycleBinAdminOnly());
    EXPECT_FALSE(share.IsMounted());
    EXPECT_FALSE(share.IsEncrypted());
    EXPECT_FALSE(share.IsReadOnlyReplica());
    EXPECT_EQ("", share.GetVolumePath());
    EXPECT_THAT(m_log.Lines(),
                ElementsAre("[ERR] Failed to get share recycle bin status",
                            "[ERR] Failed to get share recycle bin admin only status",
                            "[ERR] Failed to get share mount status",
                            "[ERR] Failed to get share encryption status",
                            "[ERR] KELDShareAttrReadOnlyIsRegBy(a): Error code 32768",
                            "[ERR] VolumePathParseEx(/volume1/a): Error code 32768"));
}

TEST_F(SdkWrapperTest, APathLeadsToItsShareAndBin) {
    m_fake.AddShare({.name = "photos", .path = "/volume1/photos"});
    m_fake.AddShare({.name = "photos2", .path = "/volume1/photos2"});
    std::string name;
    std::string path;
    ASSERT_EQ(0, SDK::GetShareNameByPath("/volume1/photos2/a/b", name, path));
    EXPECT_EQ("photos2", name);
    EXPECT_EQ("/volume1/photos2", path);
    EXPECT_EQ("/volume1/photos2/#recycle", SDK::GetShareBinPath("/volume1/photos2/a/b"));
}

TEST_F(SdkWrapperTest, APathOutsideEveryShareLeavesTheOutsAlone) {
    std::string name = "before";
    std::string path = "too";
    EXPECT_EQ(-1, SDK::GetShareNameByPath("/etc/passwd", name, path));
    EXPECT_EQ("before", name);
    EXPECT_EQ("too", path);
    EXPECT_EQ("", SDK::GetShareBinPath("/etc/passwd"));
    EXPECT_THAT(m_log.Lines(), ElementsAre("[ERR] KELDShareNamePathGet failed '/etc/passwd'",
                                           "[ERR] KELDShareBinPathGet(/etc/passwd): Error code "
                                           "1536"));
}

TEST_F(SdkWrapperTest, ABinPathLongerThanItsBufferIsAFailure) {
    m_fake.AddShare({.name = "deep", .path = "/volume1/" + std::string(300, 'x')});
    EXPECT_EQ("", SDK::GetShareBinPath("/volume1/" + std::string(300, 'x')));
}

TEST_F(SdkWrapperTest, SharesAreListedByKind) {
    m_fake.AddShare({.name = "photos", .path = "/volume1/photos"});
    m_fake.AddShare({.name = "music", .path = "/volume1/music"});
    m_fake.AddDevice({.mount_path = "/media/stick", .dev_path = "/dev/sdb1"});
    std::vector<std::string> names = {"old"};
    EXPECT_EQ(0, SDK::ListShares(1, names));
    EXPECT_THAT(names, ElementsAre("music", "photos"));
    EXPECT_EQ(0, SDK::ListShares(3, names));
    EXPECT_THAT(names, ElementsAre("music", "photos", "stick"));
    m_fake.FailCall("KELDShareDBEnumTypeMatched");
    EXPECT_EQ(-1, SDK::ListShares(3, names));
    EXPECT_THAT(names, IsEmpty());
}

// --- Devices

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

// --- The uuid of a device

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

// --- The system

TEST_F(SdkWrapperTest, TheLastErrorIsThatOfThisThread) {
    EXPECT_EQ(0, SDK::GetLastError().code);
    m_fake.FailCall("KLIBScemdNotify", KELDERR_IO);
    EXPECT_GT(0, SDK::NotifyLed(64));
    const SDK::PlatformError error = SDK::GetLastError();
    EXPECT_EQ(KELDERR_IO, error.code);
    EXPECT_EQ("fake.c", error.file);
    EXPECT_LT(0, error.line);
}

TEST_F(SdkWrapperTest, TheIndexerIsAskedAndItsAnswerIgnored) {
    EXPECT_EQ(0, SDK::AddToIndex("/volume1/photos/new"));
    EXPECT_THAT(m_fake.CallsOf("KLIBKeldIndexAddEx")[0],
                ElementsAre("/volume1/photos/new", "0", "3", "0", "0"));
    m_fake.FailCall("KLIBKeldIndexAddEx");
    EXPECT_EQ(0, SDK::AddToIndex("/volume1/photos/new"));
}

TEST_F(SdkWrapperTest, IndicatorsAreToldTheirCodes) {
    EXPECT_EQ(0, SDK::NotifyLed(66));
    SDK::HardwareControl(0x5302);
    EXPECT_THAT(m_fake.LedCodes(), ElementsAre(66));
    EXPECT_THAT(m_fake.CallsOf("KELDHWExternalControl")[0], ElementsAre("21250", "0", "0"));
}

TEST_F(SdkWrapperTest, CapabilitiesAreThoseOfTheModel) {
    m_fake.SetCapability("ferrix");
    EXPECT_TRUE(SDK::HasCapability("ferrix"));
    EXPECT_FALSE(SDK::HasCapability("sdferrix"));
}

TEST_F(SdkWrapperTest, AProgramIsRunWithItsTwoArguments) {
    m_fake.SetProgramResult("/bin/eject-it", 3);
    EXPECT_EQ(3, SDK::RunProgram("/bin/eject-it", "eject", "sda"));
    EXPECT_THAT(m_fake.Programs(), ElementsAre(ElementsAre("/bin/eject-it", "eject", "sda")));
    m_fake.FailCall("KLIBCExec");
    EXPECT_EQ(-1, SDK::RunProgram("/bin/eject-it", "eject", "sda"));
}

TEST_F(SdkWrapperTest, MountPointsAreToldFromFolders) {
    m_fake.AddDevice({.mount_path = "/media/a", .dev_path = "/dev/sda1"});
    EXPECT_TRUE(SDK::HasMountPoint("/media/a"));
    EXPECT_FALSE(SDK::HasMountPoint("/media/a/folder"));
    m_fake.FailCall("KELDFSHasMountPoint");
    EXPECT_FALSE(SDK::HasMountPoint("/media/a"));
    EXPECT_TRUE(m_log.Contains("KELDFSHasMountPoint(/media/a)"));
}

TEST_F(SdkWrapperTest, ADisplayPathIsResolvedToItsShare) {
    m_fake.AddShare({.name = "photos", .path = "/volume1/photos"});
    std::string path;
    EXPECT_EQ(0, SDK::ResolvePath("/photos/2024/a", path));
    EXPECT_EQ("/volume1/photos/2024/a", path);
    EXPECT_EQ(-1, SDK::ResolvePath("/nobody/a", path));
    EXPECT_EQ("/volume1/photos/2024/a", path);
}

TEST_F(SdkWrapperTest, HomesAreResolvedOnlyWhileTheyAreEnabled) {
    m_fake.AddShare({.name = "homes", .path = "/volume1/homes"});
    m_fake.AddShare({.name = "homeseek", .path = "/volume1/homeseek"});
    std::string path;
    EXPECT_EQ(-1, SDK::ResolvePath("/homes/ann", path));
    EXPECT_EQ(-1, SDK::ResolvePath("/homes", path));
    EXPECT_EQ(0, SDK::ResolvePath("/homeseek/a", path));
    m_fake.SetService("home", true);
    EXPECT_EQ(0, SDK::ResolvePath("/homes/ann", path));
    EXPECT_EQ("/volume1/homes/ann", path);
}

TEST_F(SdkWrapperTest, NewUuidsAreTextsInLowerCaseAndDiffer) {
    const std::string uuid = SDK::NewUUID();
    EXPECT_EQ(36u, uuid.size());
    EXPECT_EQ(std::string::npos, uuid.find_first_not_of("0123456789abcdef-"));
    EXPECT_NE(uuid, SDK::NewUUID());
}

TEST_F(SdkWrapperTest, ASchedulerEntryIsRemovedByItsId) {
    const int id = m_fake.AddSchedEntry({.name = "nightly"});
    EXPECT_GT(0, SDK::RemoveSchedEntry(id + 1));
    EXPECT_EQ(0, SDK::RemoveSchedEntry(id));
    EXPECT_THAT(m_fake.SchedEntries(), IsEmpty());
    m_fake.ForgetCalls();
    for (const int64_t none : {int64_t{0}, int64_t{-1}, (int64_t{1} << 32) + id}) {
        EXPECT_GT(0, SDK::RemoveSchedEntry(none));
    }
    EXPECT_THAT(m_fake.Calls(), IsEmpty());
}

// --- Users

TEST_F(SdkWrapperTest, AUserIsOpenedByNameAndByNumber) {
    m_fake.AddUser({.name = "ann", .uid = 1026, .gid = 100, .home = "/homes/ann"});
    m_fake.AddUser({.name = "old", .uid = 1027, .gid = 100, .home = "/homes/old", .expired = true});
    SDK::User user;
    EXPECT_TRUE(user.IsExpired());
    ASSERT_EQ(0, user.Open("ann"));
    EXPECT_EQ(1026u, user.GetUID());
    EXPECT_EQ(100u, user.GetGID());
    EXPECT_EQ("/homes/ann", user.GetHomePath());
    EXPECT_FALSE(user.IsExpired());
    ASSERT_EQ(0, user.OpenByUID(1027));
    EXPECT_EQ("old", user.GetName());
    EXPECT_TRUE(user.IsExpired());
    EXPECT_EQ(-1, user.OpenByUID(7));
    EXPECT_FALSE(user.IsValid());
    EXPECT_EQ("", user.GetName());
    EXPECT_EQ(-1, user.Open("nobody"));
    EXPECT_EQ(2, m_fake.CallCount("KELDUserFree"));
    EXPECT_TRUE(m_log.Has("[ERR] KELDUserGet(nobody): -1, Error code 1536"));
}

TEST_F(SdkWrapperTest, AnExpiryThatCannotBeToldCountsAsExpired) {
    m_fake.AddUser({.name = "ann", .uid = 1026});
    SDK::User user;
    ASSERT_EQ(0, user.Open("ann"));
    m_fake.FailCall("KELDUserCheckExpired");
    EXPECT_TRUE(user.IsExpired());
}

TEST_F(SdkWrapperTest, LoginNamesAndHomesAreLookedUp) {
    m_fake.AddUser({.name = "ann", .uid = 1026, .home = "/homes/ann"});
    std::string name;
    EXPECT_EQ(0, SDK::ConvertLoginName("ANN", name));
    EXPECT_EQ("ann", name);
    EXPECT_EQ(-1, SDK::ConvertLoginName("bob", name));
    EXPECT_EQ("ann", name);
    EXPECT_EQ("/homes/ann", SDK::GetHomePath("ann"));
    EXPECT_EQ("", SDK::GetHomePath("bob"));
}

TEST_F(SdkWrapperTest, GroupsHaveNamesAndMembers) {
    m_fake.AddGroup("family", 101, {"ann", "bob"});
    m_fake.AddUser({.name = "ann", .uid = 1026, .admin = true});
    m_fake.AddUser({.name = "bob", .uid = 1027});
    EXPECT_EQ("family", SDK::GetGroupName(101));
    EXPECT_EQ("", SDK::GetGroupName(7));
    std::vector<std::string> members;
    EXPECT_EQ(0, SDK::ListGroupMembers("family", members));
    EXPECT_THAT(members, ElementsAre("ann", "bob"));
    EXPECT_EQ(-1, SDK::ListGroupMembers("nobody", members));
    EXPECT_THAT(members, IsEmpty());
    EXPECT_TRUE(SDK::IsAdmin(1026));
    EXPECT_FALSE(SDK::IsAdmin(1027));
    EXPECT_FALSE(SDK::IsAdmin(7));
}

TEST_F(SdkWrapperTest, ServicesAreOnOrOff) {
    EXPECT_FALSE(SDK::IsLDAPBound());
    EXPECT_FALSE(SDK::IsWindowsDomainJoined());
    EXPECT_FALSE(SDK::IsUserHomeEnabled());
    EXPECT_FALSE(SDK::IsServiceEnabled("ssh"));
    for (const char* name : {"ldap", "windows", "home", "ssh"}) m_fake.SetService(name, true);
    EXPECT_TRUE(SDK::IsLDAPBound());
    EXPECT_TRUE(SDK::IsWindowsDomainJoined());
    EXPECT_TRUE(SDK::IsUserHomeEnabled());
    EXPECT_TRUE(SDK::IsServiceEnabled("ssh"));
    m_fake.FailCall("KELDLDAPIsBinded");
    EXPECT_FALSE(SDK::IsLDAPBound());
    EXPECT_TRUE(m_log.Contains("KELDLDAPIsBinded"));
}

TEST_F(SdkWrapperTest, TheHomeRecycleBinIsAKeyOfTheSystemsSettings) {
    (void)SDK::IsHomeRecycleBinEnabled();
    EXPECT_THAT(m_fake.CallsOf("KLIBCFileCheckKeyValue")[0],
                ElementsAre("/etc/keldinfo.conf", "enable_homeshare_recyclebin", "yes"));
    m_fake.FailCall("KLIBCFileCheckKeyValue");
    EXPECT_FALSE(SDK::IsHomeRecycleBinEnabled());
}

// --- File systems and access control

TEST_F(SdkWrapperTest, AFileSystemIsFoundByAPathOnIt) {
    m_fake.AddDevice({.mount_path = "/media/a", .dev_path = "/dev/no-such-device"});
    SDK::FileSystem file_system;
    SDK::Quota quota;
    EXPECT_EQ(-1, file_system.GetUserQuota(0, quota));
    ASSERT_EQ(0, file_system.Open("/media/a/folder"));
    EXPECT_EQ("/media/a", file_system.GetMountPath());
    EXPECT_EQ("/dev/no-such-device", file_system.GetDevPath());
    EXPECT_EQ(-1, file_system.GetUserQuota(0, quota));
    EXPECT_TRUE(m_log.Contains("quotactl(/dev/no-such-device)"));
    EXPECT_EQ(-1, file_system.Open("/elsewhere"));
    EXPECT_FALSE(file_system.IsValid());
    EXPECT_EQ(1, m_fake.CallCount("FSInfoFree"));
}

TEST_F(SdkWrapperTest, AnAccessControlListIsReadAsItWasWritten) {
    m_fake.SetAclSupported(true);
    EXPECT_TRUE(SDK::IsAclSupported("/volume1/a"));
    ASSERT_EQ(
        0, SDK::WriteAcl("/volume1/a", {
                                           {4, 0, 0x1FFF, 6, true,  0x65},
                                           {8, 7, 1,      2, false, 3   }
    }));
    std::vector<SDK::AclEntry> entries;
    ASSERT_EQ(0, SDK::ReadAcl("/volume1/a", entries));
    ASSERT_EQ(2u, entries.size());
    EXPECT_EQ(4, entries[0].tag);
    EXPECT_EQ(0x1FFFu, entries[0].permission);
    EXPECT_TRUE(entries[0].allow);
    EXPECT_EQ(7u, entries[1].id);
    EXPECT_EQ(2, entries[1].inherit);
    EXPECT_FALSE(entries[1].allow);
    EXPECT_EQ(3, entries[1].level);
    for (const char* call : {"KELDACLGet", "KELDACLSet"}) m_fake.FailCall(call);
    EXPECT_EQ(-1, SDK::ReadAcl("/volume1/a", entries));
    EXPECT_THAT(entries, IsEmpty());
    EXPECT_EQ(-1, SDK::WriteAcl("/volume1/a", {}));
    m_fake.FailCall("KELDACLAlloc");
    EXPECT_EQ(-1, SDK::WriteAcl("/volume1/a", {}));
}

// --- Recycle bins

class CreateRecycleBinTest : public SdkWrapperTest {
protected:
    void SetUp() override {
        if (geteuid() != 0) GTEST_SKIP() << "giving a folder to root needs root";
    }
    static mode_t ModeOf(const std::string& path) {
        struct stat info = {};
        EXPECT_EQ(0, stat(path.c_str(), &info)) << path;
        return info.st_mode & 07777;
    }
    const std::string m_bin = m_dir / "#recycle";
};

TEST_F(CreateRecycleBinTest, MakesTheFolderItsRightsAndTheIconFile) {
    ASSERT_EQ(0, SDK::CreateRecycleBin(m_bin, false));
    EXPECT_EQ(0777u, ModeOf(m_bin));
    EXPECT_EQ(0666u, ModeOf(m_bin + "/desktop.ini"));
    EXPECT_EQ("[.ShellClassInfo]\nIconFile=%SystemRoot%\\system32\\SHELL32.dll\nIconIndex=32\n",
              ReadWholeFile(m_bin + "/desktop.ini"));
    EXPECT_THAT(m_fake.ArchiveBits(),
                ElementsAre(Pair(m_bin, 0x204), Pair(m_bin + "/desktop.ini", 0x203)));
}

TEST_F(CreateRecycleBinTest, KeepsOthersOutOfABinForAdministrators) {
    ASSERT_EQ(0, SDK::CreateRecycleBin(m_bin, true));
    EXPECT_EQ(0700u, ModeOf(m_bin));
}

TEST_F(CreateRecycleBinTest, UsesOneAccessControlEntryWhereThereAreSuch) {
    m_fake.SetAclSupported(true);
    for (const bool admin_only : {true, false}) {
        const std::string bin = m_bin + (admin_only ? "1" : "2");
        ASSERT_EQ(0, SDK::CreateRecycleBin(bin, admin_only));
        const auto entries = m_fake.Acl(bin);
        ASSERT_EQ(1u, entries.size());
        EXPECT_EQ(admin_only ? 4 : 8, entries[0].tag);
        EXPECT_EQ(0u, entries[0].id);
        EXPECT_EQ(0x1FFFu, entries[0].permission);
        EXPECT_EQ(6, entries[0].inherit);
        EXPECT_EQ(1, entries[0].allow);
        EXPECT_EQ(0x65, entries[0].level);
    }
}

TEST_F(CreateRecycleBinTest, LeavesAnExistingPathAlone) {
    ASSERT_EQ(0, mkdir(m_bin.c_str(), 0711));
    EXPECT_EQ(0, SDK::CreateRecycleBin(m_bin, false));
    EXPECT_EQ(0711u, ModeOf(m_bin));
    EXPECT_THAT(m_fake.Calls(), IsEmpty());
}

TEST_F(CreateRecycleBinTest, FailsStepByStepWithALineEach) {
    m_dir.Write("file", "");
    EXPECT_EQ(-1, SDK::CreateRecycleBin(m_dir / "file/bin", false));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to stat '" + (m_dir / "file/bin") + "' (20)"));
    EXPECT_EQ(-1, SDK::CreateRecycleBin(m_dir / "missing/bin", false));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to mkdir '" + (m_dir / "missing/bin") + "' (2)"));
    m_fake.FailCall("KELDArchiveBit");
    EXPECT_EQ(-1, SDK::CreateRecycleBin(m_bin + "1", false));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to KELDArchiveBit '" + m_bin + "1'"));
    m_fake.FailCall("KELDArchiveBit", KELDERR_SYSTEM, 1, 1);
    EXPECT_EQ(-1, SDK::CreateRecycleBin(m_bin + "2", false));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to KELDArchiveBit '" + m_bin + "2/desktop.ini'"));
    m_fake.SetAclSupported(true);
    m_fake.FailCall("KELDACLSet");
    EXPECT_EQ(-1, SDK::CreateRecycleBin(m_bin + "3", false));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to SetRecycleBinPermission"));
}

TEST_F(CreateRecycleBinTest, IsNotLedElsewhereByALinkThatTakesThePlaceOfTheFolder) {
    const std::string elsewhere = m_dir.MakeDir("elsewhere");
    ASSERT_EQ(0, chmod(elsewhere.c_str(), 0711));
    const std::string moved = m_dir / "moved";
    m_fake.OnCall("KELDACLIsSupport", [&] {
        ASSERT_EQ(0, rename(m_bin.c_str(), moved.c_str()));
        ASSERT_EQ(0, symlink(elsewhere.c_str(), m_bin.c_str()));
    });
    (void)SDK::CreateRecycleBin(m_bin, false);
    EXPECT_EQ(0711u, ModeOf(elsewhere));
    EXPECT_NE(0, access((elsewhere + "/desktop.ini").c_str(), F_OK));
    EXPECT_EQ(0777u, ModeOf(moved));
}

TEST_F(CreateRecycleBinTest, FailsWhenTheIconFileCannotBeWritten) {
    m_fake.OnCall("KELDACLIsSupport",
                  [this] { ASSERT_EQ(0, mkdir((m_bin + "/desktop.ini").c_str(), 0755)); });
    EXPECT_EQ(-1, SDK::CreateRecycleBin(m_bin, false));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to open file '" + m_bin + "/desktop.ini'"));
}

// --- Failing every call

TEST_F(SdkWrapperTest, WhicheverCallFailsNothingLeaksAndTheResultTellsIt) {
    for (int nth = 1;; ++nth) {
        FakeKeld& fake = FakeKeld::Reset();
        fake.AddShare({.name = "photos", .path = "/volume1/photos"});
        fake.AddDevice({.mount_path = "/media/a", .dev_path = "/dev/sda1"});
        fake.FailNthCall(nth);
        SDK::Share share;
        std::string dev_path;
        std::string name;
        bool is_usb_dev = false;
        std::map<std::string, std::string> volumes;
        const bool all =
            share.Open("photos") == 0 && !share.GetVolumePath().empty() &&
            SDK::GetMountedVolumes(volumes) == 0 && SDK::GetDevPath("/media/a", dev_path) == 0 &&
            SDK::GetKELDDevName(dev_path, name) == 0 && SDK::IsFrontPortDevice(name, is_usb_dev) &&
            SDK::GetPartitionCount(name) == 1 && SDK::EjectDevice(name) == 0;
        EXPECT_EQ(!fake.Failed(), all) << "call " << nth;
        if (!fake.Failed()) {
            EXPECT_EQ(10, nth);
            break;
        }
        ASSERT_GT(50, nth);
    }
}

}  // namespace
