#include <fcntl.h>
#include <keld/error.h>
#include <keld/recycle.h>
#include <sys/mount.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <thread>

#include "copy-fixture.h"
#include "host/recycle-name.h"
#include "scratch-disk.h"
#include "support/log-capture.h"
#include "utils/unique-fd.h"

namespace {

using Names = std::vector<std::string>;

// KELDERR_SUCCESS or the error that the call left.
int RecycleFile(const std::string& share, const std::string& relative) {
    const int result = KELDRecycleUnlinkFileWithSharePath(share.c_str(), relative.c_str());
    return result == 0 ? int{KELDERR_SUCCESS} : KLIBCErrGet();
}
int RecycleFolder(const std::string& share, const std::string& relative, int admin_only = 0) {
    const int result =
        KELDRecycleRmDirWithSharePath(share.c_str(), relative.c_str(), 0, admin_only);
    return result == 0 ? int{KELDERR_SUCCESS} : KLIBCErrGet();
}

class KeldRecycleTest : public ::testing::Test {
protected:
    std::string Write(const std::string& name, const std::string& content) {
        return m_dir.Write("share/" + name, content);
    }
    std::string Bin(const std::string& name) { return m_share + "/#recycle/" + name; }

    TempDir m_dir;
    std::string m_share = m_dir.MakeDir("share");
    std::string m_outside = m_dir.MakeDir("outside");
    TestShares m_shares{{m_share}};
};

TEST_F(KeldRecycleTest, AFileGoesToTheBinUnderItsRelativePath) {
    Write("a/b/f.txt", "text");
    Write("top", "top");
    EXPECT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, "a/b/f.txt"));
    EXPECT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, "top"));
    EXPECT_EQ("text", ReadWholeFile(Bin("a/b/f.txt")));
    EXPECT_EQ("top", ReadWholeFile(Bin("top")));
    EXPECT_EQ(Names{}, NamesIn(m_share + "/a/b")) << "the folder itself stays";
}

TEST_F(KeldRecycleTest, AFolderGoesToTheBinWithAllItHolds) {
    Write("a/b/c/f", "text");
    Write("a/b/g", "more");
    EXPECT_EQ(KELDERR_SUCCESS, RecycleFolder(m_share, "a/b"));
    EXPECT_EQ("text", ReadWholeFile(Bin("a/b/c/f")));
    EXPECT_EQ("more", ReadWholeFile(Bin("a/b/g")));
    EXPECT_EQ(Names{}, NamesIn(m_share + "/a"));
}

TEST_F(KeldRecycleTest, ATakenNameIsKeptAndTheNewcomerGetsANumber) {
    for (int i = 0; i < 40; ++i) {
        Write("d/f.tar.gz", std::to_string(i));
        ASSERT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, "d/f.tar.gz"));
    }
    EXPECT_EQ("0", ReadWholeFile(Bin("d/f.tar.gz")));
    for (int i = 1; i < 40; ++i) {
        EXPECT_EQ(std::to_string(i), ReadWholeFile(Bin("d/f.tar (" + std::to_string(i) + ").gz")));
    }
    EXPECT_EQ(40U, NamesIn(Bin("d")).size());
}

TEST_F(KeldRecycleTest, AFolderOfATakenNameGetsANumberAndIsNotMerged) {
    for (const char* content : {"first", "second", "third"}) {
        Write("d.d/f", content);
        ASSERT_EQ(KELDERR_SUCCESS, RecycleFolder(m_share, "d.d"));
    }
    EXPECT_EQ((Names{"d.d", "d.d (1)", "d.d (2)"}), NamesIn(m_share + "/#recycle"));
    EXPECT_EQ("first", ReadWholeFile(Bin("d.d/f")));
    EXPECT_EQ("third", ReadWholeFile(Bin("d.d (2)/f")));
    m_dir.MakeDir("share/empty");
    m_dir.MakeDir("share/#recycle/empty");
    ASSERT_EQ(KELDERR_SUCCESS, RecycleFolder(m_share, "empty"));
    EXPECT_TRUE(Exists(Bin("empty (1)"))) << "not even an empty folder is replaced";
}

