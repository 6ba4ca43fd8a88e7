#include "filter/file-filter.h"

#include <gmock/gmock.h>

#include <atomic>
#include <thread>

#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace {

using testing::ElementsAre;
using Strings = FileFilter::Strings;

constexpr bool FILE_PATH = false;
constexpr bool DIR_PATH = true;

class FileFilterTest : public testing::Test {
protected:
    void Black(const std::string& text) {
        ASSERT_EQ(0, m_filter.LoadBlackList(m_dir.Write("black", text)));
    }
    void White(const std::string& text) {
        ASSERT_EQ(0, m_filter.LoadWhiteList(m_dir.Write("white", text)));
    }
    int File(const std::string& path) { return m_filter.Check(path, FILE_PATH); }
    int Dir(const std::string& path) { return m_filter.Check(path, DIR_PATH); }

    TempDir m_dir;
    LogCapture m_log;
    FileFilter m_filter;
};

TEST_F(FileFilterTest, AFilterWithoutListsPassesEverything) {
    EXPECT_EQ(0, File("/a/b.txt"));
    EXPECT_EQ(0, Dir("/"));
    EXPECT_EQ(0, File("relative"));
    EXPECT_EQ(0, File(""));
}

TEST_F(FileFilterTest, ALoadThatFailsLeavesNoOldListBehind) {
    Black("[Common]\nblack_name=\"a\"\n");
    EXPECT_EQ(FILTER_BLACK_NAME, File("/a"));
    EXPECT_EQ(-1, m_filter.LoadBlackList(m_dir / "missing"));
    EXPECT_TRUE(m_log.Has("[ERR] failed to read filter at '" + (m_dir / "missing") + "'"));
    EXPECT_EQ(0, File("/a"));

    White("[Common]\nwhite_name=\"b\"\n");
    EXPECT_EQ(FILTER_NOT_WHITE, File("/a"));
    m_log.Clear();
    EXPECT_EQ(-1, m_filter.LoadWhiteList(m_dir / "missing"));
    EXPECT_TRUE(m_log.Lines().empty());
    EXPECT_EQ(0, File("/a"));
}

TEST_F(FileFilterTest, ALoadReplacesTheListBefore) {
    Black("[Common]\nblack_name=\"a\"\n");
    Black("[Common]\nblack_name=\"b\"\n");
    EXPECT_EQ(0, File("/a"));
    EXPECT_EQ(FILTER_BLACK_NAME, File("/b"));
}

TEST_F(FileFilterTest, TheWhiteListIsAskedFirst) {
    Black("[Common]\nblack_name=\"a\"\n");
    White("[Common]\nwhite_name=\"a\", \"b\"\n");
    EXPECT_EQ(FILTER_NOT_WHITE, File("/c"));
    EXPECT_EQ(FILTER_BLACK_NAME, File("/a"));
    EXPECT_EQ(0, File("/b"));
}

// --- Splitting

TEST_F(FileFilterTest, ARelativeFileIsRefusedByAnyList) {
    Black("");
    EXPECT_EQ(FILTER_NOT_WHITE, File("a/b"));
    EXPECT_EQ(FILTER_NOT_WHITE, File(""));
    EXPECT_EQ(0, Dir("a/b")) << "a folder is not split";
    FileFilter white;
    ASSERT_EQ(0, white.LoadWhiteList(m_dir.Write("white", "[Common]\nwhite_name=\"*\"\n")));
    EXPECT_EQ(FILTER_NOT_WHITE, white.Check("a/b", FILE_PATH));
    EXPECT_EQ(0, white.Check("a/b", DIR_PATH));
}

TEST_F(FileFilterTest, PartsAtTheirLimitCannotBeSplit) {
    Black("");
    EXPECT_EQ(0, File("/" + std::string(511, 'n')));
    EXPECT_EQ(FILTER_NOT_WHITE, File("/" + std::string(512, 'n')));
    std::string folder = "/";
    while (folder.size() < 4095) folder += "d/";
    EXPECT_EQ(0, File(folder + "n"));
    EXPECT_EQ(FILTER_NOT_WHITE, File("/" + folder + "n"));
}

