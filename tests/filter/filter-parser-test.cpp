#include "filter/filter-parser.h"

#include <gmock/gmock.h>

#include "filter/filter-record.h"
#include "support/temp-dir.h"

namespace {

using testing::ElementsAre;
using testing::ElementsAreArray;
using Strings = std::vector<std::string>;

class FilterParserTest : public testing::Test {
protected:
    // Parses the text as a black list; the record is in m_black.
    int Parse(const std::string& text) {
        const std::string path = m_dir.Write("test.filter", text);
        testing::internal::CaptureStdout();
        testing::internal::CaptureStderr();
        const int result = ParseConfigFile(path, black_list_filter_schema, &m_black);
        m_told = testing::internal::GetCapturedStdout();
        m_errors = testing::internal::GetCapturedStderr();
        return result;
    }

    const Strings& Names() const { return m_black.common.black_name.Items(); }

    TempDir m_dir;
    BlackFilter m_black;
    std::string m_told;
    std::string m_errors;
};

TEST_F(FilterParserTest, AFileWithoutSectionsParsesToAnEmptyRecord) {
    EXPECT_EQ(FILTER_PARSED, Parse("# nothing here\n\n   \t\v\f\r\n  # more nothing"));
    EXPECT_EQ(0, m_black.major);
    EXPECT_TRUE(Names().empty());
}

TEST_F(FilterParserTest, AnEmptyFileParses) { EXPECT_EQ(FILTER_PARSED, Parse("")); }

TEST_F(FilterParserTest, AFileThatCannotBeOpenedHasFailed) {
    EXPECT_EQ(FILTER_PARSE_FAILED,
              ParseConfigFile(m_dir / "missing", black_list_filter_schema, &m_black));
}

TEST_F(FilterParserTest, AFileThatCannotBeReadHasFailedAndIsNotAnEmptyFilter) {
    EXPECT_EQ(FILTER_PARSE_FAILED,
              ParseConfigFile(m_dir.Path(), black_list_filter_schema, &m_black));
}

TEST_F(FilterParserTest, EveryKeyOfTheBlackListFindsItsField) {
    ASSERT_EQ(FILTER_PARSED,
              Parse("[Version]\nmajor=1\nminor=2\n"
                    "[Common]\nblack_char=\"c1\"\nblack_prefix=\"c2\"\n"
                    "black_suffix=\"c3\"\nblack_name=\"c4\"\nblack_dir_prefix=\"c5\"\n"
                    "max_length=6\nmax_path=7\nmax_dst_path=8\n"
                    "[File]\nblack_char=\"f1\"\nblack_prefix=\"f2\"\n"
                    "black_suffix=\"f3\"\nblack_glob=\"f4\"\nblack_ext=\"f5\"\n"
                    "black_name=\"f6\"\nmax_size=7\n"
                    "[Directory]\nblack_char=\"d1\"\nblack_name=\"d2\"\n"
                    "black_prefix=\"d3\"\nblack_suffix=\"d4\"\nblack_glob=\"d5\"\n"))
        << m_errors;
    EXPECT_EQ(1, m_black.major);
    EXPECT_EQ(2, m_black.minor);
    EXPECT_EQ("c1", m_black.common.black_char);
    EXPECT_THAT(m_black.common.black_prefix.Items(), ElementsAre("c2"));
    EXPECT_THAT(m_black.common.black_suffix.Items(), ElementsAre("c3"));
    EXPECT_THAT(m_black.common.black_name.Items(), ElementsAre("c4"));
    EXPECT_THAT(m_black.common.black_dir_prefix.Items(), ElementsAre("c5"));
    EXPECT_EQ(6u, m_black.common.max_length);
    EXPECT_EQ(7u, m_black.common.max_path);
    EXPECT_EQ(8u, m_black.common.max_dst_path);
    EXPECT_EQ("f1", m_black.file.black_char);
    EXPECT_THAT(m_black.file.black_prefix.Items(), ElementsAre("f2"));
    EXPECT_THAT(m_black.file.black_suffix.Items(), ElementsAre("f3"));
    EXPECT_THAT(m_black.file.black_glob.Items(), ElementsAre("f4"));
    EXPECT_THAT(m_black.file.black_ext.Items(), ElementsAre("f5"));
    EXPECT_THAT(m_black.file.black_name.Items(), ElementsAre("f6"));
    EXPECT_EQ(7u, m_black.file.max_size);
    EXPECT_EQ("d1", m_black.directory.black_char);
    EXPECT_THAT(m_black.directory.black_name.Items(), ElementsAre("d2"));
    EXPECT_THAT(m_black.directory.black_prefix.Items(), ElementsAre("d3"));
    EXPECT_THAT(m_black.directory.black_suffix.Items(), ElementsAre("d4"));
    EXPECT_THAT(m_black.directory.black_glob.Items(), ElementsAre("d5"));
}

TEST_F(FilterParserTest, EveryKeyOfTheWhiteListFindsItsField) {
    const std::string path = m_dir.Write("white",
                                         "[Version]\nmajor=1\nminor=2\n[Common]\n"
                                         "white_name=\"n\"\n[File]\nwhite_ext=\"e\"\n");
    WhiteFilter white;
    ASSERT_EQ(FILTER_PARSED, ParseConfigFile(path, white_list_schema, &white));
    EXPECT_EQ(1, white.major);
    EXPECT_EQ(2, white.minor);
    EXPECT_THAT(white.common.white_name.Items(), ElementsAre("n"));
    EXPECT_THAT(white.file.white_ext.Items(), ElementsAre("e"));
}

TEST_F(FilterParserTest, AliasesFillTheSameTarget) {
    ASSERT_EQ(FILTER_PARSED,
              Parse("[Common]\nblack_dir_prefix=\"/a\"\nblack_path_prefix_selective_sync=\"/b\"\n"
                    "[File]\nblack_ext_selective_sync=\"x\"\nblack_ext=\"y\"\n"
                    "black_name_selective_sync=\"n\"\nmax_size=1\nmax_size_selective_sync=2\n"));
    EXPECT_THAT(m_black.common.black_dir_prefix.Items(), ElementsAre("/a", "/b"));
    EXPECT_THAT(m_black.file.black_ext.Items(), ElementsAre("x", "y"));
    EXPECT_THAT(m_black.file.black_name.Items(), ElementsAre("n"));
    EXPECT_EQ(2u, m_black.file.max_size);
}

TEST_F(FilterParserTest, SectionsMayRepeatAndCommentsMayFollowAnything) {
    ASSERT_EQ(FILTER_PARSED,
              Parse("  [Common]  # one\n\tblack_name = \"a\" # two\nmax_length = 5#three\n"
                    "[File]#four\n[Common]\nblack_name = \"b\"#five\n"
                    "black_char = \"#\" # a hash between quotes is no comment\n"));
    EXPECT_THAT(Names(), ElementsAre("a", "b"));
    EXPECT_EQ(5u, m_black.common.max_length);
    EXPECT_EQ("#", m_black.common.black_char);
}

TEST_F(FilterParserTest, ARepeatedListAppendsAndKeepsRepeatedValues) {
    ASSERT_EQ(FILTER_PARSED, Parse("[Common]\nblack_name=\"a\",\"b\"\nblack_name=\"a\"\n"));
    EXPECT_THAT(Names(), ElementsAre("a", "b", "a"));
}

TEST_F(FilterParserTest, ARepeatedStringAndNumberReplaceTheEarlierOnes) {
    ASSERT_EQ(FILTER_PARSED, Parse("[Common]\nblack_char=\"ab\"\nblack_char=\"c\"\n"
                                   "max_length=1\nmax_length=2\n"));
    EXPECT_EQ("c", m_black.common.black_char);
    EXPECT_EQ(2u, m_black.common.max_length);
}

TEST_F(FilterParserTest, AListGoesOnInTheNextLineAfterAComma) {
    ASSERT_EQ(FILTER_PARSED, Parse("[Common]\nblack_name = \"a\" ,\"b\" , \n"
                                   "\n  # between\n\t\"c\",# comment\n\"d\"\nmax_length=3\n"))
        << m_errors;
    EXPECT_THAT(Names(), ElementsAre("a", "b", "c", "d"));
    EXPECT_EQ(3u, m_black.common.max_length);
}

TEST_F(FilterParserTest, AListMayEndInACommaAtTheEndOfTheFile) {
    EXPECT_EQ(FILTER_PARSED, Parse("[Common]\nblack_name = \"a\","));
    EXPECT_THAT(Names(), ElementsAre("a"));
}

TEST_F(FilterParserTest, UnknownKeysAreToldAndCounted) {
    EXPECT_EQ(FILTER_PARSED_WITH_UNKNOWN_KEYS,
              Parse("[Common]\nnew-key = what \"ever\n_9 =\nblack_name=\"a\"\n"));
    EXPECT_EQ("warning: unknown key (new-key)\nwarning: unknown key (_9)\n", m_told);
    EXPECT_EQ("", m_errors);
    EXPECT_THAT(Names(), ElementsAre("a"));
}

TEST_F(FilterParserTest, AKeyOfAnotherSectionIsUnknown) {
    EXPECT_EQ(FILTER_PARSED_WITH_UNKNOWN_KEYS, Parse("[Directory]\nblack_ext = \"a\"\n"));
}

TEST_F(FilterParserTest, NumbersAreTakenWithSignAndWithoutTheirFraction) {
    struct Case {
        const char* text;
        uint64_t value;
    };
    const Case cases[] = {
        {"0",                    0         },
        {"7.5",                  7         },
        {"0.99",                 0         },
        {"+12",                  12        },
        {"-1",                   UINT64_MAX},
        {"-0",                   0         },
        {"9223372036854775807",  INT64_MAX },
        {"99999999999999999999", INT64_MAX },
        {"  5 ",                 5         },
        {"5\r",                  5         },
    };
    for (const Case& c : cases) {
        EXPECT_EQ(FILTER_PARSED, Parse(std::string("[Common]\nmax_length = ") + c.text + "\n"))
            << c.text << m_errors;
        EXPECT_EQ(c.value, m_black.common.max_length) << c.text;
    }
}

TEST_F(FilterParserTest, A32BitNumberIsHeldAtItsLimits) {
    ASSERT_EQ(FILTER_PARSED, Parse("[Version]\nmajor=99999999999\nminor=-99999999999\n"));
    EXPECT_EQ(INT32_MAX, m_black.major);
    EXPECT_EQ(INT32_MIN, m_black.minor);
}

TEST_F(FilterParserTest, ANumberOf1023CharactersIsStillOne) {
    EXPECT_EQ(FILTER_PARSED, Parse("[Common]\nmax_length = 1" + std::string(1022, '0') + "\n"));
}

TEST_F(FilterParserTest, EscapesAreResolved) {
    ASSERT_EQ(FILTER_PARSED, Parse(R"([Common]
black_name = "\a\b\f\n\r\t\v\'\"\\\?", "\x41\x6a\xFf", "\101\000\377")"
                                   "\n"))
        << m_errors;
    EXPECT_THAT(Names(), ElementsAreArray(
                             Strings{"\a\b\f\n\r\t\v'\"\\?", "Aj\xff", std::string("A\0\xff", 3)}));
}

