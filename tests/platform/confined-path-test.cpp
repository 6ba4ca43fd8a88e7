#include "utils/confined-path.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <filesystem>
#include <optional>
#include <thread>

#include "deep-tree.h"
#include "support/temp-dir.h"
#include "utils/file-op.h"

namespace {

namespace fs = std::filesystem;

// Everything holds with openat2 and, as on older kernels, without.
class ConfinedPathTest : public testing::TestWithParam<bool> {
protected:
    ConfinedPathTest() { ConfinedPathUseOpenat2(GetParam()); }
    ~ConfinedPathTest() override { ConfinedPathUseOpenat2(true); }

    void SetUp() override {
        m_dir.Write("root/sub/file", "inside");
        m_dir.Write("outside/file", "outside");
        fs::create_directory_symlink(m_dir / "outside", m_dir / "root/away");
        fs::create_directory_symlink("sub", m_dir / "root/near");
        fs::create_symlink(m_dir / "outside/file", m_dir / "root/sub/link");
        m_root.emplace(m_dir / "root");
        m_fd = UniqueFd(open((m_dir / "root").c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    }

    // The errno of opening `relative` below the root; 0 when it opens.
    int OpenErrno(const std::string& relative, int flags = O_RDONLY) {
        const UniqueFd fd = OpenBeneath(m_fd.Get(), relative, flags);
        return fd.IsValid() ? 0 : errno;
    }

    TempDir m_dir;
    std::optional<ConfinedRoot> m_root;
    UniqueFd m_fd;
};

TEST_P(ConfinedPathTest, OpensWhatLiesBelow) {
    EXPECT_EQ(0, OpenErrno("sub/file"));
    EXPECT_EQ(0, OpenErrno("sub//./file"));
    EXPECT_EQ(0, OpenErrno("sub", O_RDONLY | O_DIRECTORY));
    EXPECT_EQ(0, OpenErrno("sub/", O_RDONLY | O_DIRECTORY));
    EXPECT_EQ(0, OpenErrno("", O_RDONLY | O_DIRECTORY)) << "the folder itself";
    EXPECT_EQ(ENOENT, OpenErrno("sub/missing"));
    EXPECT_EQ(ENOENT, OpenErrno("missing/file"));
    EXPECT_EQ(ENOTDIR, OpenErrno("sub/file/below"));
}

TEST_P(ConfinedPathTest, CreatesWithTheModeAsked) {
    const UniqueFd fd = OpenBeneath(m_fd.Get(), "sub/new", O_WRONLY | O_CREAT | O_EXCL, 0640);
    ASSERT_TRUE(fd.IsValid());
    struct stat st {};
    ASSERT_EQ(0, fstat(fd.Get(), &st));
    EXPECT_EQ(0640u, st.st_mode & 07777);
    EXPECT_EQ(FD_CLOEXEC, fcntl(fd.Get(), F_GETFD) & FD_CLOEXEC);
}

TEST_P(ConfinedPathTest, FollowsNoLinkOnTheWayOrAtTheEnd) {
    EXPECT_EQ(ELOOP, OpenErrno("away/file"));
    EXPECT_EQ(ELOOP, OpenErrno("near/file")) << "not even one that stays below";
    EXPECT_EQ(ELOOP, OpenErrno("away", O_RDONLY | O_DIRECTORY));
    EXPECT_EQ(ELOOP, OpenErrno("sub/link"));
    EXPECT_EQ(ELOOP, OpenErrno("sub/link", O_WRONLY | O_CREAT));
    EXPECT_EQ("outside", ReadWholeFile(m_dir / "outside/file"));
}

TEST_P(ConfinedPathTest, OpensALinkItselfWhenAsked) {
    const UniqueFd fd = OpenBeneath(m_fd.Get(), "sub/link", O_PATH | O_NOFOLLOW);
    struct stat st {};
    ASSERT_EQ(0, fstat(fd.Get(), &st));
    EXPECT_TRUE(S_ISLNK(st.st_mode));
}

TEST_P(ConfinedPathTest, DotDotDoesNotLeaveTheRoot) {
    EXPECT_EQ(EXDEV, OpenErrno("../outside/file"));
    EXPECT_EQ(EXDEV, OpenErrno(".."));
    EXPECT_EQ(EXDEV, OpenErrno("sub/../../outside/file"));
    for (const char* path : {"/..", "/../outside", "/sub/../../outside/file"}) {
        EXPECT_EQ(EXDEV, PathPlace(m_dir / "root" + path).Error()) << path;
    }
}

TEST_P(ConfinedPathTest, ReachesPathsLongerThanOneCallTakes) {
    MakeDeepTree(m_dir / "root", 2000, "folder");
    const std::string path = DeepPath(m_dir / "root", 2000, "folder") + "/f";
    ASSERT_GT(path.size(), 3u * 4096);
    const PathPlace place(path);
    ASSERT_TRUE(place.IsReached()) << place.Error();
    EXPECT_STREQ("f", place.Name());
    struct stat st {};
    EXPECT_EQ(0, fstatat(place.DirFd(), place.Name(), &st, AT_SYMLINK_NOFOLLOW));
    EXPECT_EQ(0, OpenErrno(path.substr((m_dir / "root").size() + 1)));
    EXPECT_EQ(ENOENT, OpenErrno(path.substr((m_dir / "root").size() + 1) + "x"));
    EXPECT_EQ(ENAMETOOLONG, OpenErrno(std::string(5000, 'x')));
    EXPECT_EQ(0, FSRemove(m_dir / "root/folder"));
}

TEST_P(ConfinedPathTest, APlaceBelowARootIsConfined) {
    const PathPlace place(m_dir / "root/sub/file");
    EXPECT_TRUE(place.IsReached());
    EXPECT_TRUE(place.IsConfined());
    EXPECT_NE(AT_FDCWD, place.DirFd());
    EXPECT_STREQ("file", place.Name());
    EXPECT_EQ(AT_SYMLINK_NOFOLLOW, place.FollowFlag());
    EXPECT_TRUE(place.Open(O_RDONLY).IsValid());
    EXPECT_STREQ("sub", PathPlace(m_dir / "root/sub///").Name());
}

TEST_P(ConfinedPathTest, APlaceThroughALinkIsNotReached) {
    const PathPlace place(m_dir / "root/away/file");
    EXPECT_FALSE(place.IsReached());
    EXPECT_EQ(ELOOP, place.Error());
    EXPECT_FALSE(place.Open(O_RDONLY).IsValid());
    EXPECT_EQ(ELOOP, errno);
    const PathPlace end(m_dir / "root/sub/link");
    EXPECT_TRUE(end.IsReached()) << "the folder of a link is";
    EXPECT_FALSE(end.Open(O_RDONLY).IsValid());
    EXPECT_EQ(ELOOP, errno);
}

TEST_P(ConfinedPathTest, ElsewhereTheUsualRulesHold) {
    m_root.reset();
    const PathPlace place(m_dir / "root/away/file");
    EXPECT_TRUE(place.IsReached());
    EXPECT_FALSE(place.IsConfined());
    EXPECT_EQ(AT_FDCWD, place.DirFd());
    EXPECT_EQ(0, place.FollowFlag());
    EXPECT_EQ(m_dir / "root/away/file", place.Name());
    EXPECT_TRUE(place.Open(O_RDONLY).IsValid());
}

TEST_P(ConfinedPathTest, ElsewhereLongPathsAreReachedToo) {
    m_root.reset();
    MakeDeepTree(m_dir.Path(), 1500, "folder");
    const std::string path = DeepPath(m_dir.Path(), 1500, "folder") + "/f";
    const PathPlace place(path + "//");
    ASSERT_TRUE(place.IsReached()) << place.Error();
    EXPECT_FALSE(place.IsConfined());
    EXPECT_STREQ("f", place.Name());
    EXPECT_TRUE(place.Open(O_RDONLY).IsValid());
    EXPECT_EQ(ENOENT, PathPlace(m_dir / "missing" + path).Error());
    EXPECT_FALSE(PathPlace(m_dir / std::string(5000, 'x')).Open(O_RDONLY).IsValid());
    EXPECT_EQ(ENAMETOOLONG, errno);
    EXPECT_EQ(ENAMETOOLONG, PathPlace(m_dir / std::string(5000, 'x') + "/a").Error());
    EXPECT_EQ(0, FSRemove(m_dir / "folder"));
}

TEST_P(ConfinedPathTest, TheInnermostRootCounts) {
    const ConfinedRoot inner(m_dir / "root/sub");
    EXPECT_EQ(m_dir / "root/sub", ConfinedRootOf(m_dir / "root/sub/file"));
    EXPECT_EQ(m_dir / "root", ConfinedRootOf(m_dir / "root/sub"));
    EXPECT_EQ(m_dir / "root", ConfinedRootOf(m_dir / "root/subway/file"));
    EXPECT_FALSE(ConfinedRootOf(m_dir / "root").has_value()) << "a root itself is not below it";
    EXPECT_FALSE(ConfinedRootOf(m_dir / "rooter/file").has_value());
    EXPECT_FALSE(ConfinedRootOf("").has_value());
}

TEST_P(ConfinedPathTest, ARootLastsAsLongAsOneObjectForIt) {
    std::optional<ConfinedRoot> again(std::in_place, m_dir / "root");
    m_root.reset();
    EXPECT_TRUE(PathPlace(m_dir / "root/sub/file").IsConfined());
    again.reset();
    EXPECT_FALSE(PathPlace(m_dir / "root/sub/file").IsConfined());
}

TEST_P(ConfinedPathTest, APlaceBelowAGivenRootNeedsNoRegistration) {
    m_root.reset();
    EXPECT_TRUE(PathPlace(m_dir / "root", m_dir / "root/sub/file").IsConfined());
    EXPECT_EQ(ELOOP, PathPlace(m_dir / "root", m_dir / "root/away/file").Error());
    EXPECT_FALSE(PathPlace(m_dir / "root", m_dir / "root").IsConfined());
}

TEST_P(ConfinedPathTest, ARootThatIsGoneReachesNothing) {
    fs::remove_all(m_dir / "root");
    EXPECT_EQ(ENOENT, PathPlace(m_dir / "root/sub/file").Error());
}

TEST_P(ConfinedPathTest, TheRoadToTheRootMayBeALink) {
    fs::create_directory_symlink(m_dir / "root", m_dir / "alias");
    const ConfinedRoot alias(m_dir / "alias");
    EXPECT_TRUE(PathPlace(m_dir / "alias/sub/file").Open(O_RDONLY).IsValid());
    EXPECT_EQ(ELOOP, PathPlace(m_dir / "alias/away/file").Error());
}

TEST_P(ConfinedPathTest, AScopeKeepsTheFolderThatWasChecked) {
    {
        const PathPlaceScope scope;
        EXPECT_TRUE(PathPlace(m_dir / "root/sub/file").IsReached());
        fs::rename(m_dir / "root/sub", m_dir / "root/moved");
        fs::create_directory_symlink(m_dir / "outside", m_dir / "root/sub");
        const UniqueFd file = PathPlace(m_dir / "root/sub/file").Open(O_RDONLY);
        char text[8] = "";
        ASSERT_EQ(6, read(file.Get(), text, sizeof(text)));
        EXPECT_STREQ("inside", text);
        EXPECT_EQ(ELOOP, PathPlace(m_dir / "root/away/file").Error()) << "others are checked too";
    }
    EXPECT_EQ(ELOOP, PathPlace(m_dir / "root/sub/file").Error()) << "the scope has ended";
}

TEST_P(ConfinedPathTest, AScopeRemembersNoFailure) {
    const PathPlaceScope scope;
    EXPECT_EQ(ENOENT, PathPlace(m_dir / "root/new/file").Error());
    fs::create_directory(m_dir / "root/new");
    EXPECT_TRUE(PathPlace(m_dir / "root/new/file").IsReached());
}

TEST_P(ConfinedPathTest, AScopeWithManyFoldersReachesThemAll) {
    const PathPlaceScope outer;
    const PathPlaceScope inner;
    for (int i = 0; i < 30; ++i) {
        const std::string name = "root/many" + std::to_string(i) + "/file";
        m_dir.Write(name, "x");
        EXPECT_TRUE(PathPlace(m_dir / name).Open(O_RDONLY).IsValid()) << i;
        EXPECT_TRUE(PathPlace(m_dir / name).Open(O_RDONLY).IsValid()) << i;
    }
}

TEST_P(ConfinedPathTest, FoldersKeptForTheNextScopeServeItOnce) {
    {
        const PathPlaceScope scope;
        EXPECT_TRUE(PathPlace(m_dir / "root/sub/file").IsReached());
        PathPlaceScope::KeepForNext();
    }
    fs::rename(m_dir / "root/sub", m_dir / "root/moved");
    {
        const PathPlaceScope scope;
        EXPECT_TRUE(PathPlace(m_dir / "root/sub/file").IsReached())
            << "the folder that was checked";
    }
    const PathPlaceScope scope;
    EXPECT_EQ(ENOENT, PathPlace(m_dir / "root/sub/file").Error());
}

TEST_P(ConfinedPathTest, FoldersKeptForTheNextScopeGrowOld) {
    {
        const PathPlaceScope scope;
        EXPECT_TRUE(PathPlace(m_dir / "root/sub/file").IsReached());
        PathPlaceScope::KeepForNext();
    }
    fs::rename(m_dir / "root/sub", m_dir / "root/moved");
    std::this_thread::sleep_for(std::chrono::milliseconds(PLACE_KEEP_MS + 20));
    const PathPlaceScope scope;
    EXPECT_EQ(ENOENT, PathPlace(m_dir / "root/sub/file").Error());
}

TEST_P(ConfinedPathTest, NoFolderStaysOpenOnceKeptOnesAreClosed) {
    const auto open_count = [] {
        return std::distance(fs::directory_iterator("/proc/self/fd"), fs::directory_iterator());
    };
    const auto before = open_count();
    {
        const PathPlaceScope scope;
        EXPECT_TRUE(PathPlace(m_dir / "root/sub/file").IsReached());
        PathPlaceScope::KeepForNext();
    }
    EXPECT_LT(before, open_count());
    PathPlaceScope::CloseKept();
    EXPECT_EQ(before, open_count());
}

TEST_P(ConfinedPathTest, AFolderThatIsSwappedForALinkNeverLeadsOut) {
    fs::create_directories(m_dir / "root/swap/deep");
    m_dir.Write("root/swap/deep/file", "inside");
    m_dir.Write("outside/deep/file", "outside");
    fs::create_directory_symlink(m_dir / "outside", m_dir / "link");
    struct stat outside {};
    ASSERT_EQ(0, stat((m_dir / "outside/deep/file").c_str(), &outside));

    std::atomic<bool> is_done{false};
    std::thread swapping([&] {
        while (!is_done) {
            renameat2(AT_FDCWD, (m_dir / "root/swap").c_str(), AT_FDCWD, (m_dir / "link").c_str(),
                      RENAME_EXCHANGE);
        }
    });
    int reached = 0;
    int refused = 0;
    for (int i = 0; i < 20000 || ((reached == 0 || refused == 0) && i < 2000000); ++i) {
        const UniqueFd fd = PathPlace(m_dir / "root/swap/deep/file").Open(O_RDONLY);
        struct stat st {};
        if (!fd.IsValid()) {
            // EXDEV: the folder was taken out of the root while it was being gone through.
            EXPECT_TRUE(errno == ELOOP || errno == EXDEV) << errno;
            ++refused;
        } else {
            ASSERT_EQ(0, fstat(fd.Get(), &st));
            ASSERT_NE(outside.st_ino, st.st_ino) << "led out at attempt " << i;
            ++reached;
        }
    }
    is_done = true;
    swapping.join();
    EXPECT_GT(reached, 0);
    EXPECT_GT(refused, 0);
}

INSTANTIATE_TEST_SUITE_P(Kernels, ConfinedPathTest, testing::Bool(), [](const auto& test) {
    return test.param ? std::string("WithOpenat2") : std::string("Stepwise");
});

}  // namespace