TEST_F(FileFilterTest, TheExtensionFollowsTheLastDot) {
    Black("[File]\nblack_ext=\"gz\",\"profile\",\"tar.gz\"\n");
    EXPECT_EQ(FILTER_FILE_EXT, File("/archive.tar.gz"));
    EXPECT_EQ(FILTER_FILE_EXT, File("/.profile.GZ"));
    EXPECT_EQ(0, File("/.profile"));
    EXPECT_EQ(0, File("/gz"));
    EXPECT_EQ(0, File("/x.gz/y")) << "only a file's own extension counts";
    EXPECT_EQ(0, Dir("/x.gz"));
    EXPECT_EQ(0, File("/x."));
}

// --- White list

TEST_F(FileFilterTest, AnEmptyWhiteListRefusesEverything) {
    White("[Version]\nmajor = 1\n");
    EXPECT_EQ(FILTER_NOT_WHITE, File("/a"));
    EXPECT_EQ(FILTER_NOT_WHITE, Dir("/a"));
    EXPECT_EQ(FILTER_NOT_WHITE, Dir("/"));
}

TEST_F(FileFilterTest, AFilePassesTheWhiteListByNameExtensionOrFolder) {
    White("[Common]\nwhite_name=\"keep\"\n[File]\nwhite_ext=\"JPG\"\n");
    EXPECT_EQ(0, File("/a/Keep"));
    EXPECT_EQ(0, File("/a/b.jpg"));
    EXPECT_EQ(0, File("/a/keep/c/x.txt"));
    EXPECT_EQ(FILTER_NOT_WHITE, File("/a/keeper/x.txt"));
    EXPECT_EQ(FILTER_NOT_WHITE, File("/jpg"));
    EXPECT_EQ(FILTER_NOT_WHITE, File("/x.jpg/y"));
}

TEST_F(FileFilterTest, AFolderPassesTheWhiteListByAnyOfItsComponents) {
    White("[Common]\nwhite_name=\"keep\"\n[File]\nwhite_ext=\"*\"\n");
    EXPECT_EQ(0, Dir("/keep"));
    EXPECT_EQ(0, Dir("/a/KEEP/b"));
    EXPECT_EQ(FILTER_NOT_WHITE, Dir("/a/b"));
    EXPECT_EQ(FILTER_NOT_WHITE, Dir("/"));
}

TEST_F(FileFilterTest, AStarAmongTheNamesPassesFilesAndFoldersButNotTheRoot) {
    White("[Common]\nwhite_name=\"*\"\n");
    EXPECT_EQ(0, File("/a"));
    EXPECT_EQ(0, Dir("/a/b"));
    EXPECT_EQ(FILTER_NOT_WHITE, Dir("/"));
    EXPECT_EQ(FILTER_NOT_WHITE, Dir(""));
}

TEST_F(FileFilterTest, AStarAmongTheExtensionsPassesFilesWithoutOne) {
    White("[File]\nwhite_ext=\"*\"\n");
    EXPECT_EQ(0, File("/a"));
    EXPECT_EQ(0, File("/a.b"));
    EXPECT_EQ(FILTER_NOT_WHITE, Dir("/a"));
}

TEST_F(FileFilterTest, AStarWithinAnItemStandsForItself) {
    White("[Common]\nwhite_name=\"a*\"\n");
    EXPECT_EQ(FILTER_NOT_WHITE, File("/ab"));
    EXPECT_EQ(0, File("/A*"));
}

// --- Black list

TEST_F(FileFilterTest, ComponentsAreCheckedFromTheOutermostIn) {
    Black("[Common]\nblack_name=\"b\"\n[Directory]\nblack_name=\"a\"\n");
    EXPECT_EQ(FILTER_DIR_NAME, Dir("/a/b"));
    EXPECT_EQ(FILTER_BLACK_NAME, Dir("/b/a"));
    EXPECT_EQ(FILTER_BLACK_NAME, File("/a/b")) << "the name of a file comes before its folders";
}

