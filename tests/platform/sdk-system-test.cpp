#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <map>
#include <string>
#include <thread>
#include <vector>

#include "sdk-wrapper-fixture.h"
#include "utils/file-op.h"
#include "utils/per-device-value.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

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
