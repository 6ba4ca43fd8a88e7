#include "service/usable-volume.h"

#include "service/service-fixture.h"

namespace fs = std::filesystem;

namespace {

class UsableVolumeTest : public ServiceTest {
protected:
    UsableVolumeTest() { FakeKeld::Reset(); }
    // What is found; "none" and "failure" for nothing.
    static std::string Find() {
        std::string path = "untouched";
        const int found = FindUsableVolume(path);
        if (found == 1) return path;
        EXPECT_EQ("untouched", path);
        return found == 0 ? "none" : "failure";
    }
};

TEST_F(UsableVolumeTest, TheFirstOneThatCanHoldTheRepositoryIsTaken) {
    m_fake.AddVolume({.mount_path = "/a", .mounted = false});
    m_fake.AddVolume({.mount_path = "/b", .writable = false});
    m_fake.AddVolume({.mount_path = "/c", .internal = false});
    m_fake.AddDevice({.mount_path = "/usb", .dev_path = "/dev/sdb1"});
    EXPECT_EQ("none", Find());
    m_fake.AddVolume({.mount_path = "/d"});
    m_fake.AddVolume({.mount_path = "/e"});
    m_log.Clear();
    EXPECT_EQ("/d", Find());
    EXPECT_EQ(3U, m_log.Lines().size());
    EXPECT_TRUE(HasPlaced("INFO", "volume not mounted or writable"));
    EXPECT_TRUE(HasPlaced("INFO", "volume not internal (0)"));
}

TEST_F(UsableVolumeTest, AListThatCannotBeReadIsNotAnEmptyOne) {
    m_fake.AddVolume({.mount_path = "/d"});
    m_fake.FailCall("KELDMountVolAllEnum");
    EXPECT_EQ("failure", Find());
    EXPECT_TRUE(m_log.Contains("KELDMountVolAllEnum() failed"));
    EXPECT_EQ("/d", Find());
}

TEST_F(UsableVolumeTest, AMountedVolumeIsKnownByItsRoot) {
    m_fake.AddVolume({.mount_path = "/a", .mounted = false});
    m_fake.AddVolume({.mount_path = "/d", .writable = false});
    m_fake.AddVolume({.mount_path = "/e"});
    EXPECT_EQ(0, LookUpVolume("/a"));
    EXPECT_EQ(1, LookUpVolume("/d"));
    EXPECT_EQ(0, LookUpVolume("/d/sub"));
    EXPECT_EQ(0, LookUpVolume(""));
    EXPECT_TRUE(IsVolumeMounted("/d"));
    EXPECT_FALSE(IsVolumeMounted("/a"));
    EXPECT_TRUE(IsVolumeWritable("/e"));
    for (const char* path : {"/a", "/d", "/none", ""}) EXPECT_FALSE(IsVolumeWritable(path)) << path;
}

TEST_F(UsableVolumeTest, ALookupThatFailsIsMadeUpForByTheList) {
    m_fake.AddVolume({.mount_path = "/a", .mounted = false});
    m_fake.AddVolume({.mount_path = "/d"});
    m_fake.FailCall("KELDMountVolInfoGet", KELDERR_SYSTEM, FakeKeld::ALWAYS);
    EXPECT_EQ(0, LookUpVolume("/a"));
    EXPECT_EQ(1, LookUpVolume("/d"));
    EXPECT_EQ(0, LookUpVolume("/none"));
    m_fake.FailCall("KELDMountVolAllEnum", KELDERR_SYSTEM, FakeKeld::ALWAYS);
    EXPECT_EQ(-1, LookUpVolume("/d"));
    EXPECT_FALSE(IsVolumeMounted("/d"));
    EXPECT_FALSE(IsVolumeWritable("/d"));
}

TEST_F(UsableVolumeTest, AFolderIsTheSameUnderAnyOfItsNames) {
    fs::create_symlink(m_v1, m_dir / "alias");
    EXPECT_TRUE(IsSameFolder(m_v1, m_v1));
    EXPECT_TRUE(IsSameFolder(m_v1, m_v1 + "//"));
    EXPECT_TRUE(IsSameFolder(m_v1, m_dir / "alias"));
    EXPECT_TRUE(IsSameFolder("/gone", "/gone/"));
    EXPECT_FALSE(IsSameFolder(m_v1, m_v2));
    EXPECT_FALSE(IsSameFolder(m_v1, m_dir / "none"));
    EXPECT_FALSE(IsSameFolder("", "/"));
    EXPECT_FALSE(IsSameFolder("", ""));
}

}  // namespace
