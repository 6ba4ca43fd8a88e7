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

// --- Black list: each rule with its reason, on what it looks at and on what it does not

struct RuleCase {
    const char* name;
    const char* list;
    const char* path;
    bool is_dir;
    int reason;
};

void PrintTo(const RuleCase& c, std::ostream* out) { *out << c.name; }

const RuleCase kRules[] = {
    {"CommonCharInFile",          "[Common]\nblack_char=\"xY\"\n",                              "/a/by.txt",  false, -258},
    {"CommonCharInFolderOfFile",  "[Common]\nblack_char=\"x\"\n",                               "/aX/b",      false, -258},
    {"CommonCharInFolder",        "[Common]\nblack_char=\"x\"\n",                               "/x/b",       true,  -258},
    {"CommonCharNot",             "[Common]\nblack_char=\"xy\"\n",                              "/a/b",       false, 0   },
    {"CommonPrefixOfFile",        "[Common]\nblack_prefix=\"~$\"\n",                            "/a/~$doc",   false, -259},
    {"CommonPrefixOfFolder",      "[Common]\nblack_prefix=\"tm\"\n",                            "/a/TMp/b",   true,  -259},
    {"CommonPrefixIsWholeName",   "[Common]\nblack_prefix=\"tmp\"\n",                           "/tmp",       true,  -259},
    {"CommonPrefixNotInside",     "[Common]\nblack_prefix=\"b\"\n",                             "/ab",        false, 0   },
    {"CommonSuffixOfFile",        "[Common]\nblack_suffix=\"~\"\n",                             "/a/b~",      false, -260},
    {"CommonSuffixOfFolder",      "[Common]\nblack_suffix=\".bak\"\n",                          "/a.BAK/b",   false, -260},
    {"CommonSuffixLongerThan",    "[Common]\nblack_suffix=\"aab\"\n",                           "/ab",        false, 0   },
    {"CommonNameOfFile",          "[Common]\nblack_name=\"b.c\"\n",                             "/a/B.C",     false, -261},
    {"CommonNameOfFolder",        "[Common]\nblack_name=\"a\"\n",                               "/x/a/b",     false, -261},
    {"CommonNameNotPart",         "[Common]\nblack_name=\"a\"\n",                               "/ab",        false, 0   },
    {"DirPrefixItself",           "[Common]\nblack_dir_prefix=\"/a/b\"\n",                      "/A/b",       true,  -264},
    {"DirPrefixItselfAsFile",     "[Common]\nblack_dir_prefix=\"/a/b\"\n",                      "/a/b",       false, -264},
    {"DirPrefixBelow",            "[Common]\nblack_dir_prefix=\"/a/b\"\n",                      "/a/b/c/d",   false, -264},
    {"DirPrefixNotNeighbour",     "[Common]\nblack_dir_prefix=\"/a/b\"\n",                      "/a/bc",      true,  0   },
    {"DirPrefixNotAbove",         "[Common]\nblack_dir_prefix=\"/a/b\"\n",                      "/a",         true,  0   },
    {"DirPrefixRoot",             "[Common]\nblack_dir_prefix=\"/\"\n",                         "/",          true,  -264},
    {"DirPrefixRootNotBelow",     "[Common]\nblack_dir_prefix=\"/\"\n",                         "/a",         true,  0   },
    {"DirPrefixOfRelativeFile",   "[Common]\nblack_dir_prefix=\"a\"\n",                         "a/b",        false, -264},
    {"MaxLengthOfFile",           "[Common]\nmax_length=3\n",                                   "/a/abcd",    false, -265},
    {"MaxLengthOfFolder",         "[Common]\nmax_length=3\n",                                   "/abcd/a",    false, -265},
    {"MaxLengthReached",          "[Common]\nmax_length=3\n",                                   "/abc/abc",   false, 0   },
    {"MaxLengthZeroIsNone",       "[Common]\nmax_length=0\n",                                   "/abcdef",    false, 0   },
    {"FileChar",                  "[File]\nblack_char=\"x\"\n",                                 "/a/bX",      false, -514},
    {"FileCharNotInFolder",       "[File]\nblack_char=\"x\"\n",                                 "/x/a",       false, 0   },
    {"FilePrefix",                "[File]\nblack_prefix=\"._\"\n",                              "/a/._b",     false, -515},
    {"FilePrefixNotOfFolder",     "[File]\nblack_prefix=\"._\"\n",                              "/._b",       true,  0   },
    {"FileSuffix",                "[File]\nblack_suffix=\".part\"\n",                           "/a/b.PART",  false, -516},
    {"FileSuffixNotOfFolder",     "[File]\nblack_suffix=\".part\"\n",                           "/b.part/a",  false, 0   },
    {"FileName",                  "[File]\nblack_name=\"thumbs.db\"\n",                         "/Thumbs.db", false, -517},
    {"FileNameNotOfFolder",       "[File]\nblack_name=\"thumbs.db\"\n",                         "/thumbs.db", true,  0   },
    {"FileExt",                   "[File]\nblack_ext=\"iso\"\n",                                "/a/b.ISO",   false, -518},
    {"FileExtNotOfFolder",        "[File]\nblack_ext=\"iso\"\n",                                "/b.iso/c",   false, 0   },
    {"FileGlob",                  "[File]\nblack_glob=\"a*c*\"\n",                              "/x/AbbCd",   false, -519},
    {"FileGlobWhole",             "[File]\nblack_glob=\"*b\"\n",                                "/abc",       false, 0   },
    {"FileGlobNotOfFolder",       "[File]\nblack_glob=\"*\"\n",                                 "/a",         true,  0   },
    {"DirectoryChar",             "[Directory]\nblack_char=\"x\"\n",                            "/ax/b",      false, -770},
    {"DirectoryCharNotOfFile",    "[Directory]\nblack_char=\"x\"\n",                            "/a/x",       false, 0   },
    {"DirectoryPrefix",           "[Directory]\nblack_prefix=\"x\"\n",                          "/xa",        true,  -771},
    {"DirectoryPrefixNotOfFile",  "[Directory]\nblack_prefix=\"x\"\n",                          "/xa",        false, 0   },
    {"DirectorySuffix",           "[Directory]\nblack_suffix=\"x\"\n",                          "/a/bX",      true,  -772},
    {"DirectorySuffixNotOfFile",  "[Directory]\nblack_suffix=\"x\"\n",                          "/a/bx",      false, 0   },
    {"DirectoryName",             "[Directory]\nblack_name=\"x\"\n",                            "/X/a",       false, -773},
    {"DirectoryNameNotOfFile",    "[Directory]\nblack_name=\"x\"\n",                            "/a/x",       false, 0   },
    {"DirectoryGlob",             "[Directory]\nblack_glob=\"*.app\"\n",                        "/b/a.App",   true,  -775},
    {"DirectoryGlobNotOfFile",    "[Directory]\nblack_glob=\"*.app\"\n",                        "/a.app",     false, 0   },
    {"RootHasNoComponents",       "[Common]\nmax_length=1\nblack_char=\"/\"\n",                 "/",          true,  0   },
    {"SizeAndPathLimitsAreKept",  "[Common]\nmax_path=1\nmax_dst_path=1\n[File]\nmax_size=1\n",
     "/abc",                                                                                                  false, 0   },
    {"BytesAboveAsciiHaveNoCase", "[Common]\nblack_name=\"\xc3\x84\"\n",                        "/\xc3\xa4",  false, 0   },
    {"BytesAboveAsciiAreEqual",   "[Common]\nblack_name=\"\xc3\x84\"\n",                        "/\xc3\x84",  false, -261},
    {"NewlineInName",             "[Common]\nblack_name=\"a\\nb\"\n",                           "/a\nb",      false, -261},
};

