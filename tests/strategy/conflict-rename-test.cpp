#include "strategy/conflict-rename.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <ctime>
#include <filesystem>

#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::MatchesRegex;

constexpr char TIME[] = "[A-Z][a-z][a-z]-[0-9][0-9]-[0-9][0-9][0-9][0-9]-[0-9][0-9][0-9][0-9]";

class ConflictRenameTest : public testing::Test {
protected:
    // Names below the scratch folder, sorted; folders with a "/" at the end.
    std::vector<std::string> Names() const {
        std::vector<std::string> names;
        for (const auto& entry : fs::recursive_directory_iterator(m_dir.Path())) {
            names.push_back(entry.path().string().substr(m_dir.Path().size() + 1) +
                            (entry.is_directory() ? "/" : ""));
        }
        std::sort(names.begin(), names.end());
        return names;
    }
    // The suffix of this minute. A test that is cut by the turn of a minute begins again.
    static std::string SuffixNow(const char* reason) {
        const time_t now = time(nullptr);
        struct tm local {};
        localtime_r(&now, &local);
        char when[64];
        strftime(when, sizeof(when), "%b-%d-%H%M-%Y", &local);
        return std::string("_Ferrix_") + when + "_" + reason;
    }

    TempDir m_dir;
    LogCapture m_log;
};

TEST_F(ConflictRenameTest, TheSuffixStandsBeforeTheExtension) {
    m_dir.Write("a/b.txt", "x");
    EXPECT_EQ(0, ConflictRename(m_dir / "a/b.txt", "Ferrix", "Conflict"));
    EXPECT_THAT(Names(), ElementsAre("a/", MatchesRegex(std::string("a/b_Ferrix_") + TIME +
                                                        "_Conflict\\.txt")));
    EXPECT_TRUE(m_log.Contains("ConflictRename from [" + m_dir / "a/b.txt" + "] to ["));
    EXPECT_TRUE(m_log.Contains("], reason = [Conflict]."));
}

struct NameCase {
    const char* name;     // below the scratch folder
    const char* pattern;  // of the new name; S stands for the suffix
};
constexpr NameCase NAME_CASES[] = {
    {"v/plain",    "v/plainS"       },
    {"a.b/c",      "a\\.b/cS"       },
    {"v/.bashrc",  "v/S\\.bashrc"   },
    {"v/ends.",    "v/ends\\.S"     },
    {"v/a.tar.gz", "v/a\\.tarS\\.gz"},
    {"v/a.b\\c",   "v/a\\.b\\\\cS"  },
};

TEST_F(ConflictRenameTest, TheExtensionIsWhatFollowsTheLastDotOfTheName) {
    for (const NameCase& row : NAME_CASES) {
        const TempDir dir;
        const std::string path = dir.Write(row.name, "x");
        ASSERT_EQ(0, ConflictRename(path, "Ferrix", "TypeConflict")) << row.name;
        std::string pattern = row.pattern;
        pattern.replace(pattern.find('S'), 1, std::string("_Ferrix_") + TIME + "_TypeConflict");
        for (const auto& entry : fs::recursive_directory_iterator(dir.Path())) {
            if (entry.is_directory()) continue;
            EXPECT_THAT(entry.path().string().substr(dir.Path().size() + 1), MatchesRegex(pattern))
                << row.name;
        }
    }
}

TEST_F(ConflictRenameTest, ConflictsOfOneMinuteAreKeptApartByANumber) {
    std::vector<std::string> expected;
    for (std::string suffix; suffix != SuffixNow("Conflict");) {
        suffix = SuffixNow("Conflict");
        fs::remove_all(m_dir / "v");
        for (int n = 0; n < 3; ++n) {
            m_dir.Write("v/b.txt", std::to_string(n));
            ASSERT_EQ(0, ConflictRename(m_dir / "v/b.txt", "Ferrix", "Conflict"));
        }
        expected = {"v/", "v/b" + suffix + ".txt", "v/b" + suffix + "_1.txt",
                    "v/b" + suffix + "_2.txt"};
    }
    std::sort(expected.begin(), expected.end());
    EXPECT_EQ(expected, Names());
}

TEST_F(ConflictRenameTest, AfterNumber99TheLastNameIsUsedWhateverItIs) {
    std::string suffix;
    while (suffix != SuffixNow("Conflict")) {
        suffix = SuffixNow("Conflict");
        fs::remove_all(m_dir / "v");
        m_dir.Write("v/b" + suffix + ".txt", "taken");
        for (int n = 1; n <= 99; ++n) {
            m_dir.Write("v/b" + suffix + "_" + std::to_string(n) + ".txt", "taken");
        }
        m_dir.Write("v/b.txt", "newcomer");
        ASSERT_EQ(0, ConflictRename(m_dir / "v/b.txt", "Ferrix", "Conflict"));
    }
    EXPECT_EQ("newcomer", ReadWholeFile(m_dir / "v/b" + suffix + "_99.txt"));
    EXPECT_EQ("taken", ReadWholeFile(m_dir / "v/b" + suffix + "_98.txt"));
    EXPECT_EQ(101U, Names().size()) << "the folder, the name without a number, 1 to 99";
}

