#include "db/log-info.h"

#include <gtest/gtest.h>
#include <json/reader.h>
#include <json/value.h>

#include <random>

#include "db/log-db.h"

namespace {

struct DescriptionCase {
    int id;
    int parameters;
    int type;
};
constexpr DescriptionCase kCases[] = {
    {0,    1, 1},
    {1,    1, 1},
    {2,    1, 1},
    {3,    1, 1},
    {10,   2, 1},
    {11,   1, 1},
    {100,  1, 1},
    {101,  1, 1},
    {102,  1, 2},
    {103,  1, 2},
    {104,  2, 1},
    {1000, 2, 4},
};

LogDescription::ID Id(int number) { return static_cast<LogDescription::ID>(number); }

std::string ParamOf(const std::string& name) {
    LogInfo info;
    EXPECT_EQ(0, info.SetDescription(LogDescription::LOG_DESC_TASK_ADDED, name));
    return info.description_param;
}

// What a displaying program reads out of a one-element parameter text.
std::string ReadBack(const std::string& param) {
    Json::Value array;
    EXPECT_TRUE(Json::Reader().parse(param, array)) << param;
    EXPECT_EQ(1u, array.size()) << param;
    return array[0].asString();
}

TEST(LogInfoTest, NewAndClearedRecordsAreAllZero) {
    LogInfo info;
    for (int round = 0; round < 2; ++round) {
        EXPECT_EQ(0u, info.task_id);
        EXPECT_EQ(0, info.log_type);
        EXPECT_EQ(0u, info.timestamp);
        EXPECT_EQ(0, info.description_id);
        EXPECT_EQ("", info.description_param);
        EXPECT_EQ(0, info.error);
        info.SetTaskId(7);
        info.SetError(-2);
        info.timestamp = 5;
        ASSERT_EQ(0, info.SetDescription(LogDescription::LOG_DESC_FILE_FAILED, "a", "b"));
        info.Clear();
    }
}

TEST(LogInfoTest, EveryDescriptionHasItsTypeAndItsNumberOfParameters) {
    for (const DescriptionCase& row : kCases) {
        LogInfo info;
        EXPECT_EQ(0, info.SetDescription(Id(row.id), "a", "b", "c")) << row.id;
        EXPECT_EQ(row.id, info.description_id);
        EXPECT_EQ(row.type, info.log_type) << row.id;
        EXPECT_EQ(row.parameters == 1 ? "[\"a\"]" : "[\"a\",\"b\"]", info.description_param)
            << row.id;
    }
}

TEST(LogInfoTest, NumbersWithoutADescriptionAreRefusedAndLeaveTheRecordAsItWas) {
    LogInfo info;
    ASSERT_EQ(0, info.SetDescription(LogDescription::LOG_DESC_TASK_STOPPED, "a"));
    size_t next = 0;
    for (int id = -1; id <= 1001; ++id) {
        if (next < std::size(kCases) && kCases[next].id == id) {
            ++next;
            continue;
        }
        EXPECT_EQ(-1, info.SetDescription(Id(id), "x", "y")) << id;
    }
    EXPECT_EQ(std::size(kCases), next);
    EXPECT_EQ(102, info.description_id);
    EXPECT_EQ(2, info.log_type);
    EXPECT_EQ("[\"a\"]", info.description_param);
}

TEST(LogInfoTest, MissingParameterIsRefused) {
    LogInfo info;
    EXPECT_EQ(-1, info.SetDescription(LogDescription::LOG_DESC_TASK_RENAMED, "old"));
    EXPECT_EQ(0, info.log_type);
    EXPECT_EQ("", info.description_param);
}

TEST(LogInfoTest, NameWithADoubleQuoteIsValidJson) {
    EXPECT_EQ("[\"a\\\"b\"]", ParamOf("a\"b"));
    EXPECT_EQ("a\"b", ReadBack(ParamOf("a\"b")));
}

TEST(LogInfoTest, NamesReadBackAsTheyWere) {
    const std::string names[] = {"",
                                 " ",
                                 "name\n",
                                 "\t\v\f\r\n",
                                 "it's",
                                 "%s %n",
                                 "\\",
                                 "</script>",
                                 "[\"]",
                                 "\x01\x1f\x7f",
                                 "\xc3\xbc",
                                 "\xe2\x82\xac",
                                 "\xf0\x9f\x93\xb7 x",
                                 "a/b c.d",
                                 std::string(70000, '"')};
    for (const std::string& name : names) EXPECT_EQ(name, ReadBack(ParamOf(name))) << name;
}

TEST(LogInfoTest, CharactersAboveAsciiAreStoredAsEscapes) {
    EXPECT_EQ("[\"\\u00fc\\ud83d\\udcf7\"]", ParamOf("\xc3\xbc\xf0\x9f\x93\xb7"));
}

TEST(LogInfoTest, BytesThatAreNoUtf8AreStoredAsReplacementCharacters) {
    EXPECT_EQ("[\"a\\ufffdb\"]", ParamOf("a\xff"
                                         "b"));
}

TEST(LogInfoTest, AnyBytesGiveValidAsciiJson) {
    std::mt19937 random(1);
    for (int round = 0; round < 2000; ++round) {
        std::string name(random() % 40, '\0');
        // Never a NUL, and mostly bytes above ASCII, which may or may not be UTF-8.
        for (char& c : name)
            c = static_cast<char>(random() % 4 == 0 ? 1 + random() % 127 : 128 + random() % 128);
        const std::string param = ParamOf(name);
        for (const signed char c : param) {
            ASSERT_GE(c, 0x20) << round << ": " << static_cast<int>(c);
        }
        ReadBack(param);
    }
}

}  // namespace