class BlackListRuleTest : public testing::TestWithParam<RuleCase> {};

TEST_P(BlackListRuleTest, GivesItsReason) {
    const TempDir dir;
    FileFilter filter;
    ASSERT_EQ(0, filter.LoadBlackList(dir.Write("black", GetParam().list)));
    EXPECT_EQ(GetParam().reason, filter.Check(GetParam().path, GetParam().is_dir));
}

INSTANTIATE_TEST_SUITE_P(Rules, BlackListRuleTest, testing::ValuesIn(kRules),
                         [](const auto& test) { return test.param.name; });

// Each rule of these lists refuses the text: taken away one by one from the front, the next one's
// reason must come.
struct OrderedRule {
    const char* section;
    const char* line;
    int reason;
};

void ExpectOrder(const std::vector<OrderedRule>& rules, const std::string& path, bool is_dir) {
    const TempDir dir;
    for (size_t first = 0; first < rules.size(); ++first) {
        std::string text;
        for (size_t i = first; i < rules.size(); ++i) {
            text += std::string("[") + rules[i].section + "]\n" + rules[i].line + "\n";
        }
        FileFilter filter;
        ASSERT_EQ(0, filter.LoadBlackList(dir.Write("black", text)));
        EXPECT_EQ(rules[first].reason, filter.Check(path, is_dir)) << rules[first].line;
    }
}

TEST(BlackListOrder, FirstRefusalWinsForAFile) {
    ExpectOrder(
        {
            {"Common",    "black_dir_prefix=\"/d\"", -264},
            {"Common",    "max_length=2",            -265},
            {"Common",    "black_char=\"n\"",        -258},
            {"Common",    "black_name=\"n.x\"",      -261},
            {"Common",    "black_prefix=\"n\"",      -259},
            {"Common",    "black_suffix=\"x\"",      -260},
            {"File",      "black_char=\"n\"",        -514},
            {"File",      "black_prefix=\"n\"",      -515},
            {"File",      "black_suffix=\"x\"",      -516},
            {"File",      "black_glob=\"n*\"",       -519},
            {"File",      "black_name=\"n.x\"",      -517},
            {"File",      "black_ext=\"x\"",         -518},
            {"Directory", "black_name=\"d\"",        -773},
    },
        "/d/n.x", FILE_PATH);
}

TEST(BlackListOrder, FirstRefusalWinsForAFolder) {
    ExpectOrder(
        {
            {"Common",    "black_dir_prefix=\"/dir\"", -264},
            {"Common",    "max_length=2",              -265},
            {"Common",    "black_char=\"d\"",          -258},
            {"Common",    "black_name=\"dir\"",        -261},
            {"Common",    "black_prefix=\"d\"",        -259},
            {"Common",    "black_suffix=\"r\"",        -260},
            {"Directory", "black_char=\"d\"",          -770},
            {"Directory", "black_name=\"dir\"",        -773},
            {"Directory", "black_prefix=\"d\"",        -771},
            {"Directory", "black_glob=\"d*\"",         -775},
            {"Directory", "black_suffix=\"r\"",        -772},
    },
        "/dir", DIR_PATH);
}

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