TEST_F(ConflictRenameTest, AFolderIsMovedAsideWithWhatItHolds) {
    m_dir.Write("v/d/inside", "x");
    EXPECT_EQ(0, ConflictRename(m_dir / "v/d", "Ferrix", "TypeConflict"));
    EXPECT_THAT(
        Names(),
        ElementsAre("v/", MatchesRegex(std::string("v/d_Ferrix_") + TIME + "_TypeConflict/"),
                    MatchesRegex(std::string("v/d_Ferrix_") + TIME + "_TypeConflict/inside")));
}

TEST_F(ConflictRenameTest, ANameWithoutRoomForTheSuffixStaysAndGivesTheCodeOfTheRename) {
    const std::string name(255, 'n');
    m_dir.Write(name, "x");
    EXPECT_EQ(-100, ConflictRename(m_dir / name, "Ferrix", "Conflict"));
    EXPECT_THAT(Names(), ElementsAre(name));
    EXPECT_TRUE(m_log.Contains("[ERR] ConflictRename failed. From:[" + m_dir / name + "] To:["));
    EXPECT_TRUE(m_log.Contains("] err = [-100]"));
}

TEST_F(ConflictRenameTest, AMissingPathGivesTheCodeOfTheRename) {
    EXPECT_EQ(-2, ConflictRename(m_dir / "nothing", "Ferrix", "Conflict"));
    EXPECT_EQ(-2, ConflictRename("nothing-without-a-separator.txt", "Ferrix", "Conflict"));
    EXPECT_TRUE(m_log.Contains("To:[nothing-without-a-separator.txt_Ferrix_"))
        << "without a separator there is no extension";
}

TEST_F(ConflictRenameTest, NamesAreBytesAndNeverAFormat) {
    const std::string name = "100%s \xff\n'\".txt";
    m_dir.Write(name, "x");
    EXPECT_EQ(0, ConflictRename(m_dir / name, "Ferrix", "Conflict"));
    const std::vector<std::string> names = Names();
    ASSERT_EQ(1U, names.size());
    EXPECT_EQ(0U, names[0].find("100%s \xff\n'\"_Ferrix_"));
}

TEST_F(ConflictRenameTest, BlanksAtTheEndOfANameAreTakenOff) {
    m_dir.Write("v/name  ", "x");
    EXPECT_EQ(0, WhiteSpaceConflictRename(m_dir / "v/name  ", "name  ", "Ferrix"));
    EXPECT_THAT(Names(), ElementsAre("v/", "v/name"));
    EXPECT_TRUE(m_log.Has("[INFO] WhiteSpaceConflictRename from [" + m_dir / "v/name  " + "] to [" +
                          m_dir / "v/name" + "]."));
}

TEST_F(ConflictRenameTest, ANameOfBlanksOnlyIsCalledAnEmptyString) {
    m_dir.Write("v/  ", "x");
    EXPECT_EQ(0, WhiteSpaceConflictRename(m_dir / "v/  ", "  ", "Ferrix"));
    EXPECT_THAT(Names(), ElementsAre("v/", "v/  (empty string)"));
}

TEST_F(ConflictRenameTest, ATakenNameWithoutBlanksGetsTheSuffixAndThenNumbersFromZero) {
    std::vector<std::string> expected;
    for (std::string suffix; suffix != SuffixNow("WhiteSpaceConflict");) {
        suffix = SuffixNow("WhiteSpaceConflict");
        fs::remove_all(m_dir / "v");
        m_dir.Write("v/n.txt", "taken");
        for (int n = 0; n < 3; ++n) {
            m_dir.Write("v/n.txt ", std::to_string(n));
            ASSERT_EQ(0, WhiteSpaceConflictRename(m_dir / "v/n.txt ", "n.txt ", "Ferrix"));
        }
        expected = {"v/", "v/n.txt", "v/n" + suffix + ".txt", "v/n" + suffix + "_0.txt",
                    "v/n" + suffix + "_1.txt"};
    }
    std::sort(expected.begin(), expected.end());
    EXPECT_EQ(expected, Names());
    EXPECT_EQ("taken", ReadWholeFile(m_dir / "v/n.txt"));
}

TEST_F(ConflictRenameTest, AFailedRenameForBlanksGivesItsCode) {
    EXPECT_EQ(-2, WhiteSpaceConflictRename(m_dir / "v/gone ", "gone ", "Ferrix"));
    EXPECT_TRUE(m_log.Contains("[ERR] WhiteSpaceConflictRename failed. From:[" + m_dir / "v/gone " +
                               "] To:["));
    EXPECT_TRUE(m_log.Contains("] err=[-2]"));
}

}  // namespace
