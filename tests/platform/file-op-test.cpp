// Asking, folders, reading folders, times.
#include "utils/file-op.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <filesystem>
#include <map>

#include "deep-tree.h"
#include "fake/fake-keld.h"
#include "fault-injection.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/confined-path.h"

namespace {

namespace fs = std::filesystem;

class FileOpTest : public testing::Test {
protected:
    static struct stat StatOf(const std::string& path) {
        struct stat st {};
        EXPECT_EQ(0, lstat(path.c_str(), &st)) << path;
        return st;
    }
    // Makes one file of each kind in the folder, as far as the machine lets us; by name.
    std::map<std::string, FSType> MakeAllKinds() {
        m_dir.Write("file", "12345");
        m_dir.MakeDir("dir");
        fs::create_symlink("file", m_dir / "link");
        EXPECT_EQ(0, mkfifo((m_dir / "fifo").c_str(), 0600));
        const UniqueFd fd(socket(AF_UNIX, SOCK_DGRAM, 0));
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        (m_dir / "socket").copy(address.sun_path, sizeof(address.sun_path) - 1);
        EXPECT_EQ(0, bind(fd.Get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)));
        std::map<std::string, FSType> kinds = {
            {"file",   FS_TYPE_FILE  },
            {"dir",    FS_TYPE_DIR   },
            {"link",   FS_TYPE_LINK  },
            {"fifo",   FS_TYPE_FIFO  },
            {"socket", FS_TYPE_SOCKET}
        };
        if (mknod((m_dir / "device").c_str(), S_IFCHR | 0600, 0x103) == 0) {
            kinds["device"] = FS_TYPE_DEVICE;
        }
        return kinds;
    }

    TempDir m_dir;
    LogCapture m_log;
    FSInfo m_info;
};

// --- FSStat

TEST_F(FileOpTest, AStatTellsOfEveryKindOfFile) {
    for (const auto& [name, type] : MakeAllKinds()) {
        ASSERT_EQ(0, FSStat(m_dir / name, m_info)) << name;
        EXPECT_TRUE(m_info.exist);
        EXPECT_EQ(type, m_info.type) << name;
        EXPECT_EQ(m_dir / name, m_info.path);
        EXPECT_EQ(name, m_info.name);
        EXPECT_EQ("", m_info.reserved);
    }
    EXPECT_EQ(1, FS_TYPE_FILE);
    EXPECT_EQ(2, FS_TYPE_DIR);
    EXPECT_EQ(3, FS_TYPE_LINK);
    EXPECT_EQ(5, FS_TYPE_DEVICE);
    EXPECT_EQ(6, FS_TYPE_FIFO);
    EXPECT_EQ(7, FS_TYPE_SOCKET);
}

TEST_F(FileOpTest, AStatTellsSizeTimeAndOwner) {
    const std::string path = m_dir.Write("file", "12345");
    ASSERT_EQ(0, FSUtime(path, 1, 1234567890));
    ASSERT_EQ(0, FSStat(path, m_info));
    EXPECT_EQ(5u, m_info.size);
    EXPECT_EQ(1234567890u, m_info.mtime);
    EXPECT_EQ(1234567890, m_info.full_mtime);
    EXPECT_EQ(getuid(), m_info.uid);
    EXPECT_EQ(StatOf(path).st_gid, m_info.gid);
    ASSERT_EQ(0, FSStat(m_dir.Path() + "/", m_info));
    EXPECT_EQ(fs::path(m_dir.Path()).filename(), m_info.name) << "the last component";
}

TEST_F(FileOpTest, AFreshInfoIsEmptyAndZero) {
    const FSInfo info;
    EXPECT_EQ("", info.path + info.name + info.reserved);
    EXPECT_EQ(FS_TYPE_UNKNOWN, info.type);
    EXPECT_FALSE(info.exist);
    EXPECT_EQ(0u, info.mtime + info.size + info.uid + info.gid);
}

TEST_F(FileOpTest, AMissingPathIsASuccessThatDoesNotExist) {
    m_dir.Write("file", "");
    for (const std::string& path : {m_dir / "missing", m_dir / "file/below", m_dir / "a/b"}) {
        const auto before = static_cast<uint32_t>(time(nullptr));
        ASSERT_EQ(0, FSStat(path, m_info)) << path;
        const auto after = static_cast<uint32_t>(time(nullptr));
        EXPECT_FALSE(m_info.exist);
        EXPECT_EQ(FS_TYPE_FILE, m_info.type);
        EXPECT_LE(before, m_info.mtime);
        EXPECT_GE(after, m_info.mtime);
        EXPECT_EQ(0u, m_info.size + m_info.uid + m_info.gid);
        EXPECT_EQ(path, m_info.path);
    }
}