TEST_F(KeldRecycleTest, WhatIsInTheWayOfAFolderInTheBinIsKept) {
    Write("a", "once a file");
    ASSERT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, "a"));
    ASSERT_FALSE(Exists(m_share + "/a"));
    Write("a/f", "now a folder");
    Write("a/g", "now a folder");
    ASSERT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, "a/f"));
    ASSERT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, "a/g"));
    EXPECT_EQ("once a file", ReadWholeFile(Bin("a")));
    EXPECT_EQ((Names{"f", "g"}), NamesIn(Bin("a (1)")));
}

TEST_F(KeldRecycleTest, FoldersInTheBinAreMadeLikeTheOriginals) {
    Write("private/deeper/f", "text");
    ASSERT_EQ(0, chmod((m_share + "/private").c_str(), 0700));
    ASSERT_EQ(0, chmod((m_share + "/private/deeper").c_str(), 01755));
    const mode_t before = umask(077);
    const int code = RecycleFile(m_share, "private/deeper/f");
    umask(before);
    ASSERT_EQ(KELDERR_SUCCESS, code);
    EXPECT_EQ(0700U, StatOf(Bin("private")).st_mode & 07777);
    EXPECT_EQ(01755U, StatOf(Bin("private/deeper")).st_mode & 07777);
    EXPECT_EQ(0777U, StatOf(m_share + "/#recycle").st_mode & 07777);
}

TEST_F(KeldRecycleTest, ABinForAdministratorsIsClosedToOthers) {
    m_dir.MakeDir("share/d");
    ASSERT_EQ(KELDERR_SUCCESS, RecycleFolder(m_share, "d", 1));
    EXPECT_EQ(0700U, StatOf(m_share + "/#recycle").st_mode & 07777);
    const std::string other = m_dir.MakeDir("other");
    const TestShares shares({other}, "recycle_bin = yes\nrecycle_bin_admin_only = yes\n");
    m_dir.Write("other/f", "text");
    ASSERT_EQ(KELDERR_SUCCESS, RecycleFile(other, "f"));
    EXPECT_EQ(0700U, StatOf(other + "/#recycle").st_mode & 07777) << "as the share's settings say";
}

TEST_F(KeldRecycleTest, TheBinItselfAndTheShareItselfAreRefused) {
    Write("#recycle/old", "old");
    m_dir.MakeDir("share/#recycle/folder");
    for (const char* path : {"", "/", ".", "./", "..", "a/../b", "../outside", "#recycle",
                             "#recycle/", "./#recycle", "//#recycle/folder", "#recycle/old"}) {
        EXPECT_EQ(KELDERR_INVALID_ARGUMENT, RecycleFolder(m_share, path)) << path;
        EXPECT_EQ(KELDERR_INVALID_ARGUMENT, RecycleFile(m_share, path)) << path;
    }
    EXPECT_EQ((Names{"folder", "old"}), NamesIn(m_share + "/#recycle"));
    EXPECT_GT(0, KELDRecycleUnlinkFileWithSharePath(nullptr, "f"));
    EXPECT_GT(0, KELDRecycleUnlinkFileWithSharePath(m_share.c_str(), nullptr));
    EXPECT_GT(0, KELDRecycleRmDirWithSharePath("", "f", 0, 0));
}

TEST_F(KeldRecycleTest, AFolderOfTheBinsNameFurtherDownIsAFolderLikeOthers) {
    Write("a/#recycle/f", "text");
    EXPECT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, "a/#recycle/f"));
    EXPECT_EQ("text", ReadWholeFile(Bin("a/#recycle/f")));
}

TEST_F(KeldRecycleTest, WhatIsMissingOrOfTheOtherKindIsToldAndStays) {
    Write("d/f", "text");
    EXPECT_EQ(KELDERR_SRC_MISS_PATH, RecycleFile(m_share, "none"));
    EXPECT_EQ(KELDERR_SRC_MISS_PATH, RecycleFile(m_share, "none/f"));
    EXPECT_EQ(KELDERR_SRC_MISS_PATH, RecycleFile(m_share, "d/f/g"));
    EXPECT_EQ(KELDERR_SRC_MISS_PATH, RecycleFolder(m_share + "/none", "d"));
    EXPECT_EQ(KELDERR_INVALID_ARGUMENT, RecycleFile(m_share, "d"));
    EXPECT_EQ(KELDERR_INVALID_ARGUMENT, RecycleFolder(m_share, "d/f"));
    EXPECT_EQ("text", ReadWholeFile(m_share + "/d/f"));
    EXPECT_FALSE(Exists(m_share + "/#recycle")) << "made only when something goes there";
}

