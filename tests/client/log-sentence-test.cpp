#include "client/log-sentence.h"

#include <gtest/gtest.h>

#include <set>

#include "client/outcome-text.h"
#include "db/log-info.h"
#include "utils/error-code.h"

namespace {

using namespace std::string_literals;

LogInfo Row(LogDescription::ID id, const std::string& first, const std::string& second = "",
            int error = 0) {
    LogInfo row;
    row.SetTaskId(3);
    EXPECT_EQ(0, row.SetDescription(id, first, second));
    row.SetError(error);
    return row;
}

LogInfo Stored(int id, const std::string& parameters, int error = 0) {
    LogInfo row;
    row.SetTaskId(3);
    row.description_id = id;
    row.description_param = parameters;
    row.SetError(error);
    return row;
}

struct SentenceCase {
    LogDescription::ID id;
    const char* sentence;
};

// As many as there are descriptions.
constexpr SentenceCase SENTENCES[] = {
    {LogDescription::LOG_DESC_TASK_ADDED,            "Task \"Camera\" was added"                            },
    {LogDescription::LOG_DESC_TASK_REMOVED,          "Task \"Camera\" was removed"                          },
    {LogDescription::LOG_DESC_DEFAULT_TASK_ENABLED,  "Default task \"Camera\" was switched on"              },
    {LogDescription::LOG_DESC_DEFAULT_TASK_DISABLED, "Default task \"Camera\" was switched off"             },
    {LogDescription::LOG_DESC_TASK_RENAMED,          "Task \"Camera\" was renamed to \"IMG_1.JPG\""         },
    {LogDescription::LOG_DESC_TASK_SETTING_CHANGED,  "The settings of task \"Camera\" were changed"         },
    {LogDescription::LOG_DESC_TASK_STARTED,          "Task \"Camera\" started"                              },
    {LogDescription::LOG_DESC_TASK_DONE,             "Task \"Camera\" finished"                             },
    {LogDescription::LOG_DESC_TASK_STOPPED,          "Task \"Camera\" was stopped before its end"           },
    {LogDescription::LOG_DESC_TASK_FAILED,           "Task \"Camera\" failed: the destination is full"      },
    {LogDescription::LOG_DESC_ROTATED,               "Task \"Camera\" removed its old version \"IMG_1.JPG\""},
    {LogDescription::LOG_DESC_FILE_FAILED,
     "\"IMG_1.JPG\" could not be copied by task \"Camera\": the destination is full"                        },
};

TEST(LogSentenceTest, EveryDescriptionHasItsSentence) {
    for (const SentenceCase& item : SENTENCES) {
        EXPECT_EQ(item.sentence,
                  LogSentence(Row(item.id, "Camera", "IMG_1.JPG", ERR_DST_QUOTA_FULL)));
    }
}

TEST(LogSentenceTest, EveryNumberThatCanBeWrittenIsKnown) {
    std::set<int> known;
    for (const SentenceCase& item : SENTENCES) known.insert(item.id);
    for (int id = -10; id < 2000; ++id) {
        LogInfo row;
        const bool is_written =
            row.SetDescription(static_cast<LogDescription::ID>(id), "a", "b") == 0;
        EXPECT_EQ(is_written, known.count(id) == 1) << id;
    }
}

TEST(LogSentenceTest, EveryOutcomeHasAClauseOfItsOwn) {
    std::set<std::string> clauses;
    for (int code = ERR_SUCCESS; code >= ERR_LAST; --code) {
        const std::string clause = OutcomeText(code);
        EXPECT_EQ(std::string::npos, clause.find("not known")) << code;
        EXPECT_NE(ErrorText(code), clause) << code;
        EXPECT_TRUE(clauses.insert(clause).second) << clause;
        EXPECT_EQ("Task \"Camera\" failed: " + clause,
                  LogSentence(Row(LogDescription::LOG_DESC_TASK_FAILED, "Camera", "", code)));
    }
    EXPECT_EQ("the source folder does not exist", OutcomeText(ERR_SRC_ROOT_MISS));
    EXPECT_EQ("there is no permission for it", OutcomeText(ERR_NO_PERMISSION));
}

TEST(LogSentenceTest, NumberThatIsNoOutcomeIsTold) {
    EXPECT_EQ("Task \"Camera\" failed: error -24, which is not known here",
              LogSentence(Row(LogDescription::LOG_DESC_TASK_FAILED, "Camera", "", -24)));
    EXPECT_EQ("error 7, which is not known here", OutcomeText(7));
}

TEST(LogSentenceTest, UnknownDescriptionIsShownWithNumberAndParameters) {
    EXPECT_EQ("Unknown event 105 of task 3: \"Camera\", \"two\", \"three\"",
              LogSentence(Stored(105, R"(["Camera","two","three"])")));
    EXPECT_EQ("Unknown event -1 of task 3", LogSentence(Stored(-1, "[]")));
    EXPECT_EQ("Unknown event 105 of task 3: \"Camera\" (the destination is full)",
              LogSentence(Stored(105, R"(["Camera"])", ERR_DST_QUOTA_FULL)));
}

TEST(LogSentenceTest, DamagedParametersAreShownAsTheyAre) {
    const std::string cases[] = {
        "",
        "[",
        "[\"Camera\"",
        "[\"Camera\"] x",
        "[\"Camera\",]",
        "[Camera]",
        "\"Camera\"",
        "{\"Camera\":1}",
        "{\"0\":\"Camera\"}",
        "[1]",
        "[null]",
        "[[\"Camera\"]]",
        "[\"\\ud800\"]",
        "[\"\\u12\"]",
        "['Camera']",
        "null",
        "[]",
        R"(["Camera","IMG_1.JPG"])",
        std::string("[\"Cam\0era\"", 10),
        "\xFF\xFE",
    };
    for (const std::string& stored : cases) {
        EXPECT_EQ("Damaged record of event 0 of task 3: \"" + NameInSentence(stored) + '"',
                  LogSentence(Stored(0, stored)))
            << stored;
    }
    EXPECT_EQ("Damaged record of event 1000 of task 3: \"[\\\"a\\\"]\" (the destination is full)",
              LogSentence(Stored(1000, R"(["a"])", ERR_DST_QUOTA_FULL)))
        << "a file's row without the file";
}

TEST(LogSentenceTest, DamagedTextOfAnyLengthStaysALine) {
    for (const std::string& stored : {std::string(5000000, '['), std::string(5000000, 'x'),
                                      "[\"" + std::string(5000000, '\n')}) {
        const std::string sentence = LogSentence(Stored(0, stored));
        EXPECT_LT(sentence.size(), 600U);
        EXPECT_TRUE(sentence.starts_with("Damaged record of event 0 of task 3: \"")) << sentence;
        EXPECT_EQ(std::string::npos, sentence.find('\n'));
    }
}

struct NameCase {
    std::string name;
    const char* shown;
};

TEST(LogSentenceTest, HostileNamesAreJustNames) {
    const NameCase cases[] = {
        {"\033[2J",                   "\\x1b[2J"                        },
        {"a\nTask \"B\" was removed", "a\\x0aTask \\\"B\\\" was removed"},
        {"A\" was removed. Task \"B", "A\\\" was removed. Task \\\"B"   },
        {"\u202Egpj.exe",             "\\xe2\\x80\\xaegpj.exe"          },
        {"{1}{2}{9}{",                "{1}{2}{9}{"                      },
        {"%s%n%5$x",                  "%s%n%5$x"                        },
        {"it's",                      "it's"                            },
        {"nul\0l"s,                   "nul\\x00l"                       },
        {"Bücher 写真 📷",       "Bücher 写真 📷"             },
        {"",                          ""                                },
    };
    for (const NameCase& item : cases) {
        EXPECT_EQ("Task \"" + std::string(item.shown) + "\" was renamed to \"" + item.shown + '"',
                  LogSentence(Row(LogDescription::LOG_DESC_TASK_RENAMED, item.name, item.name)));
    }
}

}  // namespace
