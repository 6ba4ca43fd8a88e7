#include "client/log-query.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "client/exit-status.h"
#include "client/log-fixture.h"
#include "client/log-reader.h"

namespace {

using namespace std::string_literals;
using testing::ElementsAre;
using testing::IsEmpty;

class LogQueryTest : public LogFixture {
protected:
    // The times of the rows that are shown, in their order.
    Times Shown(const LogQuery::Wish& wish, uint32_t limit = 0) {
        return TimesOf(ReadLog(m_db, LogQuery(wish), limit));
    }
    Times WithText(const std::string& text, uint32_t limit = 0) {
        return Shown({.text = text}, limit);
    }
    // Stores names as rows with the times 1, 2, 3, ...
    void AddFiles(const std::vector<std::string>& names) {
        for (size_t i = 0; i < names.size(); ++i) {
            Add(FileRow("Camera", names[i], static_cast<uint32_t>(i + 1)));
        }
    }
};

// --- What is asked for

TEST_F(LogQueryTest, EverythingComesOldestFirst) {
    Add(TaskRow(LogDescription::LOG_DESC_TASK_ADDED, 10));
    Add(FileRow("Camera", "a.jpg", 20));
    Add(TaskRow(LogDescription::LOG_DESC_TASK_DONE, 30));
    EXPECT_THAT(Shown({}), ElementsAre(10, 20, 30));
    EXPECT_THAT(Shown({}, 2), ElementsAre(20, 30)) << "the newest";
    EXPECT_THAT(Shown({}, 3), ElementsAre(10, 20, 30));
    EXPECT_THAT(Shown({}, 4), ElementsAre(10, 20, 30));
}

TEST_F(LogQueryTest, TaskTimeAndKindNarrowIt) {
    Add(FileRow("Camera", "a.jpg", 10, 1));
    Add(FileRow("Camera", "b.jpg", 20, 2));
    Add(TaskRow(LogDescription::LOG_DESC_TASK_FAILED, 30, 2));
    Add(TaskRow(LogDescription::LOG_DESC_TASK_DONE, 40, 2));
    EXPECT_THAT(Shown({.task_id = 2}), ElementsAre(20, 30, 40));
    EXPECT_THAT(Shown({.task_id = 7}), IsEmpty());
    EXPECT_THAT(Shown({.from_time = 20}), ElementsAre(20, 30, 40));
    EXPECT_THAT(Shown({.to_time = 20}), ElementsAre(10, 20));
    EXPECT_THAT(Shown({.from_time = 11, .to_time = 39}), ElementsAre(20, 30));
    EXPECT_THAT(Shown({.log_type = LogDB::LOG_TYPE_INFO}), ElementsAre(40));
    EXPECT_THAT(Shown({.log_type = LogDB::LOG_TYPE_TASK_ERROR}), ElementsAre(30));
    EXPECT_THAT(Shown({.log_type = LogDB::LOG_TYPE_FILE_ERROR}), ElementsAre(10, 20));
    EXPECT_THAT(Shown({.task_id = 2, .log_type = LogDB::LOG_TYPE_FILE_ERROR, .text = "B.JPG"}),
                ElementsAre(20));
}

TEST_F(LogQueryTest, RowsFitAsTheDatabaseChoosesThem) {
    Add(FileRow("Camera", "a.jpg", 10, 1));
    Add(TaskRow(LogDescription::LOG_DESC_TASK_FAILED, 20, 2));
    std::vector<LogInfo> all;
    ASSERT_EQ(0, m_db.ListLogInfo(LogQuery::Everything(), all));
    ASSERT_EQ(2U, all.size());
    const LogQuery::Wish wishes[] = {
        {},
        {.task_id = 1},
        {.task_id = 2},
        {.task_id = 3},
        {.from_time = 10},
        {.from_time = 11},
        {.from_time = 21},
        {.to_time = 9},
        {.to_time = 10},
        {.to_time = 20},
        {.log_type = LogDB::LOG_TYPE_INFO},
        {.log_type = LogDB::LOG_TYPE_TASK_ERROR},
        {.log_type = LogDB::LOG_TYPE_FILE_ERROR},
        {.text = "camera"},
        {.text = "a.jpg"},
    };
    for (const LogQuery::Wish& wish : wishes) {
        const LogQuery query(wish);
        std::vector<LogInfo> chosen;
        ASSERT_EQ(0, m_db.ListLogInfo(query.Filter(), chosen));
        EXPECT_EQ(TimesOf(FittingRows(all, query, 0)), TimesOf(FittingRows(chosen, query, 0)));
        EXPECT_EQ(chosen.size(), FittingRows(all, query, 0).size());
    }
}

TEST_F(LogQueryTest, DescriptionsOfLaterVersionsAreListed) {
    for (const int id : {0, 4, 12, 105, 199, 1001, 1099}) {
        LogInfo row = FileRow("Camera", "a.jpg", static_cast<uint32_t>(id + 1));
        row.description_id = id;
        Add(row);
    }
    EXPECT_THAT(Shown({}), ElementsAre(1, 5, 13, 106, 200, 1002, 1100));
}

TEST_F(LogQueryTest, ClosedLogIsARefusal) {
    m_db.Close();
    try {
        (void)ReadLog(m_db, LogQuery({}), 0);
        ADD_FAILURE() << "read all the same";
    } catch (const CommandError& error) {
        EXPECT_EQ(EXIT_REFUSED, error.Status());
    }
}

// --- A text in a name

struct TextCase {
    std::string text;
    std::string name;   // found
    std::string other;  // not found
};

const std::string LONG_NAME(300, 'x');
const std::string LONG_SIGNS(60000, '%');
const std::string LONG_QUOTES(60000, '\'');

// Looked for among rows of its own: whole, at the end of a longer name, and in the task's name.
const TextCase TEXTS[] = {
    {"'",                               "it's",                            "its"                },
    {"''",                              "it''s",                           "it's"               },
    {"'; DROP TABLE log_info_table;--", "'; DROP TABLE log_info_table;--", "log_info_table"     },
    {"' OR '1'='1",                     "' OR '1'='1",                     "1"                  },
    {"%' --",                           "100%' --",                        "100 --"             },
    {";--",                             "a;--b",                           "a;-b"               },
    {"\"",                              "say \"no\"",                      "say no"             },
    {"\"no\"",                          "say \"no\"",                      "say no"             },
    {"\",\"",                           "a\",\"b",                         "a,b"                },
    {"\\",                              "C:\\temp",                        "C:/temp"            },
    {"\\\\",                            "\\\\server",                      "\\server"           },
    {"\\temp",                          "C:\\temp",                        "C:\temp"            },
    {"\\'",                             "a\\'b",                           "a'b"                },
    {"\\%",                             "a\\%b",                           "a%b"                },
    {"%",                               "100%",                            "100"                },
    {"0%s",                             "100%sure",                        "100 is sure"        },
    {"_",                               "IMG_1",                           "IMG1"               },
    {"G_1",                             "IMG_1",                           "IMGx1"              },
    {"\n",                              "a\nb",                            "anb"                },
    {"a\nb",                            "a\nb",                            "a b"                },
    {"\t\r\x01\x7F",                    "x\t\r\x01\x7Fy",                  "x\t\ry"             },
    {"/",                               "a/b",                             "ab"                 },
    {"ü",                              "Büro",                           "Buro"               },
    {"Büro",                           "Büro",                           "B\xC3\xA4ro"        },
    {"U\u0308ber",                      "Über",                           "Uber"               },
    {"Über",                           "U\u0308ber",                      "Uber"               },
    {"Menu\u0308",                      "Menü",                           "Menu"               },
    {"写真",                          "写真.jpg",                      "写.jpg"            },
    {"📷",                            "a📷b",                          "a📸b"             },
    {"\u200F",                          "a\u200Fb",                        "ab"                 },
    {"\u202Egpj",                       "a\u202Egpj.exe",                  "agpj.exe"           },
    {"[",                               "a[1]",                            "a1"                 },
    {"],",                              "[a],b",                           "a"                  },
    {",",                               "a,b",                             "ab"                 },
    {"u00fc",                           "xu00fcx",                         "ü"                 },
    {"\\u00fc",                         "\\u00fc",                         "ü"                 },
    {"n",                               "Kinder",                          "a\nb"               },
    {"  ",                              "two  blanks",                     "one blank"          },
    {"--json",                          "a--json",                         "json"               },
    {"\xFF",                            "a\xFF",                           "a"                  },
    {"caf\xE9",                         "caf\xE9",                         "cafe"               },
    {LONG_NAME,                         LONG_NAME,                         LONG_NAME.substr(1)  },
    {LONG_SIGNS,                        LONG_SIGNS,                        LONG_SIGNS.substr(1) },
    {LONG_QUOTES,                       LONG_QUOTES,                       LONG_QUOTES.substr(1)},
};

TEST_F(LogQueryTest, FindsWhatIsMeantAndNothingElse) {
    uint32_t time = 0;
    for (const TextCase& item : TEXTS) {
        SCOPED_TRACE(item.text.substr(0, 50));
        // The task's name has none of the texts but single letters.
        Add(FileRow("MM", item.name, ++time));
        Add(FileRow("MM", item.other, ++time));
        Add(FileRow("MM", "MM" + item.name, ++time));
        Add(FileRow(item.name, "MM", ++time));
        const LogQuery query({.from_time = time - 3, .to_time = time, .text = item.text});
        EXPECT_THAT(TimesOf(ReadLog(m_db, query, 0)), ElementsAre(time - 3, time - 1, time));
        EXPECT_THAT(TimesOf(ReadLog(m_db, query, 1)), ElementsAre(time));
    }
    uint64_t count = 0;
    EXPECT_EQ(0, m_db.CountLogInfo(LogQuery::Everything(), count));
    EXPECT_EQ(4 * std::size(TEXTS), count) << "the table is as it was";
}

TEST_F(LogQueryTest, PieceForTheDatabaseMeansItselfEverywhere) {
    for (const TextCase& item : TEXTS) {
        const std::string piece = LogQuery({.text = item.text}).Filter().keyword;
        EXPECT_EQ(std::string::npos, piece.find_first_of("'\"\\/")) << piece;
        for (const char c : piece) EXPECT_TRUE(c >= 0x20 && c < 0x7F) << piece;
        EXPECT_LE(piece.size(), 1000U);
    }
    EXPECT_EQ("DROP TABLE log_info_table;--",
              LogQuery({.text = "'DROP TABLE log_info_table;--"}).Filter().keyword);
    EXPECT_EQ("ro.jpg", LogQuery({.text = "Büro.jpg"}).Filter().keyword);
}

TEST_F(LogQueryTest, UpperAndLowerCaseAreTheSame) {
    AddFiles({"Urlaub.JPG", "ÜBER.jpg", "ΑΘΗΝΑ", "МОСКВА", "\u212A"});
    EXPECT_THAT(WithText("URLAUB.jpg"), ElementsAre(1));
    EXPECT_THAT(WithText("über"), ElementsAre(2));
    EXPECT_THAT(WithText("αθηνα"), ElementsAre(3));
    EXPECT_THAT(WithText("москва"), ElementsAre(4));
}

TEST_F(LogQueryTest, NameThatIsNoUtf8IsFoundByItsOwnBytes) {
    AddFiles({"\xC4nderung.jpg", "\xC3\x84nderung.jpg", "nderung.jpg", "\xF0\x9F\x93"});
    EXPECT_THAT(WithText("\xC4nderung"), ElementsAre(1)) << "in an old encoding";
    EXPECT_THAT(WithText("erung.jpg"), ElementsAre(1, 2, 3));
    EXPECT_THAT(WithText("\xF0\x9F\x93"), ElementsAre(4));
}

TEST_F(LogQueryTest, TextCopiedFromASentenceIsFound) {
    AddFiles({"a\nb.jpg", "say \"no\"", "\u202Egpj.exe", "a\\x0ab.jpg"});
    EXPECT_THAT(WithText("a\\x0ab.jpg"), ElementsAre(1, 4));
    EXPECT_THAT(WithText("say \\\"no\\\""), ElementsAre(2));
    EXPECT_THAT(WithText("\\xe2\\x80\\xaegpj"), ElementsAre(3));
}

TEST_F(LogQueryTest, WhatIsStoredAroundTheNamesIsNotFound) {
    AddFiles({"a", "b"});
    for (const char* text : {"[", "]", ",", "\"", "\\", "[\"Camera\"", "\",\"", "Camera\",\"a"}) {
        EXPECT_THAT(WithText(text), IsEmpty()) << text;
    }
    EXPECT_THAT(WithText("camera"), ElementsAre(1, 2));
}

TEST_F(LogQueryTest, DamagedRowsAreFoundByWhatTheyHold) {
    LogInfo row = FileRow("Camera", "a.jpg", 1);
    row.description_param = "[\"Camera\",\"a.j";
    Add(row);
    row.description_param = "Büro 'x'";
    row.timestamp = 2;
    Add(row);
    EXPECT_THAT(WithText("\"a.j"), ElementsAre(1));
    EXPECT_THAT(WithText("büro 'X'"), ElementsAre(2));
}

TEST_F(LogQueryTest, LimitCountsRowsThatFit) {
    // "," stands in every row as it is stored, but only in a tenth of the names.
    for (uint32_t i = 1; i <= 3000; ++i) {
        Add(FileRow("Camera", i % 10 == 0 ? "a,b" : "ab", i));
    }
    EXPECT_THAT(WithText("a,b", 3), ElementsAre(2980, 2990, 3000));
    EXPECT_THAT(WithText(",", 3), ElementsAre(2980, 2990, 3000));
    EXPECT_EQ(300U, WithText(",", 300).size());
    EXPECT_EQ(300U, WithText(",", 301).size());
    EXPECT_EQ(300U, WithText(",").size());
}

TEST_F(LogQueryTest, TextWithANulIsRefused) {
    for (const std::string& text : {"\0"s, "a\0"s, "\0b"s, "a\0' OR 1"s}) {
        try {
            const LogQuery query({.text = text});
            ADD_FAILURE() << "taken";
        } catch (const CommandError& error) {
            EXPECT_EQ(EXIT_USAGE, error.Status());
        }
    }
}

TEST_F(LogQueryTest, EmptyTextFitsEveryRow) {
    AddFiles({"a", ""});
    EXPECT_THAT(WithText(""), ElementsAre(1, 2));
    EXPECT_EQ("", LogQuery({.text = "ü"}).Filter().keyword);
}

}  // namespace