TEST_F(KeldRecycleTest, ALinkIsMovedItselfAndNeverFollowed) {
    const std::string victim = m_dir.Write("outside/victim", "untouched");
    ASSERT_EQ(0, symlink(victim.c_str(), (m_share + "/link").c_str()));
    ASSERT_EQ(0, symlink(m_outside.c_str(), (m_share + "/folder").c_str()));
    EXPECT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, "link"));
    EXPECT_TRUE(S_ISLNK(StatOf(Bin("link")).st_mode));
    EXPECT_EQ(KELDERR_FILE_OPERATION, RecycleFile(m_share, "folder/victim"));
    EXPECT_EQ(KELDERR_INVALID_ARGUMENT, RecycleFolder(m_share, "folder"));
    EXPECT_EQ("untouched", ReadWholeFile(victim));
}

TEST_F(KeldRecycleTest, ALinkInPlaceOfTheBinIsRefused) {
    Write("f", "text");
    ASSERT_EQ(0, symlink(m_outside.c_str(), (m_share + "/#recycle").c_str()));
    EXPECT_EQ(KELDERR_FILE_OPERATION, RecycleFile(m_share, "f"));
    EXPECT_EQ(Names{}, NamesIn(m_outside));
    EXPECT_EQ("text", ReadWholeFile(m_share + "/f"));
}

TEST_F(KeldRecycleTest, ALinkInsideTheBinIsNotFollowed) {
    Write("a/f", "text");
    m_dir.MakeDir("share/#recycle");
    ASSERT_EQ(0, symlink(m_outside.c_str(), Bin("a").c_str()));
    EXPECT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, "a/f"));
    EXPECT_EQ(Names{}, NamesIn(m_outside));
    EXPECT_EQ("text", ReadWholeFile(Bin("a (1)/f")));
}

TEST_F(KeldRecycleTest, NothingLeavesTheShareWhileAFolderIsSwappedForALink) {
    m_dir.Write("outside/f", "secret");
    const std::string folder = m_dir.MakeDir("share/folder");
    std::atomic<bool> is_over{false};
    std::thread swapper([&] {
        const std::string aside = m_share + "/aside";
        while (!is_over) {
            if (rename(folder.c_str(), aside.c_str()) != 0) continue;
            EXPECT_EQ(0, symlink(m_outside.c_str(), folder.c_str()));
            EXPECT_EQ(0, unlink(folder.c_str()));
            EXPECT_EQ(0, rename(aside.c_str(), folder.c_str()));
        }
    });
    int refused = 0;
    for (int i = 0; i < 1000000 && (i < 3000 || refused == 0); ++i) {
        if (RecycleFile(m_share, "folder/f") == KELDERR_FILE_OPERATION) ++refused;
    }
    is_over = true;
    swapper.join();
    EXPECT_EQ(Names{"f"}, NamesIn(m_outside));
    EXPECT_LT(0, refused) << "the link was never met: the test has shown nothing";
}

TEST_F(KeldRecycleTest, NamesOfAnyBytesAndTheLongestNamesAreMoved) {
    for (const std::string& name : {std::string("new\nline"), std::string("per%s%n"),
                                    std::string("no \xff\xfe utf-8"), std::string(255, 'n')}) {
        Write(name, name);
        EXPECT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, name));
        EXPECT_EQ(name, ReadWholeFile(Bin(name)));
    }
    Write(std::string(255, 'n'), "again");
    EXPECT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, std::string(255, 'n')));
    EXPECT_EQ("again", ReadWholeFile(Bin(std::string(251, 'n') + " (1)")));
}