TEST_F(FileOpTest, AStatOfNothingOrOfTooLongANameFails) {
    EXPECT_EQ(-1, FSStat("", m_info));
    EXPECT_EQ(-1, FSStatNoFollow("", m_info));
    EXPECT_EQ(-2, FSStat(m_dir / std::string(256, 'x'), m_info));
    EXPECT_EQ(-1, FSStatNoFollow(m_dir / std::string(256, 'x'), m_info));
}

TEST_F(FileOpTest, ADanglingLinkIsALinkThatExists) {
    fs::create_symlink("nowhere", m_dir / "dangling");
    ASSERT_EQ(0, FSStat(m_dir / "dangling", m_info));
    EXPECT_TRUE(m_info.exist);
    EXPECT_EQ(FS_TYPE_LINK, m_info.type);
    EXPECT_FALSE(FSExists(m_dir / "dangling")) << "elsewhere a link is followed";
    const ConfinedRoot root(m_dir.Path());
    EXPECT_TRUE(FSExists(m_dir / "dangling")) << "below a root the name is taken";
}

TEST_F(FileOpTest, ExistenceIsAsked) {
    EXPECT_FALSE(FSExists(""));
    EXPECT_TRUE(FSExists(m_dir.Path()));
    EXPECT_FALSE(FSExists(m_dir / "missing"));
    const ConfinedRoot root(m_dir.Path());
    EXPECT_TRUE(FSExists(m_dir.Path()));
    EXPECT_FALSE(FSExists(m_dir / "missing"));
    EXPECT_FALSE(FSExists(m_dir / "a/b"));
}

TEST_F(FileOpTest, TimesBefore1970AndAfter2106WrapAlikeOnBothSides) {
    const std::string path = m_dir.Write("file", "");
    for (const int64_t when : {int64_t{-1}, int64_t{-86400 * 365}, int64_t{5000000000}}) {
        ASSERT_EQ(0, FSUtime(path, when, when)) << when;
        if (StatOf(path).st_mtime != when) GTEST_SKIP() << "the file system cannot hold " << when;
        ASSERT_EQ(0, FSStat(path, m_info));
        EXPECT_EQ(when, m_info.full_mtime);
        EXPECT_EQ(static_cast<uint32_t>(when), m_info.mtime);
        const std::string copy = m_dir.Write("copy", "");
        ASSERT_EQ(0, FSUtime(copy, when, m_info.full_mtime));
        FSInfo other;
        ASSERT_EQ(0, FSStat(copy, other));
        EXPECT_EQ(m_info.mtime, other.mtime);
    }
}

// --- FSUtime

TEST_F(FileOpTest, TimesAreSetInWholeSeconds) {
    const std::string path = m_dir.Write("file", "");
    ASSERT_EQ(0, FSUtime(path, 1000, 2000));
    const struct stat st = StatOf(path);
    EXPECT_EQ(1000, st.st_atim.tv_sec);
    EXPECT_EQ(2000, st.st_mtim.tv_sec);
    EXPECT_EQ(0, st.st_mtim.tv_nsec);
    EXPECT_EQ(-1, FSUtime("", 1, 2));
    EXPECT_EQ(-1, FSUtime(m_dir / "missing", 1, 2));
}

TEST_F(FileOpTest, TimesAreNotSetThroughALinkBelowARoot) {
    const std::string outside = m_dir.Write("outside/file", "");
    m_dir.MakeDir("root");
    fs::create_symlink(outside, m_dir / "root/link");
    fs::create_directory_symlink(m_dir / "outside", m_dir / "root/folder");
    ASSERT_EQ(0, FSUtime(outside, 5, 5));
    const ConfinedRoot root(m_dir / "root");
    EXPECT_EQ(0, FSUtime(m_dir / "root/link", 1000, 2000));
    EXPECT_EQ(2000, StatOf(m_dir / "root/link").st_mtime);
    EXPECT_EQ(-1, FSUtime(m_dir / "root/folder/file", 1000, 2000));
    EXPECT_EQ(5, StatOf(outside).st_mtime);
}

// --- FSMKDir

