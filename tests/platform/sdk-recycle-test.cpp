#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "sdk-wrapper-fixture.h"

using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

namespace {

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

}  // namespace
