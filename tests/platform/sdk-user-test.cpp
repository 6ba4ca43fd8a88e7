#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "sdk-wrapper-fixture.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

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

}  // namespace