TEST_F(FilterParserTest, BytesThatAreNoAsciiPass) {
    ASSERT_EQ(FILTER_PARSED, Parse("[Common]\nblack_name = \"\xc3\xa4\xff\x80\"\n"));
    EXPECT_THAT(Names(), ElementsAre("\xc3\xa4\xff\x80"));
}

TEST_F(FilterParserTest, TheEndOfTheFileClosesAString) {
    EXPECT_EQ(FILTER_PARSED, Parse("[Common]\nblack_name = \"open"));
    EXPECT_THAT(Names(), ElementsAre("open"));
}

TEST_F(FilterParserTest, AStringOf1024BytesIsTaken) {
    EXPECT_EQ(FILTER_PARSED, Parse("[Common]\nblack_char = \"" + std::string(1024, 'x') + "\"\n"));
    EXPECT_EQ(1024u, m_black.common.black_char.size());
}

TEST_F(FilterParserTest, ALineOf6144CharactersIsOneLine) {
    std::string line = "black_name = \"a\", \"b\"";
    line.resize(FILTER_MAX_LINE - 1, ' ');
    EXPECT_EQ(FILTER_PARSED, Parse("[Common]\n" + line + "\n"));
    EXPECT_THAT(Names(), ElementsAre("a", "b"));
}

