// FSWalk, FSWalkTyped, FSForEachEntry, IsIgnored.
#include <gmock/gmock.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <memory>
#include <optional>

#include "deep-tree.h"
#include "fault-injection.h"
#include "filter/file-filter.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/confined-path.h"
#include "utils/error-code.h"
#include "utils/file-list.h"
#include "utils/file-op.h"

namespace {

namespace fs = std::filesystem;
using testing::ElementsAre;
using testing::UnorderedElementsAre;
using Paths = std::vector<std::string>;

class FileOpWalkTest : public testing::Test {
protected:
    TempDir m_dir;
    LogCapture m_log;
};

// --- FSWalk

int Collect(const std::string& path, void* arg) {
    static_cast<Paths*>(arg)->push_back(path);
    return 0;
}

int CollectTyped(const std::string& path, bool is_dir, void* arg) {
    static_cast<Paths*>(arg)->push_back(is_dir ? path + "/" : path);
    return 0;
}

int CollectThree(const std::string& path, void* arg) {
    Collect(path, arg);
    return static_cast<Paths*>(arg)->size() == 3 ? 1 : 0;
}

TEST_F(FileOpWalkTest, AWalkVisitsAFolderBeforeItsContents) {
    m_dir.Write("top/a/b/c", "");
    m_dir.Write("top/d", "");
    fs::create_directory_symlink("a", m_dir / "top/link");
    Paths paths;
    ASSERT_EQ(0, FSWalk(m_dir / "top", Collect, &paths));
    const std::string top = m_dir / "top";
    EXPECT_THAT(paths, UnorderedElementsAre(top, top + "/a", top + "/a/b", top + "/a/b/c",
                                            top + "/d", top + "/link"));
    EXPECT_EQ(top, paths.front());
    const auto at = [&](const std::string& path) {
        return std::find(paths.begin(), paths.end(), path) - paths.begin();
    };
    EXPECT_EQ(at(top + "/a") + 1, at(top + "/a/b"));
    EXPECT_EQ(at(top + "/a") + 2, at(top + "/a/b/c"));
}

TEST_F(FileOpWalkTest, AWalkEndsAtANonzeroResult) {
    for (const char* name : {"top/a/1", "top/b/1", "top/c/1"}) m_dir.Write(name, "");
    Paths paths;
    EXPECT_EQ(-2, FSWalk(m_dir / "top", CollectThree, &paths));
    EXPECT_EQ(3u, paths.size());
    EXPECT_EQ(-2, FSWalk(
                      m_dir / "top", [](const std::string&, void*) { return -1; }, nullptr));
}

TEST_F(FileOpWalkTest, OnlyAFolderIsWalked) {
    Paths paths;
    EXPECT_EQ(-1, FSWalk("", Collect, &paths));
    EXPECT_EQ(-1, FSWalk(m_dir / "missing", Collect, &paths));
    EXPECT_EQ(-1, FSWalk(m_dir.Write("file", ""), Collect, &paths));
    EXPECT_EQ(-1, FSWalkTyped(m_dir / "file", CollectTyped, &paths));
    EXPECT_TRUE(paths.empty());
}

TEST_F(FileOpWalkTest, AWalkThatCannotReadOnFails) {
    m_dir.Write("top/a", "");
    const FailReadDir fail(1, EIO);
    Paths paths;
    EXPECT_EQ(-1, FSWalk(m_dir / "top", Collect, &paths));
    EXPECT_EQ(-1, FSWalkTyped(m_dir / "top", CollectTyped, &paths));
}

TEST_F(FileOpWalkTest, ATypedWalkStaysOnOneLevel) {
    m_dir.Write("top/a/b", "");
    m_dir.Write("top/c", "");
    Paths paths;
    ASSERT_EQ(0, FSWalkTyped(m_dir / "top", CollectTyped, &paths));
    EXPECT_THAT(paths, UnorderedElementsAre(m_dir / "top/", m_dir / "top/a/", m_dir / "top/c"));
    EXPECT_EQ(-2, FSWalkTyped(
                      m_dir / "top", [](const std::string&, bool, void*) { return 1; }, nullptr));
    EXPECT_EQ(-2,
              FSWalkTyped(
                  m_dir / "top",
                  [](const std::string&, bool is_dir, void*) { return is_dir ? 0 : 1; }, nullptr));
}

TEST_F(FileOpWalkTest, AWalkStandsADeepTree) {
    MakeDeepTree(m_dir.Path(), 2100, "dd");
    size_t count = 0;
    ASSERT_EQ(0, FSWalk(
                     m_dir.Path(),
                     [](const std::string&, void* arg) {
                         ++*static_cast<size_t*>(arg);
                         return 0;
                     },
                     &count));
    EXPECT_EQ(2102u, count);
    EXPECT_EQ(0, FSRemove(m_dir / "dd"));
}

// --- FSForEachEntry

class ForEachEntryTest : public FileOpWalkTest {
protected:
    // Lists a folder and gives the entries as text, "path size" and "path/".
    Paths List(const std::string& path, bool recursive = false, unsigned flags = FS_EACH_STAT) {
        NamePool pool;
        FileList list(pool);
        m_visitor.list = &list;
        m_visitor.prefix_length = path.size();
        m_result = FSForEachEntry(path, m_visitor, flags, &m_abort, recursive);
        Paths paths;
        for (auto it = list.begin(); it != list.end(); it.next()) {
            paths.push_back(it->is_dir ? it->path + "/"
                                       : it->path + " " + std::to_string(it->size));
            m_times.push_back(it->mtime);
        }
        return paths;
    }

