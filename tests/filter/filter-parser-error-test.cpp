// Every refusal of the parser, as text, error and line.
#include <gmock/gmock.h>

#include "filter/filter-error.h"
#include "filter/filter-parser.h"
#include "filter/filter-record.h"
#include "support/temp-dir.h"

namespace {

struct Case {
    const char* name;
    std::string text;
    int error;
    int line;
};

void PrintTo(const Case& c, std::ostream* out) { *out << c.name; }

// A key of the section that takes a value of the type.
std::string Number(const std::string& value) { return "[Common]\nmax_length = " + value; }
std::string Text(const std::string& value) { return "[Common]\nblack_char = " + value; }
std::string List(const std::string& value) { return "[Common]\nblack_name = " + value; }

const std::string kLong33(33, 'x');

const Case kCases[] = {
    {"EmptySection",            "[]\n",                          -3,           1                                                     },
    {"SectionWithoutEnd",       "[Common\n",                     -2,           1                                                     },
    {"SectionWithoutEndOfFile", "[Common",                       -2,           1                                                     },
    {"SectionCutByComment",     "[Com#mon]\n",                   -2,           1                                                     },
    {"OnlyABracket",            "[\n",                           -2,           1                                                     },
    {"BlankInSection",          "[Com mon]\n",                   -4,           1                                                     },
    {"BlankSection",            "[ ]\n",                         -4,           1                                                     },
    {"OtherCharInSection",      "[Com.mon]\n",                   -4,           1                                                     },
    {"ByteAboveAsciiInSection", "[\xc3\xa4]\n",                  -4,           1                                                     },
    {"SectionOf33",             "[" + kLong33 + "]\n",           -5,           1                                                     },
    {"SectionOf32",             "[" + kLong33.substr(1) + "]\n", -6,           1                                                     },
    {"UnknownSection",          "[Nothing]\n",                   -6,           1                                                     },
    {"SectionInOtherCase",      "[common]\n",                    -6,           1                                                     },
    {"TextAfterSection",        "[Common] x\n",                  -24,          1                                                     },
    {"TextAfterUnknownSection", "[Nothing] x\n",                 -24,          1                                                     },
    {"KeyBeforeSections",       "# x\n\nmajor = 1\n",            -25,          3                                                     },
    {"QuoteBeforeSections",     "\"a\"\n",                       -25,          1                                                     },
    {"NoKey",                   "[Common]\n= 1\n",               -7,           2                                                     },
    {"QuoteInPlaceOfKey",       "[Common]\n\"a\"\n",             -7,           2                                                     },
    {"KeyOf33",                 "[Common]\n" + kLong33 + "=1\n", -9,           2                                                     },
    {"KeyWithoutEquals",        "[Common]\nmax_length 1\n",      -8,           2                                                     },
    {"KeyAlone",                "[Common]\nmax_length\n",        -8,           2                                                     },
    {"KeyWithOtherChar",        "[Common]\nmax.length = 1\n",    -8,           2                                                     },
    {"UnknownKeyWithoutEquals", "[Common]\nunknown\n",           -8,           2                                                     },
    {"NoNumber",                Number("\n"),                    -13,          2                                                     },
    {"CommentInPlaceOfNumber",  Number("# 5\n"),                 -13,          2                                                     },
    {"NoNumberAtEndOfFile",     Number(""),                      -13,          2                                                     },
    {"LongNumber",              Number(std::string(1024,         '1') + "\n"), -23,                                                    2},
    {"WordAsNumber",                         Number("ten\n"),                                           -11,                2                        },
    {"SignAlone",                         Number("-\n"),                                              -11,                     2  },
    {"FractionAlone",                         Number(".5\n"),                                          -11,                2                       },
    {"PointWithoutFraction",                         Number("5.\n"),                                   -12,         2  },
    {"PointAndWord",                         Number("5.x\n"),                                           -12,                2                      },
    {"LeadingZero",                         Number("007\n"),                                            -14,                 2  },
    {"NumberAndWord",                         Number("5x\n"),                                          -14,                2                       },
    {"HexNumber",                         Number("0x10\n"),                                              -14,                  2},
    {"FractionAndWord",                         Number("5.5x\n"),                                        -14,            2                       },
    {"TwoNumbers",                         Number("5 6\n"),                                             -24,                  2 },
    {"NumberAndComma",                         Number("5 ,\n"),                                         -24,              2                       },
    {"StringWithoutQuotes",                         Text("abc\n"),                                    -15,           2   },
    {"NoString",                         Text("\n"),                                               -15,                         2                          },
    {"StringWithoutEnd",                         Text("\"abc\n"),                                       -16,            2},
    {"ListWithoutEnd",                         List("\"a\", \"abc\n"),                                         -16,       2                   },
    {"UnknownEscape",                         Text("\"\\q\"\n"),                                          -20,             2   },
    {"HexEscapeOfOneDigit",                         Text("\"\\x4\"\n"),                                    -20,      2                  },
    {"HexEscapeOfNoDigit",                         Text("\"\\xgg\"\n"),                                     -20,      2  },
    {"OctalEscapeAbove377",                         Text("\"\\400\"\n"),                                    -20,     2                  },
    {"OctalEscapeOfTwoDigits",                         Text("\"\\12\"\n"),                                 -20,   2   },
    {"OctalEscapeWith8",                         Text("\"\\018\"\n"),                                       -20,        2                 },
    {"BackslashAtEndOfLine",                         Text("\"abc\\\n"),                                   -20,      2     },
    {"BackslashAtEndOfFile",                         Text("\"abc\\"),                                   -20,        2                   },
    {"TabInString",                         Text("\"a\tb\"\n"),                                            -20,              2  },
    {"ReturnInString",                         Text("\"a\r\n"),                                         -20,              2                      },
    {"DeleteInString",                         Text("\"a\x7f\"\n"),                                         -20,          2},
    {"EmptyString",                         Text("\"\"\n"),                                            -21,                  2                           },
    {"EmptyStringInList",                         List("\"a\", \"\"\n"),                                      -21,     2},
    {"QuoteAtEndOfFile",                         Text("\""),                                       -21,                 2                                      },
    {"StringOf1025",                         Text("\"" + std::string(1025,                                           'x') + "\"\n"),   -23,2},
    {"TextAfterString",                        Text("\"a\" b\n"),                                                       -24,                                                   2                                                                                                      },
    {"CommaAfterString",                        Text("\"a\", \"b\"\n"),                                                       -24,2},
    {"ListWithoutSeparator",                        List("\"a\" \"b\"\n"),                                                       22,                                               2                                                                                                                                                      },
    {"ListWithOtherSeparator",                        List("\"a\"; \"b\"\n"),                                                       22,2},
    {"WordInList",                        List("\"a\", b\n"),                                                       -15,                                                           2                                                                                                                                                                                                                       },
    {"TwoCommas",                        List("\"a\",, \"b\"\n"),                                                       -15,2},
    {"KeyAfterCommaOfList",                        List("\"a\",\nmax_length = 1\n"),                                                       -25,                                                 3                                                                                                                                                                                                                                                                },
    {"SectionAfterCommaOfList",                        List("\"a\",\n[File]\n"),                                                       -25,3},
    {"ContinuationAfterTheList",                        List("\"a\",\n\"b\"\n\"c\"\n"),                                                       -7,                                                4                                                                                                                                                                                                                                                                                                               },
};

class FilterParserErrorTest : public testing::TestWithParam<Case> {};

TEST_P(FilterParserErrorTest, IsToldWithItsNameAndLine) {
    const TempDir dir;
    const std::string path = dir.Write("test.filter", GetParam().text);
    BlackFilter record;
    testing::internal::CaptureStdout();
    testing::internal::CaptureStderr();
    const int result = ParseConfigFile(path, black_list_filter_schema, &record);
    testing::internal::GetCapturedStdout();
    EXPECT_EQ(std::string("parser: ") + FilterErrorName(GetParam().error) + " at line " +
                  std::to_string(GetParam().line) + "\n",
              testing::internal::GetCapturedStderr());
    EXPECT_EQ(FILTER_PARSE_FAILED, result);
}

INSTANTIATE_TEST_SUITE_P(Refusals, FilterParserErrorTest, testing::ValuesIn(kCases),
                         [](const auto& test) { return test.param.name; });

TEST(FilterErrorName, EveryCodeOfTheTableHasItsName) {
    const char* const names[] = {
        "NO_ERROR",
        "SECTION_MISSING_LEFT_BRACKET",
        "SECTION_MISSING_RIGHT_BRACKET",
        "SECTION_MISSING_SECTION",
        "SECTION_ILLEGAL_CHARACTER",
        "SECTION_TOO_LONG",
        "SECTION_UNDEFINED_SECTION",
        "KEY_MISSING_KEY",
        "KEY_ILLEGAL_CHARACTER",
        "KEY_TOO_LONG",
        "KEY_UNDEFINED_KEY",
        "VALUE_NUMERIC_MISSING_INTEGER_PART",
        "VALUE_NUMERIC_MISSING_FRACTIONAL_PART",
        "VALUE_NUMERIC_MISSING_VALUE",
        "VALUE_NUMERIC_ILLEGAL_SYNTAX",
        "VALUE_STRING_MISSING_LEFT_QUOTE",
        "VALUE_STRING_MISSING_RIGHT_QUOTE",
        "VALUE_STRING_ESCAPE_ILLEGAL_SEQUENCE",
        "VALUE_STRING_ESCAPE_ILLEGAL_HEX_VALUE",
        "VALUE_STRING_ESCAPE_ILLEGAL_OCT_VALUE",
        "VALUE_STRING_ILLEGAL_CHARACTER",
        "VALUE_STRING_EMPTY",
        "VALUE_SET_MISSING_SEPARATER",
        "VALUE_TOO_LONG",
        "LINE_NOT_ENDED",
        "LINE_NOT_EXPECTED",
        "INTERNAL_ERROR",
    };
    int code = 0;
    for (const char* name : names) EXPECT_STREQ(name, FilterErrorName(code--));
}

TEST(FilterErrorName, AnyOtherCodeIsUnknown) {
    EXPECT_STREQ("Unknown error", FilterErrorName(22));
    EXPECT_STREQ("Unknown error", FilterErrorName(-27));
}

}  // namespace
