// Renaming, copying, temporary names.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>

#include "deep-tree.h"
#include "fake/fake-keld.h"
#include "fault-injection.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/confined-path.h"
#include "utils/file-op.h"

namespace {

namespace fs = std::filesystem;

struct stat StatOf(const std::string& path) {
    struct stat st {};
    EXPECT_EQ(0, lstat(path.c_str(), &st)) << path;
    return st;
}

class FileOpChangeTest : public testing::Test {
protected:
    TempDir m_dir;
    LogCapture m_log;
};

// --- FSRename within one file system

TEST_F(FileOpChangeTest, AFileAFolderAndALinkAreRenamed) {
    const std::string file = m_dir.Write("file", "content");
    EXPECT_EQ(0, FSRename(file, m_dir / "file2"));
    EXPECT_EQ("content", ReadWholeFile(m_dir / "file2"));
    EXPECT_FALSE(fs::exists(file));
    m_dir.Write("dir/below", "");
    EXPECT_EQ(0, FSRename(m_dir / "dir", m_dir / "dir2"));
    EXPECT_TRUE(fs::exists(m_dir / "dir2/below"));
    fs::create_symlink("nowhere", m_dir / "link");
    EXPECT_EQ(0, FSRename(m_dir / "link", m_dir / "link2"));
    EXPECT_TRUE(fs::is_symlink(m_dir / "link2"));
}

TEST_F(FileOpChangeTest, ARenameReplacesAFile) {
    EXPECT_EQ(0, FSRename(m_dir.Write("new", "new"), m_dir.Write("old", "old")));
    EXPECT_EQ("new", ReadWholeFile(m_dir / "old"));
}

TEST_F(FileOpChangeTest, ARenameFailsWithItsCode) {
    const std::string file = m_dir.Write("file", "content");
    EXPECT_EQ(-1, FSRename("", file));
    EXPECT_EQ(-1, FSRename(file, ""));
    EXPECT_EQ(-2, FSRename(m_dir / "missing", m_dir / "x"));
    EXPECT_EQ(-2, FSRename(m_dir / std::string(256, 'x'), m_dir / "x"));
    EXPECT_EQ(-100, FSRename(file, m_dir / std::string(256, 'x')));
    EXPECT_EQ(-3, FSRename(file, m_dir / "missing/x"));
    m_dir.Write("full/entry", "");
    EXPECT_EQ(-3, FSRename(m_dir.MakeDir("dir"), m_dir / "full"));
    EXPECT_EQ("content", ReadWholeFile(file));
}

TEST_F(FileOpChangeTest, ARenameDoesNotLeaveItsRootThroughALink) {
    m_dir.Write("outside/there", "");
    m_dir.Write("root/file", "content");
    fs::create_directory_symlink(m_dir / "outside", m_dir / "root/link");
    const ConfinedRoot root(m_dir / "root");
    EXPECT_EQ(-3, FSRename(m_dir / "root/file", m_dir / "root/link/file"));
    EXPECT_EQ(-2, FSRename(m_dir / "root/link/there", m_dir / "root/there"));
    EXPECT_EQ(-3, FSRename(m_dir / "root/file", m_dir / "root/.."));
    EXPECT_EQ(-3, FSRename(m_dir / "root/file", m_dir / "root/../outside/file"))
        << "a way out of the root is not taken for another file system";
    EXPECT_EQ("content", ReadWholeFile(m_dir / "root/file"));
    EXPECT_EQ(0, FSRename(m_dir / "root/file", m_dir / "root/file2"));
}

// --- FSRename across file systems

class AcrossFileSystemsTest : public FileOpChangeTest {
protected:
    void SetUp() override {
        char pattern[] = "/dev/shm/ferrix-test-XXXXXX";
        if (mkdtemp(pattern) == nullptr) GTEST_SKIP() << "no /dev/shm";
        m_other = pattern;
        if (StatOf(m_other).st_dev == StatOf(m_dir.Path()).st_dev) {
            GTEST_SKIP() << "/dev/shm is on the file system of the scratch folder";
        }
    }
    ~AcrossFileSystemsTest() override {
        std::error_code ignored;
        if (!m_other.empty()) fs::remove_all(m_other, ignored);
    }
    std::string m_other;
};

TEST_F(AcrossFileSystemsTest, AFileIsCopiedAndRemoved) {
    const std::string file = m_dir.Write("file", "content");
    chmod(file.c_str(), 04750);
    ASSERT_EQ(0, FSUtime(file, 1, 1));
    ASSERT_EQ(0, FSRename(file, m_other + "/file"));
    EXPECT_EQ("content", ReadWholeFile(m_other + "/file"));
    EXPECT_EQ(0750u, StatOf(m_other + "/file").st_mode & 07777) << "without set-uid";
    EXPECT_NE(1, StatOf(m_other + "/file").st_mtime) << "a new file";
    EXPECT_FALSE(fs::exists(file));
}

TEST_F(AcrossFileSystemsTest, AFileThatCannotBeCopiedStays) {
    const std::string file = m_dir.Write("file", "content");
    EXPECT_EQ(-3, FSRename(file, m_other + "/missing/file"));
    {
        const FailFsync fail(EIO);
        EXPECT_EQ(-3, FSRename(file, m_other + "/file")) << "what is not on the disk is not moved";
    }
    EXPECT_EQ("content", ReadWholeFile(file));
}

TEST_F(AcrossFileSystemsTest, AFolderIsMovedEntryByEntry) {
    m_dir.Write("dir/a", "1");
    m_dir.Write("dir/sub/b\n", "2");
    m_dir.MakeDir("dir/empty");
    ASSERT_EQ(0, FSRename(m_dir / "dir", m_other + "/dir"));
    EXPECT_EQ("1", ReadWholeFile(m_other + "/dir/a"));
    EXPECT_EQ("2", ReadWholeFile(m_other + "/dir/sub/b\n"));
    EXPECT_TRUE(fs::is_directory(m_other + "/dir/empty"));
    EXPECT_FALSE(fs::exists(m_dir / "dir"));
}

TEST_F(AcrossFileSystemsTest, ALinkStaysWhereItIs) {
    fs::create_symlink("nowhere", m_dir / "link");
    EXPECT_EQ(0, FSRename(m_dir / "link", m_other + "/link"));
    EXPECT_TRUE(fs::is_symlink(m_dir / "link"));
    EXPECT_FALSE(fs::is_symlink(m_other + "/link"));
    m_dir.Write("dir/a", "1");
    fs::create_symlink("nowhere", m_dir / "dir/link");
    EXPECT_EQ(-3, FSRename(m_dir / "dir", m_other + "/dir")) << "the folder cannot go";
    EXPECT_TRUE(fs::is_symlink(m_dir / "dir/link")) << "and the link is not lost";
    EXPECT_EQ("1", ReadWholeFile(m_other + "/dir/a"));
}

TEST_F(AcrossFileSystemsTest, AFolderMeetsAFileInItsPlace) {
    m_dir.Write("dir/a", "1");
    std::error_code ignored;
    fs::copy_file(m_dir / "dir/a", m_other + "/dir", ignored);
    EXPECT_EQ(-3, FSRename(m_dir / "dir", m_other + "/dir"));
    EXPECT_EQ("1", ReadWholeFile(m_dir / "dir/a"));
}

TEST_F(AcrossFileSystemsTest, AListingThatBreaksOffLosesNothing) {
    m_dir.Write("dir/a", "1");
    const FailReadDir fail(0, EIO);
    EXPECT_EQ(-3, FSRename(m_dir / "dir", m_other + "/dir"));
    EXPECT_EQ("1", ReadWholeFile(m_dir / "dir/a"));
}

// Four thousand bytes of path are all that the two sides take outside of a root.
TEST_F(AcrossFileSystemsTest, ADeepFolderIsMoved) {
    const std::string from = m_dir.MakeDir("from");
    MakeDeepTree(from, 600, "d");
    ASSERT_EQ(0, FSRename(from, m_other + "/to"));
    EXPECT_EQ(600, DepthOf(m_other + "/to", "d"));
    EXPECT_FALSE(fs::exists(from));
}

// --- CopyFile

TEST_F(FileOpChangeTest, CopyOfWhatIsNoFileLeavesTheDestinationAsItIs) {
    const std::string to = m_dir.Write("to", "kept");
    ASSERT_EQ(0, mkfifo((m_dir / "pipe").c_str(), 0600));
    EXPECT_EQ(-1, CopyFile(m_dir / "pipe", to, true));
    EXPECT_EQ(-1, CopyFile(m_dir.MakeDir("folder"), to, true));
    EXPECT_EQ("kept", ReadWholeFile(to));
    EXPECT_TRUE(FSExists(m_dir / "pipe"));
}

TEST_F(FileOpChangeTest, AFileIsCopied) {
    std::string content;
    for (int i = 0; i < 100000; ++i) content += "line " + std::to_string(i) + "\n";
    const std::string from = m_dir.Write("from", content);
    chmod(from.c_str(), 0640);
    const mode_t old = umask(0);
    EXPECT_EQ(0, CopyFile(from, m_dir / "to", false));
    umask(old);
    EXPECT_EQ(content, ReadWholeFile(m_dir / "to"));
    EXPECT_EQ(0640u, StatOf(m_dir / "to").st_mode & 07777) << "the source's bits, nothing wider";
    EXPECT_TRUE(fs::exists(from));
    EXPECT_EQ(0, CopyFile(m_dir.Write("empty", ""), m_dir / "to", false));
    EXPECT_EQ("", ReadWholeFile(m_dir / "to")) << "what was there is replaced";
}

TEST_F(FileOpChangeTest, AFileLargerThanTheBufferIsCopied) {
    const std::string content(33554432 + 12345, 'x');
    ASSERT_EQ(0, CopyFile(m_dir.Write("from", content), m_dir / "to", true));
    EXPECT_EQ(content, ReadWholeFile(m_dir / "to"));
    EXPECT_FALSE(fs::exists(m_dir / "from"));
}

TEST_F(FileOpChangeTest, ACopyFailsWithItsCode) {
    const std::string from = m_dir.Write("from", "content");
    EXPECT_EQ(-1, CopyFile("", from, false));
    EXPECT_EQ(-1, CopyFile(from, "", false));
    EXPECT_EQ(-1, CopyFile(m_dir / "missing", m_dir / "to", true));
    EXPECT_TRUE(m_log.Has("[ERR] CopyFile: open(" + (m_dir / "missing") +
                          "): No such file or directory (2)"));
    EXPECT_FALSE(fs::exists(m_dir / "to"));
    EXPECT_EQ(-1, CopyFile(from, m_dir / "missing/to", true));
    EXPECT_TRUE(m_log.Has("[ERR] CopyFile: open(" + (m_dir / "missing/to") +
                          "): No such file or directory (2)"));
    EXPECT_EQ(-1, CopyFile(m_dir.MakeDir("dir"), m_dir / "to", false));
    EXPECT_TRUE(m_log.Has("[ERR] CopyFile: read: Is a directory (21)"));
    EXPECT_EQ("content", ReadWholeFile(from));
}

TEST_F(FileOpChangeTest, AFullDiskHasItsOwnCodeAndTheSourceStays) {
    const std::string from = m_dir.Write("from", "content");
    EXPECT_EQ(-2, CopyFile(from, "/dev/full", true));
    EXPECT_TRUE(m_log.Has("[ERR] CopyFile: write: No space left on device (28)"));
    EXPECT_EQ("content", ReadWholeFile(from));
}

TEST_F(FileOpChangeTest, ACopyThatIsNotOnTheDiskIsNoCopy) {
    const std::string from = m_dir.Write("from", "content");
    {
        const FailFsync fail(EIO);
        EXPECT_EQ(-1, CopyFile(from, m_dir / "to", true));
    }
    EXPECT_TRUE(m_log.Has("[ERR] CopyFile: write: Input/output error (5)"));
    {
        const FailFsync fail(ENOSPC);
        EXPECT_EQ(-2, CopyFile(from, m_dir / "to", true));
    }
    EXPECT_EQ("content", ReadWholeFile(from));
}

TEST_F(FileOpChangeTest, AFileIsNotCopiedOntoItself) {
    const std::string from = m_dir.Write("from", "content");
    fs::create_hard_link(from, m_dir / "same");
    EXPECT_EQ(-1, CopyFile(from, from, false));
    EXPECT_EQ(-1, CopyFile(from, m_dir / "same", true));
    EXPECT_EQ("content", ReadWholeFile(from));
}

TEST_F(FileOpChangeTest, ACopyIsNotLedOutOfItsRoot) {
    const std::string from = m_dir.Write("root/from", "content");
    const std::string outside = m_dir.Write("outside/file", "outside");
    fs::create_symlink(outside, m_dir / "root/link");
    fs::create_directory_symlink(m_dir / "outside", m_dir / "root/folder");
    const ConfinedRoot root(m_dir / "root");
    EXPECT_EQ(-1, CopyFile(from, m_dir / "root/link", false));
    EXPECT_EQ(-1, CopyFile(from, m_dir / "root/folder/file", false));
    EXPECT_EQ(-1, CopyFile(m_dir / "root/link", m_dir / "root/copy", false));
    EXPECT_EQ("outside", ReadWholeFile(outside));
    EXPECT_FALSE(fs::exists(m_dir / "root/copy"));
    EXPECT_EQ(0, CopyFile(from, m_dir / "root/copy", true));
    EXPECT_FALSE(fs::exists(from));
}

TEST_F(FileOpChangeTest, AFifoInTheWayDoesNotHoldACopyUp) {
    const std::string fifo = m_dir / "fifo";
    ASSERT_EQ(0, mkfifo(fifo.c_str(), 0600));
    EXPECT_EQ(-1, CopyFile(m_dir.Write("from", "content"), fifo, false));
}

// --- Temporary names

TEST_F(FileOpChangeTest, ATemporaryFileIsMade) {
    const mode_t old = umask(0);
    std::string one;
    std::string two;
    EXPECT_EQ(0, FSMakeTempFile(m_dir.Path(), one));
    EXPECT_EQ(0, FSMakeTempFile(m_dir.Path(), two));
    umask(old);
    EXPECT_NE(one, two);
    EXPECT_EQ(m_dir.Path(), PathDirName(one));
    EXPECT_EQ(6u, PathBaseName(one).size());
    EXPECT_EQ(static_cast<mode_t>(S_IFREG | 0644), StatOf(one).st_mode);
    EXPECT_EQ(0, StatOf(one).st_size);
}

TEST_F(FileOpChangeTest, ATemporaryFolderIsMade) {
    const mode_t old = umask(022);
    std::string path;
    EXPECT_EQ(0, FSMakeTempDir(m_dir.Path(), path, FS_KEEP_UID, FS_KEEP_GID));
    umask(old);
    EXPECT_EQ(m_dir.Path(), PathDirName(path));
    EXPECT_EQ(static_cast<mode_t>(S_IFDIR | 0777), StatOf(path).st_mode);
    if (geteuid() != 0) GTEST_SKIP() << "giving folders away needs root";
    EXPECT_EQ(0, FSMakeTempDir(m_dir.Path(), path, 1024, 100));
    EXPECT_EQ(1024u, StatOf(path).st_uid);
    EXPECT_EQ(100u, StatOf(path).st_gid);
}

TEST_F(FileOpChangeTest, TemporaryNamesFailWhereNoneCanBe) {
    std::string path = "as it was";
    EXPECT_EQ(-1, FSMakeTempFile("", path));
    EXPECT_EQ(-1, FSMakeTempDir("", path, 0, 0));
    EXPECT_EQ(-1, FSMakeTempFile(m_dir / "missing", path));
    EXPECT_TRUE(
        m_log.Has("[ERR] mkstemp(" + (m_dir / "missing/XXXXXX") + "): No such file or directory"));
    EXPECT_EQ(-1, FSMakeTempDir(m_dir / "missing", path, 0, 0));
    EXPECT_TRUE(
        m_log.Has("[ERR] mkdtemp(" + (m_dir / "missing/XXXXXX") + "): No such file or directory"));
    EXPECT_EQ(-1, FSMakeTempFile("/" + std::string(4095, 'x'), path));
    EXPECT_TRUE(m_log.Contains("File name too long"));
    EXPECT_EQ("as it was", path);
}

TEST_F(FileOpChangeTest, TemporaryNamesAreNotMadeThroughALinkBelowARoot) {
    m_dir.MakeDir("outside");
    m_dir.MakeDir("root/sub");
    fs::create_directory_symlink(m_dir / "outside", m_dir / "root/link");
    const ConfinedRoot root(m_dir / "root");
    std::string path;
    EXPECT_EQ(-1, FSMakeTempFile(m_dir / "root/link", path));
    EXPECT_EQ(-1, FSMakeTempDir(m_dir / "root/link", path, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_TRUE(fs::is_empty(m_dir / "outside"));
    ASSERT_EQ(0, FSMakeTempFile(m_dir / "root/sub", path));
    EXPECT_TRUE(fs::is_regular_file(path));
    EXPECT_EQ(m_dir / "root/sub", PathDirName(path));
    ASSERT_EQ(0, FSMakeTempDir(m_dir / "root/sub", path, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_TRUE(fs::is_directory(path));
}

}  // namespace
