#include <keld/acl.h>
#include <keld/ea.h>
#include <keld/error.h>
#include <keld/user.h>
#include <unistd.h>

#include <cerrno>
#include <thread>

#include "host-fixture.h"
#include "host/host-error.h"

namespace {

std::string Converted(const char* login) {
    char name[64];
    return KELDUserLoginNameConvert(login, name, sizeof(name)) == 0 ? name : "(none)";
}

}  // namespace

TEST(Users, AreFoundByNameAndByNumber) {
    KELDUser* user = nullptr;
    ASSERT_EQ(0, KELDUserGet("root", &user));
    EXPECT_STREQ("root", user->name);
    EXPECT_EQ(0u, user->uid);
    EXPECT_STREQ("/root", user->home);
    KELDUserFree(user);
    ASSERT_EQ(0, KELDUserGetByUID(0, &user));
    EXPECT_STREQ("root", user->name);
    KELDUserFree(user);
}

TEST(Users, AnUnknownOneGivesNoRecord) {
    KELDUser* user = nullptr;
    EXPECT_GT(0, KELDUserGet("no such user", &user));
    EXPECT_EQ(nullptr, user);
    EXPECT_EQ(KELDERR_SRC_MISS, KLIBCErrGet());
    EXPECT_GT(0, KELDUserGetByUID(3999999999u, &user));
    EXPECT_GT(0, KELDUserGet(nullptr, &user));
    EXPECT_GT(0, KELDUserGet("root", nullptr));
    KELDUserFree(nullptr);
}

TEST(Users, RootHasNotExpired) {
    if (geteuid() != 0) GTEST_SKIP() << "needs root to read the shadow file";
    KELDUser* user = nullptr;
    ASSERT_EQ(0, KELDUserGet("root", &user));
    EXPECT_EQ(0, KELDUserCheckExpired(user));
    KELDUserFree(user);
    EXPECT_GT(0, KELDUserCheckExpired(nullptr));
}

TEST(Users, LoginNamesAreConverted) {
    EXPECT_EQ("root", Converted("root"));
    EXPECT_EQ("root", Converted("ROOT"));
    EXPECT_EQ("root", Converted("DOMAIN\\root"));
    EXPECT_EQ("root", Converted("root@domain"));
    EXPECT_EQ("(none)", Converted("nobody at all"));
    EXPECT_EQ("(none)", Converted(""));
    char small[3];
    EXPECT_GT(0, KELDUserLoginNameConvert("root", small, sizeof(small)));
}

TEST(Groups, AreFoundByNumberWithTheirMembers) {
    KELDGroup* group = nullptr;
    ASSERT_EQ(0, KELDGroupGetByGID(0, &group));
    EXPECT_STREQ("root", group->name);
    KLIBCSzList* members = KLIBCSzListAlloc(16);
    const int count = KELDGroupListMember(group->name, &members);
    EXPECT_LE(1, count);
    bool hasRoot = false;
    for (int i = 0; i < count; ++i) {
        hasRoot = hasRoot || std::string("root") == KLIBCSzListGet(members, i);
    }
    EXPECT_TRUE(hasRoot);
    EXPECT_EQ(nullptr, KLIBCSzListGet(members, count));
    EXPECT_EQ(nullptr, KLIBCSzListGet(members, -1));
    EXPECT_EQ(nullptr, KLIBCSzListGet(nullptr, 0));
    EXPECT_GT(0, KELDGroupListMember("no such group", &members));
    KLIBCSzListFree(members);
    KELDGroupFree(group);
    EXPECT_GT(0, KELDGroupGetByGID(3999999999u, &group));
    EXPECT_EQ(nullptr, group);
}

TEST(Groups, RootIsAnAdministratorAndNobodyIsNot) {
    EXPECT_EQ(1, KLIBGroupIsAdminGroupMemByUid(0));
    EXPECT_EQ(0, KLIBGroupIsAdminGroupMemByUid(65534));
    EXPECT_GT(0, KLIBGroupIsAdminGroupMemByUid(3999999999u));
}

TEST(AccessLists, PlainLinuxHasNoneAndSaysSo) {
    EXPECT_EQ(0, KELDACLIsSupport("/tmp", -1, 1));
    KELDACL* acl = KELDACLAlloc(2);
    ASSERT_NE(nullptr, acl);
    EXPECT_EQ(2, acl->count);
    EXPECT_EQ(0, acl->entries[1].tag);
    EXPECT_GT(0, KELDACLSet("/tmp", -1, acl));
    EXPECT_EQ(KELDERR_NO_PERMISSION_ACL, KLIBCErrGet());
    KELDACLFree(acl);
    KELDACL* read = acl;
    EXPECT_GT(0, KELDACLGet("/tmp", -1, &read));
    EXPECT_EQ(nullptr, read);
    EXPECT_EQ(nullptr, KELDACLAlloc(-1));
    EXPECT_EQ(nullptr, KELDACLAlloc(1 << 30));
    KELDACLFree(nullptr);
}

TEST(Attributes, NothingIsStoredBesideAFile) {
    EXPECT_EQ(0, KELDEARemove("/no/such/file", -1, 0));
    EXPECT_GT(0, KELDEARemove("", -1, 0));
    EXPECT_GT(0, KELDEARemove(nullptr, -1, 0));
}

TEST(Attributes, ArchiveBitsNeedAFile) {
    const TempDir dir;
    EXPECT_EQ(0, KELDArchiveBit(dir.Path().c_str(), 0x204));
    EXPECT_GT(0, KELDArchiveBit((dir / "none").c_str(), 0x204));
    EXPECT_GT(0, KELDArchiveBit("", 0x204));
}

TEST(ErrorState, BelongsToTheThreadAndTellsThePlace) {
    EXPECT_EQ(-1, keld_host::Fail(KELDERR_IO));
    const int line = __LINE__ - 1;
    EXPECT_EQ(KELDERR_IO, KLIBCErrGet());
    EXPECT_EQ(line, KLIBCErrorGetLine());
    EXPECT_NE(std::string::npos, std::string(KLIBCErrorGetFile()).find("user-test.cpp"));
    std::thread other([] {
        EXPECT_EQ(KELDERR_SUCCESS, KLIBCErrGet());
        EXPECT_STREQ("", KLIBCErrorGetFile());
        EXPECT_EQ(0, KLIBCErrorGetLine());
        EXPECT_EQ(-1, keld_host::Fail(KELDERR_CANCELLED));
    });
    other.join();
    EXPECT_EQ(KELDERR_IO, KLIBCErrGet());
}

TEST(ErrorState, AnErrnoHasItsValue) {
    EXPECT_EQ(0x2400, keld_host::ErrorFromErrno(ENOSPC));
    EXPECT_EQ(0x2900, keld_host::ErrorFromErrno(EDQUOT));
    EXPECT_EQ(0x0300, keld_host::ErrorFromErrno(EACCES));
    EXPECT_EQ(0x0600, keld_host::ErrorFromErrno(ENOENT));
    EXPECT_EQ(0x6C00, keld_host::ErrorFromErrno(EIO));
    EXPECT_EQ(0x0D00, keld_host::ErrorFromErrno(EINVAL));
    EXPECT_EQ(0xA400, keld_host::ErrorFromErrno(EFBIG));
    EXPECT_EQ(0x3B00, keld_host::ErrorFromErrno(EXDEV));
}
