#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "sdk-wrapper-fixture.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

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

}  // namespace