TEST_F(KeldRecycleTest, OfEqualNamesFromManyThreadsNoneIsLost) {
    constexpr int EACH = 50;
    std::vector<std::thread> threads;
    std::atomic<int> failures{0};
    std::atomic<int> placed{0};
    m_dir.MakeDir("share/d");
    for (int thread = 0; thread < 4; ++thread) {
        threads.emplace_back([&, thread] {
            for (int i = 0; i < EACH; ++i) {
                // What one thread has put there, another may move.
                const std::string file = Write(std::to_string(thread), "text");
                if (link(file.c_str(), (m_share + "/d/f").c_str()) == 0) ++placed;
                const int code = RecycleFile(m_share, "d/f");
                if (code != KELDERR_SUCCESS && code != KELDERR_SRC_MISS_PATH) ++failures;
                const std::string own = "t/" + std::to_string(thread);
                m_dir.Write("share/" + own + "/f", std::to_string(i));
                if (RecycleFolder(m_share, own) != KELDERR_SUCCESS) ++failures;
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(0, failures);
    EXPECT_EQ(size_t{4 * EACH}, NamesIn(Bin("t")).size());
    EXPECT_EQ(Names{}, NamesIn(m_share + "/d"));
    EXPECT_EQ(placed, static_cast<int>(NamesIn(Bin("d")).size()));
    EXPECT_LT(EACH, placed);
}

TEST_F(KeldRecycleTest, DeepFoldersAreMovedWholeAndFromWithin) {
    const std::string component(100, 'd');
    std::string relative;
    UniqueFd at(open(m_share.c_str(), O_PATH | O_DIRECTORY));
    for (int depth = 0; depth < 2000; ++depth) {
        ASSERT_EQ(0, mkdirat(at.Get(), component.c_str(), 0777));
        at.Reset(openat(at.Get(), component.c_str(), O_PATH | O_DIRECTORY));
        relative += (depth == 0 ? "" : "/") + component;
    }
    const UniqueFd file(openat(at.Get(), "f", O_WRONLY | O_CREAT, 0644));
    ASSERT_TRUE(file.IsValid());
    EXPECT_EQ(KELDERR_SUCCESS, RecycleFile(m_share, relative + "/f"));
    EXPECT_EQ(KELDERR_SUCCESS, RecycleFolder(m_share, relative));
    EXPECT_EQ(KELDERR_SUCCESS, RecycleFolder(m_share, component));
    EXPECT_EQ((Names{component, component + " (1)"}), NamesIn(m_share + "/#recycle"));
    RunCommand("rm -rf '" + m_share + "'");
}

struct NumberedNameCase {
    const char* name;
    bool isFolder;
    size_t maxBytes;
    const char* expected;
};
const NumberedNameCase NUMBERED_NAMES[] = {
    {"a.txt",                            false, 0,  "a (7).txt"               },
    {"a.txt",                            true,  0,  "a.txt (7)"               },
    {"a",                                false, 0,  "a (7)"                   },
    {".profile",                         false, 0,  ".profile (7)"            },
    {".a.b",                             false, 0,  ".a (7).b"                },
    {"a.",                               false, 0,  "a (7)."                  },
    {"abcdefgh.txt",                     false, 12, "abcd (7).txt"            },
    {"abcd.txt",                         false, 12, "abcd (7).txt"            },
    {"abcdefgh",                         true,  8,  "abcd (7)"                },
    {"a.abcdefgh",                       false, 10, "a.abcd (7)"              },
    {"\xc3\xa4\xc3\xa4\xc3\xa4",         false, 9,  "\xc3\xa4\xc3\xa4 (7)"    },
    {"\xf0\x9f\x98\x80\xf0\x9f\x98\x80", true,  11, "\xf0\x9f\x98\x80 (7)"    },
    {"\x80\x80\x80\x80\x80\x80\x80\x80", true,  9,  "\x80\x80\x80\x80\x80 (7)"},
};

TEST(KeldRecycleNameTest, NumbersStandBeforeTheExtensionAndLongNamesAreCutAtACharacter) {
    for (const NumberedNameCase& row : NUMBERED_NAMES) {
        EXPECT_EQ(row.expected, keld_host::NumberedName(row.name, 7, row.isFolder, row.maxBytes))
            << row.name;
    }
}

class KeldRecycleDiskTest : public ::testing::TestWithParam<const char*> {};

TEST_P(KeldRecycleDiskTest, NothingInTheBinIsEverReplaced) {
    const std::string reason = ScratchDisk::WhyNot(GetParam());
    if (!reason.empty()) GTEST_SKIP() << reason;
    const ScratchDisk disk(GetParam(), std::string(GetParam()) == "xfs" ? 300 : 128);
    const TestShares shares({disk.Path()});
    const auto write = [&](const std::string& name, const std::string& content) {
        const UniqueFd file(open((disk.Path() + "/" + name).c_str(), O_WRONLY | O_CREAT, 0644));
        EXPECT_EQ(static_cast<ssize_t>(content.size()),
                  ::write(file.Get(), content.data(), content.size()));
    };
    for (const char* content : {"first", "second"}) {
        write("f.txt", content);
        EXPECT_EQ(KELDERR_SUCCESS, RecycleFile(disk.Path(), "f.txt"));
        ASSERT_EQ(0, mkdir((disk.Path() + "/d").c_str(), 0777));
        write("d/f", content);
        EXPECT_EQ(KELDERR_SUCCESS, RecycleFolder(disk.Path(), "d"));
        ASSERT_EQ(0, mkdir((disk.Path() + "/empty").c_str(), 0777));
        EXPECT_EQ(KELDERR_SUCCESS, RecycleFolder(disk.Path(), "empty"));
    }
    const std::string bin = disk.Path() + "/#recycle";
    EXPECT_EQ((Names{"d", "d (1)", "empty", "empty (1)", "f (1).txt", "f.txt"}), NamesIn(bin));
    EXPECT_EQ("first", ReadWholeFile(bin + "/f.txt"));
    EXPECT_EQ("second", ReadWholeFile(bin + "/f (1).txt"));
    EXPECT_EQ("first", ReadWholeFile(bin + "/d/f"));
    EXPECT_EQ("second", ReadWholeFile(bin + "/d (1)/f"));
    EXPECT_EQ(Names{"#recycle"}, NamesIn(disk.Path()));
    if (std::string(GetParam()) == "exfat") {
        EXPECT_EQ(KELDERR_INVALID_ARGUMENT, RecycleFolder(disk.Path(), "#RECYCLE"));
        EXPECT_EQ(KELDERR_INVALID_ARGUMENT, RecycleFile(disk.Path(), "#Recycle/f.txt"));
    }
    write("long", "first");
    const std::string name(255, 'n');
    for (int i = 0; i < 2; ++i) {
        write(name, "x");
        EXPECT_EQ(KELDERR_SUCCESS, RecycleFile(disk.Path(), name));
    }
    EXPECT_TRUE(Exists(bin + "/" + std::string(251, 'n') + " (1)"));
}

INSTANTIATE_TEST_SUITE_P(Disks, KeldRecycleDiskTest,
                         ::testing::Values("ext4", "xfs", "btrfs", "exfat"),
                         [](const auto& row) { return std::string(row.param); });

TEST_F(KeldRecycleTest, WhatLiesOnAnotherFileSystemInsideTheShareStaysAndIsTold) {
    const std::string reason = ScratchDisk::WhyNot("ext4");
    if (!reason.empty()) GTEST_SKIP() << reason;
    const std::string mounted = m_dir.MakeDir("share/mounted");
    const ScratchDisk disk("ext4", 16);
    ASSERT_EQ(0, mount(disk.Path().c_str(), mounted.c_str(), nullptr, MS_BIND, nullptr));
    Write("mounted/d/f", "text");
    {
        const LogCapture log;
        EXPECT_EQ(KELDERR_FILE_OPERATION, RecycleFile(m_share, "mounted/d/f"));
        EXPECT_EQ(KELDERR_FILE_OPERATION, RecycleFolder(m_share, "mounted/d"));
        EXPECT_EQ(KELDERR_FILE_OPERATION, RecycleFolder(m_share, "mounted"));
        EXPECT_TRUE(log.Contains("mount point or on another file system than the recycle bin"));
    }
    EXPECT_EQ("text", ReadWholeFile(mounted + "/d/f"));
    ASSERT_EQ(0, umount(mounted.c_str()));
}

}  // namespace
