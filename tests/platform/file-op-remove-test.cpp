#include <dirent.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <linux/fs.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <thread>
#include <utility>

#include "deep-tree.h"
#include "fake/fake-keld.h"
#include "platform/tree-remover.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/confined-path.h"
#include "utils/file-op.h"

namespace {

namespace fs = std::filesystem;
using testing::UnorderedElementsAre;
using Arguments = std::vector<std::string>;

class FSRemoveTest : public testing::Test {
protected:
    // Makes a file that nobody can remove, root included, until the destructor.
    bool MakeImmutable(const std::string& path) {
        const UniqueFd fd(open(path.c_str(), O_RDONLY | O_CLOEXEC));
        int flags = FS_IMMUTABLE_FL;
        if (ioctl(fd.Get(), FS_IOC_SETFLAGS, &flags) != 0) return false;
        m_immutable.push_back(path);
        return true;
    }
    ~FSRemoveTest() override {
        FakeKeld::Reset();  // its actions point into the test
        for (const std::string& path : m_immutable) {
            const UniqueFd fd(open(path.c_str(), O_RDONLY | O_CLOEXEC));
            int flags = 0;
            ioctl(fd.Get(), FS_IOC_SETFLAGS, &flags);
        }
    }

    TempDir m_dir;
    LogCapture m_log;
    FakeKeld& m_fake = FakeKeld::Reset();
    std::vector<std::string> m_immutable;
};

TEST_F(FSRemoveTest, AFileGoesWithItsAttributes) {
    const std::string path = m_dir.Write("file", "");
    EXPECT_EQ(0, FSRemove(path));
    EXPECT_FALSE(fs::exists(path));
    EXPECT_THAT(m_fake.CallsOf("KELDEARemove"), UnorderedElementsAre(Arguments{path}));
}

TEST_F(FSRemoveTest, NothingIsRemovedFromNothing) {
    EXPECT_EQ(-1, FSRemove(""));
    EXPECT_EQ(-1, FSRemove("/")) << "least of all the whole system";
    EXPECT_EQ(-1, FSRemove(m_dir / std::string(256, 'x')));
    EXPECT_EQ(0, FSRemove(m_dir / "missing"));
    EXPECT_EQ(0, m_fake.CallCount("KELDEARemove"));
}

TEST_F(FSRemoveTest, AFolderGoesWithAllItHolds) {
    const std::string top = m_dir.MakeDir("top");
    m_dir.Write("top/a\n'\"%s", "");
    m_dir.Write("top/sub/\xff\xfe", "");
    m_dir.Write("top/sub/@eaDir/x", "");
    ASSERT_EQ(0, mkfifo((top + "/fifo").c_str(), 0600));
    EXPECT_EQ(0, FSRemove(top));
    EXPECT_FALSE(fs::exists(top));
    EXPECT_THAT(m_fake.CallsOf("KELDEARemove"),
                UnorderedElementsAre(Arguments{top + "/a\n'\"%s"}, Arguments{top + "/fifo"},
                                     Arguments{top + "/sub/\xff\xfe"}, Arguments{top + "/sub"},
                                     Arguments{top + "/sub/@eaDir/x"},
                                     Arguments{top + "/sub/@eaDir"}, Arguments{top}));
    EXPECT_EQ(Arguments{top}, m_fake.CallsOf("KELDEARemove").back());
}

TEST_F(FSRemoveTest, LinksGoAndWhatTheyLeadToStays) {
    const std::string outside = m_dir.Write("outside/file", "outside");
    m_dir.MakeDir("top");
    fs::create_symlink(outside, m_dir / "top/file");
    fs::create_directory_symlink(m_dir / "outside", m_dir / "top/dir");
    fs::create_symlink("nowhere", m_dir / "top/dangling");
    fs::create_directory_symlink(m_dir / "outside", m_dir / "link");
    EXPECT_EQ(0, FSRemove(m_dir / "top"));
    EXPECT_EQ(0, FSRemove(m_dir / "link/")) << "a slash behind it does not lead through it";
    EXPECT_FALSE(fs::is_symlink(m_dir / "link"));
    EXPECT_EQ("outside", ReadWholeFile(outside));
}

TEST_F(FSRemoveTest, BelowARootNothingIsReachedThroughALink) {
    const std::string outside = m_dir.Write("outside/sub/file", "outside");
    m_dir.Write("root/sub/file", "");
    fs::create_directory_symlink(m_dir / "outside", m_dir / "root/link");
    const ConfinedRoot root(m_dir / "root");
    EXPECT_EQ(-1, FSRemove(m_dir / "root/link/sub"));
    EXPECT_EQ(-1, FSRemove(m_dir / "root/link/sub/file"));
    EXPECT_EQ(-1, FSRemove(m_dir / "root/../outside"));
    EXPECT_EQ("outside", ReadWholeFile(outside));
    EXPECT_EQ(0, FSRemove(m_dir / "root/sub"));
    EXPECT_EQ(0, FSRemove(m_dir / "root/link"));
    EXPECT_FALSE(fs::exists(m_dir / "root/sub"));
}

TEST_F(FSRemoveTest, AFolderMayBeMuchDeeperThanAPathIsLong) {
    const std::string top = m_dir.MakeDir("top");
    MakeDeepTree(top, 2500, "folder-of-some-length");
    const ConfinedRoot root(m_dir.Path());
    EXPECT_EQ(0, FSRemove(top));
    EXPECT_FALSE(fs::exists(top));
    EXPECT_EQ(2502, m_fake.CallCount("KELDEARemove"));
}

TEST_F(FSRemoveTest, ADeepFolderWithBranchesOnTheWayBackGoes) {
    const std::string top = m_dir.MakeDir("top");
    // Two folders at each level: both have to be removed through a folder that was closed
    // meanwhile.
    UniqueFd fd(open(top.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    for (int i = 0; i < 200; ++i) {
        for (const char* name : {"a", "b", "c"}) ASSERT_EQ(0, mkdirat(fd.Get(), name, 0777));
        const UniqueFd b(openat(fd.Get(), "b", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        ASSERT_EQ(0, mkdirat(b.Get(), "below", 0777));
        fd = UniqueFd(openat(fd.Get(), i % 2 == 0 ? "a" : "c", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    }
    EXPECT_EQ(0, FSRemove(top));
    EXPECT_FALSE(fs::exists(top));
}

size_t OpenDescriptors() {
    size_t count = 0;
    for ([[maybe_unused]] const auto& entry : fs::directory_iterator("/proc/self/fd")) ++count;
    return count;
}

TEST_F(FSRemoveTest, OnlySoManyFoldersAreOpenAtATime) {
    const std::string top = m_dir.MakeDir("top");
    MakeDeepTree(top, 300, "d");
    const size_t before = OpenDescriptors();
    size_t most = 0;
    m_fake.OnCall("KELDEARemove", [&] { most = std::max(most, OpenDescriptors()); });
    EXPECT_EQ(0, FSRemove(top));
    EXPECT_GT(most, before);
    EXPECT_LE(most, before + TreeRemover::MAX_OPEN + 4);
    EXPECT_EQ(before, OpenDescriptors());
}

TEST_F(FSRemoveTest, AWideFolderGoes) {
    const std::string top = m_dir.MakeDir("top");
    for (int i = 0; i < 2000; ++i) {
        const std::string path = top + "/" + std::string(100, 'x') + std::to_string(i);
        if (i % 10 == 0)
            ASSERT_EQ(0, mkdir(path.c_str(), 0777));
        else
            ASSERT_TRUE(UniqueFd(creat(path.c_str(), 0666)).IsValid());
    }
    EXPECT_EQ(0, FSRemove(top));
    EXPECT_FALSE(fs::exists(top));
}

TEST_F(FSRemoveTest, AnAttributeStoreThatCannotBeDroppedIsAFailureButTheFileIsGone) {
    const std::string file = m_dir.Write("file", "");
    m_fake.FailCall("KELDEARemove");
    EXPECT_EQ(-3, FSRemove(file));
    EXPECT_FALSE(fs::exists(file));
    EXPECT_TRUE(m_log.Contains("[ERR] Failed to remove ea '" + file + "', ["));

    m_dir.Write("top/file", "");
    m_fake.FailCall("KELDEARemove");
    EXPECT_EQ(-3, FSRemove(m_dir / "top"));
    EXPECT_FALSE(fs::exists(m_dir / "top")) << "the rest goes nevertheless";
}

TEST_F(FSRemoveTest, WhatCannotBeRemovedStaysWithItsFoldersAndTheRestGoes) {
    for (const char* name : {"top/a/1", "top/keep/fixed", "top/keep/2", "top/z/3"}) {
        m_dir.Write(name, "");
    }
    if (!MakeImmutable(m_dir / "top/keep/fixed")) GTEST_SKIP() << "cannot make a file immutable";
    EXPECT_EQ(-3, FSRemove(m_dir / "top"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove file '" + (m_dir / "top/keep/fixed") + "'"));
    EXPECT_EQ(1u, m_log.Lines().size()) << "told once, not for each folder above";
    EXPECT_TRUE(fs::exists(m_dir / "top/keep/fixed"));
    for (const char* name : {"top/a", "top/keep/2", "top/z"})
        EXPECT_FALSE(fs::exists(m_dir / name));
    EXPECT_EQ(-3, FSRemove(m_dir / "top/keep/fixed"));
    EXPECT_EQ(2, m_log.Count("[ERR] Failed to remove file '" + (m_dir / "top/keep/fixed") + "'"));
}

TEST_F(FSRemoveTest, AFolderThatCannotBeOpenedIsTold) {
    m_dir.Write("top/closed/file", "");
    rlimit old{};
    ASSERT_EQ(0, getrlimit(RLIMIT_NOFILE, &old));
    const int next = UniqueFd(open("/", O_PATH | O_CLOEXEC)).Get();
    rlimit one_more = old;
    one_more.rlim_cur = static_cast<rlim_t>(next) + 1;  // "top" opens, what lies in it does not
    ASSERT_EQ(0, setrlimit(RLIMIT_NOFILE, &one_more));
    EXPECT_EQ(-3, FSRemove(m_dir / "top"));
    ASSERT_EQ(0, setrlimit(RLIMIT_NOFILE, &old));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to open dir '" + (m_dir / "top/closed") + "'"));
    EXPECT_TRUE(fs::exists(m_dir / "top/closed/file"));
}

// A file system in memory, mounted on a folder for the length of a test.
class MountedFolder {
public:
    explicit MountedFolder(std::string path) : m_path(std::move(path)) {
        m_is_mounted = HasPrivateMounts() &&
                       mount("none", m_path.c_str(), "tmpfs", 0, "size=1m,mode=755") == 0;
    }
    ~MountedFolder() { EXPECT_EQ(m_is_mounted ? 0 : -1, umount(m_path.c_str())); }
    MountedFolder(const MountedFolder&) = delete;
    MountedFolder& operator=(const MountedFolder&) = delete;

    [[nodiscard]] bool IsMounted() const { return m_is_mounted; }

private:
    // Nobody else sees what is mounted.
    static bool HasPrivateMounts() {
        static const bool is_private =
            unshare(CLONE_NEWNS) == 0 &&
            mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0;
        return is_private;
    }

    std::string m_path;
    bool m_is_mounted;
};

TEST_F(FSRemoveTest, WhatIsMountedInAFolderStaysWithAllItHolds) {
    m_dir.Write("top/a/1", "");
    m_dir.Write("top/z/2", "");
    const std::string mounted = m_dir.MakeDir("top/m/mounted");
    const MountedFolder disk(mounted);
    if (!disk.IsMounted()) GTEST_SKIP() << "mounting needs root";
    m_dir.Write("top/m/3", "");
    m_dir.Write("top/m/mounted/sub/file", "bytes");
    EXPECT_EQ(-3, FSRemove(m_dir / "top"));
    EXPECT_EQ("bytes", ReadWholeFile(mounted + "/sub/file"));
    EXPECT_THAT(m_log.Lines(), testing::ElementsAre("[ERR] Failed to remove '" + mounted +
                                                    "', another file system is mounted there"));
    for (const char* name : {"top/a", "top/z", "top/m/3"}) EXPECT_FALSE(fs::exists(m_dir / name));

    m_log.Clear();
    EXPECT_EQ(-3, FSRemove(mounted)) << "nor is it emptied when it is meant itself";
    EXPECT_EQ("bytes", ReadWholeFile(mounted + "/sub/file"));
    EXPECT_TRUE(m_log.Contains("another file system is mounted there"));
    EXPECT_EQ(0, FSRemove(mounted + "/sub")) << "within it a folder is like any other";
    EXPECT_FALSE(fs::exists(mounted + "/sub"));
}

TEST_F(FSRemoveTest, AFolderThatIsSwappedForALinkDoesNotLeadTheRemovalOut) {
    for (int i = 0; i < 50; ++i) m_dir.Write("outside/sub/" + std::to_string(i), "");
    const ConfinedRoot root(m_dir / "root");
    const std::string swapped = m_dir / "root/swap";
    const std::string link = m_dir / "link";
    for (int round = 0; round < 200; ++round) {
        for (int i = 0; i < 20; ++i) m_dir.Write("root/swap/sub/" + std::to_string(i), "");
        fs::create_directory_symlink(m_dir / "outside", link);
        std::atomic<bool> is_done{false};
        std::thread swapping([&] {
            while (!is_done) {
                renameat2(AT_FDCWD, swapped.c_str(), AT_FDCWD, link.c_str(), RENAME_EXCHANGE);
            }
        });
        (void)FSRemove(swapped + "/sub");
        (void)FSRemove(swapped);
        is_done = true;
        swapping.join();
        fs::remove_all(swapped);
        fs::remove_all(link);
    }
    size_t left = 0;
    for ([[maybe_unused]] const auto& entry : fs::directory_iterator(m_dir / "outside/sub")) ++left;
    EXPECT_EQ(50u, left);
}

TEST_F(FSRemoveTest, AFolderThatIsFilledMeanwhileDoesNotKeepTheRemovalForEver) {
    const std::string top = m_dir.MakeDir("top");
    m_dir.Write("top/first", "");
    int count = 0;
    m_fake.OnCall("KELDEARemove", [&] {
        if (count < 100000) UniqueFd(creat((top + "/" + std::to_string(++count)).c_str(), 0666));
    });
    EXPECT_EQ(-3, FSRemove(top));
    EXPECT_LT(count, 100000);
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove file '" + top + "'"));
}

TEST_F(FSRemoveTest, WhatAppearsWhileAFolderIsEmptiedGoesToo) {
    const std::string top = m_dir.MakeDir("top");
    m_dir.Write("top/first", "");
    bool is_first = true;
    m_fake.OnCall("KELDEARemove", [&] {
        if (is_first) m_dir.Write("top/late/file", "");
        is_first = false;
    });
    EXPECT_EQ(0, FSRemove(top));
    EXPECT_FALSE(fs::exists(top));
}

TEST_F(FSRemoveTest, AFolderThatIsMovedAwayUnderWayEndsTheRemovalThere) {
    const std::string top = m_dir.MakeDir("top");
    MakeDeepTree(top, 100, "d", true);
    m_dir.MakeDir("elsewhere");
    bool is_first = true;
    m_fake.OnCall("KELDEARemove", [&] {
        if (!is_first || fs::exists(DeepPath(top, 90, "d") + "/f")) return;
        is_first = false;  // now the folders up to about 58 are closed
        fs::rename(DeepPath(top, 20, "d"), m_dir / "elsewhere/moved");
        fs::create_directories(DeepPath(top, 20, "d"));
    });
    EXPECT_EQ(-3, FSRemove(top));
    EXPECT_TRUE(m_log.Contains("[ERR] Failed to open dir '"));
    EXPECT_TRUE(fs::exists(m_dir / "elsewhere")) << "the folder it was moved to is not touched";
    EXPECT_TRUE(fs::exists(DeepPath(top, 20, "d"))) << "nor is what took its place";
}

}  // namespace