TEST_F(FileFilterTest, AComponentAbove511CharactersIsCheckedInPieces) {
    Black("[Directory]\nblack_name=\"tail\"\n");
    EXPECT_EQ(FILTER_DIR_NAME, Dir("/" + std::string(511, 'x') + "tail"));
    EXPECT_EQ(0, Dir("/" + std::string(510, 'x') + "tail"));
    FileFilter lengths;
    ASSERT_EQ(0, lengths.LoadBlackList(m_dir.Write("b2", "[Common]\nmax_length=511\n")));
    EXPECT_EQ(0, lengths.Check("/" + std::string(2000, 'x'), DIR_PATH));
}

TEST_F(FileFilterTest, RepeatedSlashesMakeNoComponents) {
    Black("[Directory]\nblack_glob=\"\\x2a\"\n");
    EXPECT_EQ(0, Dir("///"));
    EXPECT_EQ(FILTER_DIR_GLOB, Dir("//a//"));
}

TEST_F(FileFilterTest, AGlobMatchesTheWholeText) {
    struct Case {
        const char* glob;
        const char* name;
        bool matches;
    };
    const Case cases[] = {
        {"*",         "anything", true },
        {"a*",        "a",        true },
        {"*a",        "ba",       true },
        {"*a",        "ab",       false},
        {"a*b*c",     "aXbYbZc",  true },
        {"a*b*c",     "aXc",      false},
        {"**a**",     "bab",      true },
        {"a?c",       "abc",      false},
        {"a?c",       "a?c",      true },
        {"[ab]",      "a",        false},
        {"*ab*ab*ab", "ababab",   true },
        {"*ab*ab*ab", "abab",     false},
        {"a.*",       "A.TXT",    true },
    };
    for (const Case& c : cases) {
        Black(std::string("[File]\nblack_glob=\"") + c.glob + "\"\n");
        EXPECT_EQ(c.matches ? FILTER_FILE_GLOB : 0, File(std::string("/") + c.name))
            << c.glob << " " << c.name;
    }
}

TEST_F(FileFilterTest, AGlobOfManyStarsIsSettledQuickly) {
    std::string glob;
    for (int i = 0; i < 300; ++i) glob += "a*";
    Black("[File]\nblack_glob=\"" + glob + "b\"\n");
    EXPECT_EQ(0, File("/" + std::string(511, 'a')));
}

// --- The lists as they are written and read

TEST_F(FileFilterTest, ListsAreReadBackInTheirOrder) {
    const Strings names = {"z", "a", "z", "line\nbreak", "\xff\xfe", "@eaDir", "\"quoted\""};
    const Strings exts = {"iso", "ISO", "t$t"};
    const std::string black = m_dir / "black";
    const std::string white = m_dir / "white";
    ASSERT_EQ(0, FileFilter::WriteBlackList(black, names, exts));
    ASSERT_EQ(0, FileFilter::WriteWhiteList(white, exts, names));
    Strings got_names = {"old"};
    Strings got_exts = {"old"};
    ASSERT_EQ(0, FileFilter::ReadBlackList(black, got_names, got_exts));
    EXPECT_EQ(names, got_names);
    EXPECT_EQ(exts, got_exts);
    ASSERT_EQ(0, FileFilter::ReadWhiteList(white, got_names, got_exts));
    EXPECT_EQ(exts, got_names);
    EXPECT_EQ(names, got_exts);
}

TEST_F(FileFilterTest, AWrittenListFiltersWhatItNames) {
    ASSERT_EQ(0, FileFilter::WriteBlackList(m_dir / "b", {"tmp"}, {"iso"}));
    ASSERT_EQ(0, m_filter.LoadBlackList(m_dir / "b"));
    EXPECT_EQ(FILTER_BLACK_NAME, Dir("/a/tmp"));
    EXPECT_EQ(FILTER_FILE_EXT, File("/a.iso"));
    ASSERT_EQ(0, FileFilter::WriteWhiteList(m_dir / "w", {"*"}, {}));
    ASSERT_EQ(0, m_filter.LoadWhiteList(m_dir / "w"));
    EXPECT_EQ(0, File("/a.txt"));
}

