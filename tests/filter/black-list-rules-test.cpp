#include "filter/black-list-rules.h"

#include <gtest/gtest.h>

#include <ostream>

#include "filter/file-filter.h"
#include "support/temp-dir.h"

namespace {

constexpr bool FILE_PATH = false;
constexpr bool DIR_PATH = true;

// Each rule with its reason, on what it looks at and on what it does not

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

}  // namespace