TEST_F(FilterParserTest, WhatFollowsTheLongestLineIsALineOfItsOwn) {
    std::string line = "black_name = \"a\",";
    line.resize(FILTER_MAX_LINE, ' ');
    EXPECT_EQ(FILTER_PARSED, Parse("[Common]\n" + line + "\"b\"\n"));
    EXPECT_THAT(Names(), ElementsAre("a", "b"));
}

TEST_F(FilterParserTest, TheEndOfTheLongestLineClosesAString) {
    std::string line = "black_name = ";
    line.resize(FILTER_MAX_LINE - 4, ' ');
    EXPECT_EQ(FILTER_PARSE_FAILED, Parse("[Common]\n" + line + "\"abcdef\"\n"));
    EXPECT_THAT(Names(), ElementsAre("abc"));
    EXPECT_EQ("parser: KEY_ILLEGAL_CHARACTER at line 2\n", m_errors);
}

TEST_F(FilterParserTest, ALineOfTenMegabytesIsRefusedWithoutHarm) {
    EXPECT_EQ(FILTER_PARSE_FAILED, Parse("[Common]\nblack_char = \"" + std::string(10 << 20, 'x')));
    EXPECT_EQ("parser: VALUE_TOO_LONG at line 2\n", m_errors);
}

TEST_F(FilterParserTest, ACommentOfTenMegabytesIsCutLikeAnyLine) {
    EXPECT_EQ(FILTER_PARSE_FAILED, Parse("#" + std::string(10 << 20, 'x')));
    EXPECT_EQ("parser: LINE_NOT_EXPECTED at line 1\n", m_errors);
    EXPECT_EQ(FILTER_PARSED, Parse(std::string(10 << 20, '#')));
}

TEST_F(FilterParserTest, ANulByteIsAControlCharacter) {
    const std::string nul("\0", 1);
    EXPECT_EQ(FILTER_PARSE_FAILED, Parse("[Common]\nblack_name = \"a" + nul + "b\"\n"));
    EXPECT_EQ("parser: VALUE_STRING_ILLEGAL_CHARACTER at line 2\n", m_errors);
    EXPECT_EQ(FILTER_PARSE_FAILED, Parse(nul));
    EXPECT_EQ(FILTER_PARSED, Parse("# comment " + nul + "\n[Common]\n"));
}

TEST_F(FilterParserTest, AListStartsWithRoomForFourAndDoubles) {
    BlackFilter record;
    StringList& list = record.common.black_name;
    list.Add("1");
    EXPECT_EQ(4u, list.Capacity());
    for (int i = 0; i < 4; ++i) list.Add("x");
    EXPECT_EQ(8u, list.Capacity());
    EXPECT_EQ(5u, list.Count());
    record.directory.black_name.Add("1");
    EXPECT_EQ(2u, record.directory.black_name.Capacity());
}

}  // namespace
