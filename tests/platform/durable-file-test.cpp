#include "platform/durable-file.h"

#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "support/temp-dir.h"

namespace {

class DurableFileTest : public testing::Test {
protected:
    TempDir m_dir;
    const std::string m_path = m_dir / "record";
    std::string m_content = "before";
};

TEST_F(DurableFileTest, WhatIsWrittenIsReadWhateverItsBytesAndLength) {
    for (const size_t length : {size_t{0}, size_t{1}, size_t{4096}, size_t{100000}}) {
        std::string content(length, '\0');
        for (size_t at = 0; at < length; ++at) content[at] = static_cast<char>(at * 7);
        ASSERT_EQ(0, WriteDurableFile(m_path, content));
        EXPECT_EQ(1, ReadDurableFile(m_path, m_content));
        EXPECT_EQ(content, m_content);
    }
    EXPECT_NE(0, access((m_path + ".new").c_str(), F_OK));
}

TEST_F(DurableFileTest, AMissingFileIsNoFailure) {
    EXPECT_EQ(0, ReadDurableFile(m_path, m_content));
    EXPECT_EQ("before", m_content);
}

TEST_F(DurableFileTest, WhatCannotBeReadIsAFailure) {
    m_dir.MakeDir("record");
    EXPECT_EQ(-1, ReadDurableFile(m_path, m_content));
    EXPECT_EQ(EISDIR, errno);
}

TEST_F(DurableFileTest, ALinkIsNotFollowed) {
    m_dir.Write("elsewhere", "x");
    ASSERT_EQ(0, symlink((m_dir / "elsewhere").c_str(), m_path.c_str()));
    EXPECT_EQ(-1, ReadDurableFile(m_path, m_content));
    ASSERT_EQ(0, WriteDurableFile(m_path, "ours"));
    EXPECT_EQ("x", ReadWholeFile(m_dir / "elsewhere")) << "the link was replaced";
}

TEST_F(DurableFileTest, AFailedWriteLeavesTheOldContent) {
    ASSERT_EQ(0, WriteDurableFile(m_path, "old"));
    m_dir.MakeDir("record.new");  // in the way of the new file
    EXPECT_EQ(-1, WriteDurableFile(m_path, "new"));
    EXPECT_EQ("old", ReadWholeFile(m_path));
    EXPECT_EQ(-1, WriteDurableFile(m_dir / "no-folder/record", "new"));
    EXPECT_EQ(ENOENT, errno);
}

TEST_F(DurableFileTest, AFullDiskLeavesTheOldContentAndNothingElse) {
    if (geteuid() != 0) GTEST_SKIP() << "only root may mount";
    const std::string disk = m_dir.MakeDir("disk");
    ASSERT_EQ(0, mount("tmpfs", disk.c_str(), "tmpfs", 0, "size=64k"));
    ASSERT_EQ(0, WriteDurableFile(disk + "/record", "old"));
    EXPECT_EQ(-1, WriteDurableFile(disk + "/record", std::string(1 << 20, 'x')));
    EXPECT_EQ(ENOSPC, errno);
    EXPECT_EQ("old", ReadWholeFile(disk + "/record"));
    EXPECT_NE(0, access((disk + "/record.new").c_str(), F_OK));
    EXPECT_EQ(0, umount(disk.c_str()));
}

TEST_F(DurableFileTest, WhatIsNoFileIsRefused) {
    ASSERT_EQ(0, mkfifo(m_path.c_str(), 0600));
    EXPECT_EQ(-1, WriteDurableFile(m_path, "new"));
    EXPECT_EQ(EINVAL, errno);
    struct stat info {};
    ASSERT_EQ(0, stat(m_path.c_str(), &info));
    EXPECT_TRUE(S_ISFIFO(info.st_mode));
    m_dir.MakeDir("folder");
    EXPECT_EQ(-1, WriteDurableFile(m_dir / "folder", "new"));
    EXPECT_EQ(EISDIR, errno);
}

TEST_F(DurableFileTest, ARemovedFileIsGone) {
    ASSERT_EQ(0, WriteDurableFile(m_path, "x"));
    EXPECT_EQ(0, RemoveDurableFile(m_path));
    EXPECT_NE(0, access(m_path.c_str(), F_OK));
    EXPECT_EQ(0, RemoveDurableFile(m_path)) << "there is none";
}

TEST_F(DurableFileTest, WhatCannotBeRemovedIsAFailure) {
    m_dir.MakeDir("record");
    EXPECT_EQ(-1, RemoveDurableFile(m_path));
    EXPECT_EQ(EISDIR, errno);
    EXPECT_EQ(-1, RemoveDurableFile(m_dir / "no-folder/record"));
    EXPECT_EQ(ENOENT, errno);
}

TEST_F(DurableFileTest, TheFileIsItsOwnersAloneUnlessAskedOtherwise) {
    ASSERT_EQ(0, WriteDurableFile(m_path, "x"));
    struct stat info {};
    ASSERT_EQ(0, stat(m_path.c_str(), &info));
    EXPECT_EQ(0600U, info.st_mode & 07777);
    const mode_t mask = umask(0077);
    ASSERT_EQ(0, WriteDurableFile(m_path, "x", 0644));
    umask(mask);
    ASSERT_EQ(0, stat(m_path.c_str(), &info));
    EXPECT_EQ(0644U, info.st_mode & 07777) << "as asked, whatever the umask";
}

}  // namespace