TEST_F(FileOpTest, AFolderIsMadeWithAllPermissions) {
    const mode_t old = umask(0);
    EXPECT_EQ(0, FSMKDir(m_dir / "a", false, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_EQ(0, FSMKDir(m_dir / "b/c", true, FS_KEEP_UID, FS_KEEP_GID));
    umask(old);
    for (const char* name : {"a", "b", "b/c"}) {
        EXPECT_EQ(static_cast<mode_t>(S_IFDIR | 0777), StatOf(m_dir / name).st_mode) << name;
    }
}

TEST_F(FileOpTest, AnExistingFolderIsLeftAsItIs) {
    m_dir.MakeDir("a");
    chmod((m_dir / "a").c_str(), 0700);
    EXPECT_EQ(0, FSMKDir(m_dir / "a", false, 1024, 100));
    EXPECT_EQ(0, FSMKDir(m_dir / "a", true, 1024, 100));
    EXPECT_EQ(0700u, StatOf(m_dir / "a").st_mode & 0777);
    EXPECT_EQ(getuid(), StatOf(m_dir / "a").st_uid);
}

TEST_F(FileOpTest, MakingAFolderFailsWithItsCode) {
    m_dir.Write("file", "");
    EXPECT_EQ(-1, FSMKDir("", true, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_EQ(-1, FSMKDir(m_dir / "file", true, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_TRUE(
        m_log.Has("[ERR] FSMKDir: Create a folder but local file system is not directory '1'"));
    const std::string too_long = m_dir / std::string(256, 'x');
    EXPECT_EQ(-1, FSMKDir(too_long, true, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_TRUE(m_log.Has("[ERR] FSMKDir: Can not get local file info '" + too_long + "'"));
    EXPECT_EQ(-2, FSMKDir(m_dir / "a/b", false, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_EQ(-2, FSMKDir(m_dir / "file/b", true, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_TRUE(m_log.Contains("FSMKDirP: fail to create '" + (m_dir / "file")));
    EXPECT_TRUE(m_log.Contains("'. Not a directory"));
}

TEST_F(FileOpTest, ALinkToAFolderIsNoFolder) {
    m_dir.MakeDir("real");
    fs::create_directory_symlink("real", m_dir / "link");
    EXPECT_EQ(-1, FSMKDir(m_dir / "link", true, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_TRUE(
        m_log.Has("[ERR] FSMKDir: Create a folder but local file system is not directory '3'"));
}

TEST_F(FileOpTest, OnlyFoldersThatItMadeChangeHands) {
    if (geteuid() != 0) GTEST_SKIP() << "giving folders away needs root";
    m_dir.MakeDir("there");
    ASSERT_EQ(0, FSMKDirP(m_dir / "there/new/newer", 1024, 100));
    EXPECT_EQ(0u, StatOf(m_dir / "there").st_uid);
    for (const char* name : {"there/new", "there/new/newer"}) {
        EXPECT_EQ(1024u, StatOf(m_dir / name).st_uid) << name;
        EXPECT_EQ(100u, StatOf(m_dir / name).st_gid) << name;
    }
    ASSERT_EQ(0, FSMKDir(m_dir / "there/one", false, 1024, 100));
    EXPECT_EQ(1024u, StatOf(m_dir / "there/one").st_uid);
    ASSERT_EQ(0, FSMKDir(m_dir / "there/none", false, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_EQ(0u, StatOf(m_dir / "there/none").st_uid);
}

TEST_F(FileOpTest, MakingFoldersTakesAnExistingNameForDone) {
    m_dir.Write("a/file", "");
    EXPECT_EQ(0, FSMKDirP(m_dir / "a", FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_EQ(0, FSMKDirP(m_dir / "a/file", FS_KEEP_UID, FS_KEEP_GID)) << "also a file's";
    EXPECT_EQ(0, FSMKDirP(m_dir / "b//c/./d/", FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_TRUE(fs::is_directory(m_dir / "b/c/d"));
    EXPECT_EQ(-1, FSMKDirP("", FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_EQ(-1, FSMKDirP(m_dir / "a/file/x/y", FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_EQ(0, FSMKDirP("/", FS_KEEP_UID, FS_KEEP_GID));
}

TEST_F(FileOpTest, FoldersAreMadeThroughLinksOnlyWhereThatIsAllowed) {
    m_dir.MakeDir("outside");
    m_dir.MakeDir("root");
    fs::create_directory_symlink(m_dir / "outside", m_dir / "root/link");
    {
        const ConfinedRoot root(m_dir / "root");
        EXPECT_EQ(-1, FSMKDirP(m_dir / "root/link/a/b", FS_KEEP_UID, FS_KEEP_GID));
        EXPECT_EQ(-1, FSMKDirP(m_dir / "root/link", FS_KEEP_UID, FS_KEEP_GID));
        EXPECT_EQ(-1, FSMKDir(m_dir / "root/link/a", false, FS_KEEP_UID, FS_KEEP_GID));
        EXPECT_EQ(-1, FSMKDir(m_dir / "root/link/a", true, FS_KEEP_UID, FS_KEEP_GID));
        EXPECT_EQ(-1, FSMKDir(m_dir / "root/link", true, FS_KEEP_UID, FS_KEEP_GID));
        EXPECT_EQ(-1, FSMKDirP(m_dir / "root/../outside/a", FS_KEEP_UID, FS_KEEP_GID));
        EXPECT_TRUE(fs::is_empty(m_dir / "outside"));
        EXPECT_EQ(0, FSMKDirP(m_dir / "root/a/b", FS_KEEP_UID, FS_KEEP_GID));
        EXPECT_TRUE(fs::is_directory(m_dir / "root/a/b"));
    }
    EXPECT_EQ(0, FSMKDirP(m_dir / "root/link/a/b", FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_TRUE(fs::is_directory(m_dir / "outside/a/b"));
}

TEST_F(FileOpTest, ARootThatIsNotThereIsNotMade) {
    const ConfinedRoot root(m_dir / "root");
    EXPECT_EQ(-2, FSMKDir(m_dir / "root/a/b", true, FS_KEEP_UID, FS_KEEP_GID));
    EXPECT_FALSE(fs::exists(m_dir / "root"));
}

TEST_F(FileOpTest, FoldersAreMadeDeeperThanAPathIsLong) {
    for (const bool is_confined : {false, true}) {
        const std::string top = m_dir.MakeDir(is_confined ? "root" : "plain");
        const ConfinedRoot root(is_confined ? top : m_dir / "other");
        const std::string path = DeepPath(top, 2100, "dd");
        ASSERT_EQ(0, FSMKDir(path, true, FS_KEEP_UID, FS_KEEP_GID));
        EXPECT_EQ(2100, DepthOf(top, "dd"));
        EXPECT_EQ(0, FSMKDir(path, true, FS_KEEP_UID, FS_KEEP_GID)) << "there already";
        EXPECT_EQ(0, FSRemove(top));
    }
}

// --- FSOpenDir, FSReadDir

std::map<std::string, FSDirEntry> ReadAll(FSDir& dir, int& result) {
    std::map<std::string, FSDirEntry> entries;
    FSDirEntry entry;
    while ((result = FSReadDir(dir, entry)) > 0) entries[entry.name] = entry;
    return entries;
}

TEST_F(FileOpTest, AFolderIsReadToItsEnd) {
    const auto kinds = MakeAllKinds();
    FSDir dir;
    ASSERT_EQ(0, FSOpenDir(m_dir.Path(), 0, dir));
    EXPECT_EQ(m_dir.Path(), dir.path);
    int result = 0;
    const auto entries = ReadAll(dir, result);
    EXPECT_EQ(0, result);
    EXPECT_EQ(kinds.size() + 2, entries.size()) << "and . and ..";
    for (const auto& [name, type] : kinds) {
        ASSERT_EQ(1u, entries.count(name));
        EXPECT_EQ(type, entries.at(name).type) << name;
        EXPECT_EQ(0u, entries.at(name).mtime + entries.at(name).size) << name;
    }
    FSCloseDir(dir);
    EXPECT_EQ("", dir.path);
    FSDirEntry entry;
    EXPECT_EQ(-1, FSReadDir(dir, entry)) << "closed";
}

TEST_F(FileOpTest, EntriesAreStattedWhenAsked) {
    ASSERT_EQ(0, FSUtime(m_dir.Write("file", "12345"), 1, 77));
    fs::create_symlink("nowhere", m_dir / "link");
    FSDir dir;
    ASSERT_EQ(0, FSOpenDir(m_dir.Path(), FS_DIR_STAT, dir));
    int result = 0;
    const auto entries = ReadAll(dir, result);
    EXPECT_EQ(0, result);
    EXPECT_EQ(77u, entries.at("file").mtime);
    EXPECT_EQ(5u, entries.at("file").size);
    EXPECT_EQ(7u, entries.at("link").size) << "a link's own";
}

TEST_F(FileOpTest, AFolderThatCannotBeOpenedIsTold) {
    FSDir dir;
    EXPECT_EQ(-1, FSOpenDir(m_dir / "missing", 0, dir));
    EXPECT_TRUE(m_log.Has("[ERR] FSOpenDir: Failed to open directory '" + (m_dir / "missing") +
                          "'. No such file or directory"));
    EXPECT_EQ(-1, FSOpenDir(m_dir.Write("file", ""), 0, dir));
    EXPECT_EQ(-1, FSOpenDir("", 0, dir));
}

TEST_F(FileOpTest, AFolderIsNotOpenedThroughALinkBelowARoot) {
    m_dir.MakeDir("outside/sub");
    m_dir.MakeDir("root");
    fs::create_directory_symlink(m_dir / "outside", m_dir / "root/link");
    FSDir dir;
    EXPECT_EQ(0, FSOpenDir(m_dir / "root/link", 0, dir));
    const ConfinedRoot root(m_dir / "root");
    EXPECT_EQ(0, FSOpenDir(m_dir / "root", 0, dir));
    EXPECT_EQ(-1, FSOpenDir(m_dir / "root/link", 0, dir));
    EXPECT_EQ(-1, FSOpenDir(m_dir / "root/link/sub", 0, dir));
}

TEST_F(FileOpTest, AReadErrorIsNotTheEnd) {
    m_dir.Write("a", "");
    m_dir.Write("b", "");
    FSDir dir;
    ASSERT_EQ(0, FSOpenDir(m_dir.Path(), 0, dir));
    const FailReadDir fail(2, EIO);
    int result = 0;
    EXPECT_EQ(2u, ReadAll(dir, result).size());
    EXPECT_EQ(-1, result);
    EXPECT_TRUE(m_log.Has("[ERR] FSOpenDir: Failed to read directory '" + m_dir.Path() +
                          "'. Input/output error"));
}

std::string g_vanishing;

TEST_F(FileOpTest, AFileThatVanishesBeforeItsStatIsNoFailure) {
    g_vanishing = m_dir.Write("file", "12345");
    FSDir dir;
    ASSERT_EQ(0, FSOpenDir(m_dir.Path(), FS_DIR_STAT, dir));
    const auto before = static_cast<uint32_t>(time(nullptr));
    const OnReadDir vanish([](const char*) { unlink(g_vanishing.c_str()); });
    int result = 0;
    const auto entries = ReadAll(dir, result);
    EXPECT_EQ(0, result);
    ASSERT_EQ(1u, entries.count("file"));
    EXPECT_EQ(0u, entries.at("file").size);
    EXPECT_LE(before, entries.at("file").mtime);
    EXPECT_EQ(FS_TYPE_FILE, entries.at("file").type);
}

TEST_F(FileOpTest, AFileSystemWithoutTypesInItsFoldersLosesNothing) {
    const auto kinds = MakeAllKinds();
    const HideDirTypes hide;
    for (const uint32_t flags : {0u, FS_DIR_STAT}) {
        FSDir dir;
        ASSERT_EQ(0, FSOpenDir(m_dir.Path(), flags, dir));
        int result = 0;
        const auto entries = ReadAll(dir, result);
        EXPECT_EQ(0, result);
        for (const auto& [name, type] : kinds) EXPECT_EQ(type, entries.at(name).type) << name;
        EXPECT_EQ(flags == 0 ? 0u : 5u, entries.at("file").size);
    }
}

TEST(FSTypes, AnythingElseIsUnknown) {
    EXPECT_EQ(FS_TYPE_UNKNOWN, FSTypeFromMode(0));
    EXPECT_EQ(FS_TYPE_UNKNOWN, FSTypeFromDirent(0));
    EXPECT_EQ(FS_TYPE_UNKNOWN, FSTypeFromDirent(14));
    EXPECT_EQ(FS_TYPE_DEVICE, FSTypeFromMode(S_IFBLK));
    EXPECT_EQ(FS_TYPE_DEVICE, FSTypeFromDirent(6));
}

// --- FSSyncFileSystem

TEST_F(FileOpTest, AFileSystemIsFlushed) {
    EXPECT_EQ(0, FSSyncFileSystem(m_dir.Path()));
    EXPECT_EQ(0, FSSyncFileSystem(m_dir.Write("file", "")));
    EXPECT_EQ(-1, FSSyncFileSystem(""));
    EXPECT_EQ(-1, FSSyncFileSystem(m_dir / "missing"));
    EXPECT_TRUE(m_log.Has("[ERR] FSSyncFileSystem: Failed to flush '" + (m_dir / "missing") +
                          "'. No such file or directory"));
    const ConfinedRoot root(m_dir.Path());
    EXPECT_EQ(0, FSSyncFileSystem(m_dir / "file"));
}

}  // namespace