TEST_F(FileFilterTest, EmptyListsAreWritten) {
    ASSERT_EQ(0, FileFilter::WriteBlackList(m_dir / "b", {}, {}));
    Strings names = {"old"};
    Strings exts = {"old"};
    ASSERT_EQ(0, FileFilter::ReadBlackList(m_dir / "b", names, exts));
    EXPECT_TRUE(names.empty());
    EXPECT_TRUE(exts.empty());
}

TEST_F(FileFilterTest, AListThatCouldNotBeReadBackIsRefusedBeforeTheFileIsTouched) {
    const std::string path = m_dir.Write("filter", "as it was");
    const Strings too_long = {std::string(1024, 'x')};
    const Strings too_long_escaped = {std::string(256, '\xff')};
    for (const Strings& bad : {
             Strings{"ok", ""},
             too_long, too_long_escaped
    }) {
        EXPECT_FALSE(FileFilter::IsWritableList(bad));
        EXPECT_EQ(-1, FileFilter::WriteBlackList(path, bad, {}));
        EXPECT_EQ(-1, FileFilter::WriteBlackList(path, {}, bad));
        EXPECT_EQ(-1, FileFilter::WriteWhiteList(path, bad, {}));
        EXPECT_EQ(-1, FileFilter::WriteWhiteList(path, {}, bad));
    }
    EXPECT_EQ("as it was", ReadWholeFile(path));
    EXPECT_TRUE(FileFilter::IsWritableList({}));
    EXPECT_TRUE(FileFilter::IsWritableList({std::string(1023, 'x'), std::string(255, '\xff')}));
}

TEST_F(FileFilterTest, ReadingAListThatIsMissingFails) {
    Strings names = {"old"};
    Strings exts = {"old"};
    EXPECT_EQ(-1, FileFilter::ReadBlackList(m_dir / "missing", names, exts));
    EXPECT_TRUE(names.empty() && exts.empty());
    EXPECT_EQ(-1, FileFilter::ReadWhiteList(m_dir / "missing", names, exts));
}

TEST_F(FileFilterTest, ListsMayBeReplacedWhileOthersAsk) {
    ASSERT_EQ(0, FileFilter::WriteBlackList(m_dir / "b1", {"a"}, {}));
    ASSERT_EQ(0, FileFilter::WriteBlackList(m_dir / "b2", {"a", "b"}, {}));
    ASSERT_EQ(0, m_filter.LoadBlackList(m_dir / "b1"));
    std::atomic<bool> is_done{false};
    std::atomic<int> wrong{0};
    std::thread asking([&] {
        while (!is_done) {
            if (m_filter.Check("/a", FILE_PATH) != FILTER_BLACK_NAME) ++wrong;
        }
    });
    for (int i = 0; i < 200; ++i) {
        EXPECT_EQ(0, m_filter.LoadBlackList(m_dir / (i % 2 == 0 ? "b2" : "b1")));
    }
    is_done = true;
    asking.join();
    EXPECT_EQ(0, wrong) << "no check saw a filter between two lists";
}

TEST(SystemFilter, TheShippedOneKeepsOutWhatIsNoUserData) {
    FileFilter filter;
    ASSERT_EQ(0, filter.LoadBlackList(FERRIX_SYSTEM_FILTER));
    EXPECT_NE(0, filter.Check("/#recycle", true));
    EXPECT_NE(0, filter.Check("/@eaDir", true));
    EXPECT_NE(0, filter.Check("/a/@eaDir/x", false));
    EXPECT_NE(0, filter.Check("/.ferrix-tmp-0123abcd", false));
    EXPECT_EQ(0, filter.Check("/.ferrix-tmp-folder", true)) << "temporary names are files";
    EXPECT_EQ(0, filter.Check("/recycle", true));
    EXPECT_EQ(0, filter.Check("/photo.jpg", false));
    EXPECT_EQ(0, filter.Check("/.hidden", false));
}

}  // namespace