    FSVisitor m_visitor{.worker_id = 3};
    std::atomic<int> m_abort{0};
    std::vector<uint32_t> m_times;
    int m_result = 1;
};

TEST_F(ForEachEntryTest, FilesAndFoldersOfOneLevelAreListed) {
    m_dir.Write("a", "1");
    m_dir.Write("b\n%s\xff", "22");
    m_dir.Write("c/below", "333");
    ASSERT_EQ(0, FSUtime(m_dir / "a", 1, 11));
    ASSERT_EQ(0, FSUtime(m_dir / "b\n%s\xff", 1, 12));
    ASSERT_EQ(0, FSUtime(m_dir / "c", 1, 13));
    EXPECT_THAT(List(m_dir.Path()), ElementsAre("/c/", "/b\n%s\xff 2", "/a 1"));
    EXPECT_EQ(0, m_result);
    EXPECT_THAT(m_times, ElementsAre(13u, 12u, 11u));
    EXPECT_TRUE(m_log.Has("[INFO] FileProcessor (3): local list: add file 'a'"));
    EXPECT_TRUE(m_log.Has("[INFO] FileProcessor (3): local list: add directory 'c'"));
}

TEST_F(ForEachEntryTest, WithoutStatsTimesAndSizesAreZero) {
    m_dir.Write("a", "1");
    EXPECT_THAT(List(m_dir.Path(), false, 0), ElementsAre("/a 0"));
    EXPECT_THAT(m_times, ElementsAre(0u));
}

TEST_F(ForEachEntryTest, OtherKindsAreNeverListed) {
    fs::create_symlink("nowhere", m_dir / "link");
    m_dir.MakeDir("dir");
    fs::create_directory_symlink("dir", m_dir / "dir-link");
    ASSERT_EQ(0, mkfifo((m_dir / "fifo").c_str(), 0600));
    EXPECT_THAT(List(m_dir.Path()), ElementsAre("/dir/"));
}

TEST_F(ForEachEntryTest, OnlyTheExactNameEaDirIsInvisible) {
    m_dir.Write("@eaDir/x", "");
    m_dir.Write("@eadir/x", "");
    m_dir.Write("@eaDir2", "");
    m_dir.Write("sub/@eaDir", "");
    EXPECT_THAT(List(m_dir.Path(), true),
                ElementsAre("/sub/", "/@eadir/x 0", "/@eadir/", "/@eaDir2 0"));
}

TEST_F(ForEachEntryTest, AFolderThatCannotBeOpenedIsAnEmptyOne) {
    EXPECT_TRUE(List(m_dir / "missing").empty());
    EXPECT_EQ(0, m_result);
    EXPECT_TRUE(m_log.Has("[ERR] FSOpenDir(" + (m_dir / "missing") + ")"));
    const ConfinedRoot root(m_dir.Path());
    m_dir.Write("real/a", "");
    fs::create_directory_symlink("real", m_dir / "link");
    EXPECT_TRUE(List(m_dir / "link").empty()) << "nor one through a link below a root";
    EXPECT_EQ(0, m_result);
}

// While it lives the process may open nothing more. What a sanitizer looks up when code runs for
// the first time needs descriptors: the same call is made once before.
class NoDescriptors {
public:
    NoDescriptors() {
        EXPECT_EQ(0, getrlimit(RLIMIT_NOFILE, &m_old));
        rlimit none = m_old;
        none.rlim_cur = 0;
        EXPECT_EQ(0, setrlimit(RLIMIT_NOFILE, &none));
    }
    ~NoDescriptors() { EXPECT_EQ(0, setrlimit(RLIMIT_NOFILE, &m_old)); }
    NoDescriptors(const NoDescriptors&) = delete;
    NoDescriptors& operator=(const NoDescriptors&) = delete;

private:
    rlimit m_old{};
};

TEST_F(ForEachEntryTest, AFolderThatTheSystemCannotOpenNowIsNotAnEmptyOne) {
    m_dir.Write("top/a", "");
    m_dir.Write("top/file", "");
    EXPECT_EQ(2u, List(m_dir / "top").size());
    for (const bool is_confined : {false, true}) {
        std::unique_ptr<ConfinedRoot> root;
        if (is_confined) root = std::make_unique<ConfinedRoot>(m_dir.Path());
        {
            const NoDescriptors none;
            List(m_dir / "top");
        }
        EXPECT_EQ(FS_EACH_IO_ERROR, m_result) << is_confined;
        EXPECT_TRUE(m_log.Has("[ERR] FSOpenDir(" + (m_dir / "top") + ")"));
        EXPECT_TRUE(List(m_dir / std::string(256, 'x')).empty()) << "no folder has that name";
        EXPECT_EQ(0, m_result) << is_confined;
        EXPECT_TRUE(List(m_dir / "top/file").empty());
        EXPECT_EQ(0, m_result) << is_confined;
        EXPECT_EQ(2u, List(m_dir / "top").size());
        EXPECT_EQ(0, m_result) << is_confined;
    }
}

TEST_F(ForEachEntryTest, AFolderFurtherDownThatTheSystemCannotOpenEndsTheWalk) {
    m_dir.Write("sub/a", "");
    EXPECT_EQ(2u, List(m_dir.Path(), true).size());
    static std::optional<NoDescriptors> none;
    const OnReadDir fill([](const char* name) {
        if (std::string(name) == "sub") none.emplace();
    });
    List(m_dir.Path(), true);
    none.reset();
    EXPECT_EQ(FS_EACH_IO_ERROR, m_result);
}

TEST_F(ForEachEntryTest, AReadErrorIsNotTheEndOfTheFolder) {
    for (const char* name : {"a", "b", "c"}) m_dir.Write(name, "");
    const FailReadDir fail(3, EIO);
    List(m_dir.Path());
    EXPECT_EQ(FS_EACH_IO_ERROR, m_result);
    EXPECT_EQ(ERR_IO, m_result);
}

TEST_F(ForEachEntryTest, AReadErrorFurtherDownEndsTheWalkAsWell) {
    m_dir.Write("sub/a", "");
    const FailReadDir fail(4, EIO);  // after ".", "..", "sub" and the end of the folder
    List(m_dir.Path(), true);
    EXPECT_EQ(FS_EACH_IO_ERROR, m_result);
    EXPECT_TRUE(m_log.Has("[INFO] Traversing '" + m_dir.Path() + "' ... abort"));
}

TEST_F(ForEachEntryTest, AnAbortEndsTheListing) {
    m_dir.Write("a", "");
    m_abort = 1;
    EXPECT_TRUE(List(m_dir.Path()).empty());
    EXPECT_EQ(FS_EACH_ABORTED, m_result);
    EXPECT_EQ(1, m_log.Count("[INFO] Traversing '" + m_dir.Path() + "' ... abort"));
}

std::atomic<int>* g_abort = nullptr;

TEST_F(ForEachEntryTest, AnAbortUnderWayIsToldForEachFolderAbove) {
    m_dir.Write("one/two/three", "");
    g_abort = &m_abort;
    const OnReadDir abort([](const char* name) {
        if (std::string(name) == "three") *g_abort = 1;
    });
    List(m_dir.Path(), true);
    EXPECT_EQ(FS_EACH_ABORTED, m_result);
    for (const std::string& path : {m_dir.Path(), m_dir / "one", m_dir / "one/two"}) {
        EXPECT_EQ(1, m_log.Count("[INFO] Traversing '" + path + "' ... abort")) << path;
    }
}

TEST_F(ForEachEntryTest, AnEmptyFolderIsListedEvenWhenAborted) {
    m_abort = 1;
    EXPECT_TRUE(List(m_dir.Path()).empty());
    EXPECT_EQ(0, m_result) << "the flag is asked for each entry";
}

TEST_F(ForEachEntryTest, TheFilterSeesPathsBelowTheFolder) {
    FileFilter filter;
    ASSERT_EQ(0, filter.LoadBlackList(m_dir.Write(
                     "filter",
                     "[Common]\nblack_dir_prefix=\"/sub/no\"\n"
                     "[Directory]\nblack_name=\"#recycle\"\n[File]\nblack_ext=\"tmp\"\n")));
    for (const char* name : {"top/#Recycle/x", "top/#recycle.tmp", "top/a.tmp", "top/a",
                             "top/sub/no/y", "top/sub/yes", "top/x.tmp/z"}) {
        m_dir.Write(name, "");
    }
    m_visitor.filter = &filter;
    EXPECT_THAT(List(m_dir / "top", true),
                ElementsAre("/x.tmp/z 0", "/x.tmp/", "/sub/yes 0", "/sub/", "/a 0"));
    EXPECT_TRUE(m_log.Has("[INFO] IsIgnored: File '/a.tmp' (blocked: -518)"));
    EXPECT_TRUE(m_log.Has("[INFO] IsIgnored: File '/#Recycle' (blocked: -773)"));
    EXPECT_TRUE(m_log.Has("[INFO] IsIgnored: File '/sub/no' (blocked: -264)"));
}

TEST_F(ForEachEntryTest, AWalkGoesDownWhenAsked) {
    m_dir.Write("a/b/c", "1");
    m_dir.Write("a/d", "22");
    m_dir.MakeDir("e");
    const Paths all = {"/e/", "/a/d 2", "/a/b/c 1", "/a/b/", "/a/"};
    EXPECT_EQ(all, List(m_dir.Path(), true));
    EXPECT_EQ(0, m_result);
    EXPECT_EQ((Paths{"/e/", "/a/"}), List(m_dir.Path(), false));
}

TEST_F(ForEachEntryTest, AFolderMayBeToldAfterItsContents) {
    m_dir.Write("a/b/c", "1");
    EXPECT_THAT(List(m_dir.Path(), true, FS_EACH_DIR_LAST | FS_EACH_STAT),
                ElementsAre("/a/b/c 1", "/a/b/", "/a/"));
    EXPECT_THAT(m_log.Lines(),
                ElementsAre("[INFO] FileProcessor (3): local list: add file 'c'",
                            "[INFO] FileProcessor (3): local list: add directory 'b'",
                            "[INFO] FileProcessor (3): local list: add directory 'a'"));
    m_log.Clear();
    List(m_dir.Path(), true);
    EXPECT_THAT(m_log.Lines(),
                ElementsAre("[INFO] FileProcessor (3): local list: add directory 'a'",
                            "[INFO] FileProcessor (3): local list: add directory 'b'",
                            "[INFO] FileProcessor (3): local list: add file 'c'"));
}

TEST_F(ForEachEntryTest, EntriesThatTheListRefusesAreLeftOut) {
    m_dir.Write("dir/below", "1");
    m_dir.Write("file", "22");
    NamePool pool;
    FileList list(pool);
    ASSERT_EQ(0, list.AddFile(0, "file", 5, 5));
    ASSERT_EQ(0, list.AddFile(0, "dir", 6, 6));
    m_visitor.list = &list;
    EXPECT_EQ(0, FSForEachEntry(m_dir.Path(), m_visitor, FS_EACH_STAT, nullptr, true));
    EXPECT_TRUE(m_log.Has("[ERR] FileProcessor (3): local list: add dir 'dir'"));
    EXPECT_EQ(2u, list.FileCount(0));
    EXPECT_EQ(0u, list.DirCount(0)) << "and a refused folder is not gone into";
}

TEST_F(ForEachEntryTest, AListWithoutRoomForANameIsNotTheWholeFolder) {
    const std::string long_name(200, 'x');
    for (const char* number : {"1", "2", "3"}) m_dir.Write("files/" + long_name + number, "");
    for (const char* number : {"1", "2", "3"}) m_dir.MakeDir("folders/" + long_name + number);
    for (const char* name : {"files", "folders"}) {
        NamePool pool(1);
        FileList list(pool);
        m_visitor.list = &list;
        EXPECT_EQ(FS_EACH_IO_ERROR,
                  FSForEachEntry(m_dir / name, m_visitor, FS_EACH_STAT, nullptr, false))
            << name;
        EXPECT_EQ(2u, list.FileCount(0) + list.DirCount(0)) << name;
    }
}

TEST_F(ForEachEntryTest, EntriesGoToTheFolderOfTheVisitor) {
    m_dir.Write("x", "1");
    NamePool pool;
    FileList list(pool);
    m_visitor.list = &list;
    m_visitor.dir_index = list.AddDir(0, "sub", 0);
    EXPECT_EQ(0, FSForEachEntry(m_dir.Path(), m_visitor, 0, nullptr, false));
    EXPECT_EQ("/sub/x", list.begin()->path);
}

TEST_F(ForEachEntryTest, AWalkStandsADeepTree) {
    MakeDeepTree(m_dir.Path(), 2000, "dd");
    const ConfinedRoot root(m_dir.Path());
    EXPECT_EQ(2001u, List(m_dir.Path(), true).size());
    EXPECT_EQ(0, m_result);
    EXPECT_EQ(0, FSRemove(m_dir / "dd"));
}

// --- IsIgnored

TEST_F(FileOpWalkTest, WithoutAFilterNothingIsIgnored) {
    EXPECT_FALSE(IsIgnored(FSDirEntry(), "/any", 0, nullptr));
}

TEST_F(FileOpWalkTest, TheFilterSeesTheRestOfThePathOrTheRoot) {
    FileFilter filter;
    ASSERT_EQ(0,
              filter.LoadBlackList(m_dir.Write("f", "[Common]\nblack_dir_prefix=\"/\",\"/b\"\n")));
    FSDirEntry entry;
    entry.type = FS_TYPE_DIR;
    EXPECT_TRUE(IsIgnored(entry, "/a/b", 2, &filter));
    EXPECT_TRUE(IsIgnored(entry, "/a", 2, &filter)) << "nothing left: the root";
    EXPECT_TRUE(IsIgnored(entry, "/a", 9, &filter));
    EXPECT_FALSE(IsIgnored(entry, "/a/b", 0, &filter));
    EXPECT_TRUE(m_log.Has("[INFO] IsIgnored: File '/b' (blocked: -264)"));
    EXPECT_TRUE(m_log.Has("[INFO] IsIgnored: File '/' (blocked: -264)"));
}

TEST_F(FileOpWalkTest, TheTypeOfTheEntryDecidesWhichRulesApply) {
    FileFilter filter;
    ASSERT_EQ(0, filter.LoadBlackList(m_dir.Write("f", "[Directory]\nblack_name=\"x\"\n")));
    FSDirEntry entry;
    entry.type = FS_TYPE_DIR;
    EXPECT_TRUE(IsIgnored(entry, "/x", 0, &filter));
    entry.type = FS_TYPE_LINK;
    EXPECT_FALSE(IsIgnored(entry, "/x", 0, &filter));
}

}  // namespace
