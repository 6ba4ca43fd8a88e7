#include "service/usable-volume.h"

#include "service/service-fixture.h"

namespace {

class UsableVolumeTest : public ServiceTest {
protected:
    UsableVolumeTest() { FakeKeld::Reset(); }
};

TEST_F(UsableVolumeTest, TheFirstOneThatCanHoldTheRepositoryIsTaken) {
    m_fake.AddVolume({.mount_path = "/a", .mounted = false});
    m_fake.AddVolume({.mount_path = "/b", .writable = false});
    m_fake.AddVolume({.mount_path = "/c", .internal = false});
    m_fake.AddDevice({.mount_path = "/usb", .dev_path = "/dev/sdb1"});
    EXPECT_EQ("", FindUsableVolume());
    m_fake.AddVolume({.mount_path = "/d"});
    m_fake.AddVolume({.mount_path = "/e"});
    m_log.Clear();
    EXPECT_EQ("/d", FindUsableVolume());
    EXPECT_EQ(3U, m_log.Lines().size());
    EXPECT_TRUE(HasPlaced("INFO", "volume not mounted or writable"));
    EXPECT_TRUE(HasPlaced("INFO", "volume not internal (0)"));
}

TEST_F(UsableVolumeTest, AListThatCannotBeReadHoldsNone) {
    m_fake.AddVolume({.mount_path = "/d"});
    m_fake.FailCall("KELDMountVolAllEnum");
    EXPECT_EQ("", FindUsableVolume());
    EXPECT_TRUE(m_log.Contains("KELDMountVolAllEnum() failed"));
}

TEST_F(UsableVolumeTest, AMountedVolumeIsKnownByItsRoot) {
    m_fake.AddVolume({.mount_path = "/a", .mounted = false});
    m_fake.AddVolume({.mount_path = "/d", .writable = false});
    EXPECT_FALSE(IsVolumeMounted("/a"));
    EXPECT_TRUE(IsVolumeMounted("/d"));
    EXPECT_FALSE(IsVolumeMounted("/d/sub"));
    EXPECT_FALSE(IsVolumeMounted(""));
    EXPECT_EQ(m_fake.CallCount("KELDMountVolInfoGet") - 1,
              m_fake.CallCount("KELDMountVolInfoFree"));
}

}  // namespace
