#include "client/json-output.h"

#include <gtest/gtest.h>

#include "ipc/pobject.h"
#include "platform/json-util.h"

namespace {

// What is written for a text, without the quotes around it. A reader has to get the same text.
std::string Written(const std::string& text) {
    const std::string line = JsonLine(Json::Value(text));
    Json::Value list;
    EXPECT_EQ(0, ParseJson("[" + line + "]", list)) << line;
    EXPECT_EQ(text, list[0].asString()) << line;
    return line.substr(1, line.size() - 2);
}

}  // namespace

TEST(JsonOutputTest, WhatCanBeShownIsWrittenAsItIs) {
    EXPECT_EQ("IMG 0001~.JPG", Written("IMG 0001~.JPG"));
    EXPECT_EQ("Bücher und 写真 📷", Written("Bücher und 写真 📷"));
    EXPECT_EQ("", Written(""));
}

TEST(JsonOutputTest, WhatATerminalWouldObeyIsWrittenAsAnEscape) {
    EXPECT_EQ("\\u001b[2J", Written("\033[2J"));
    EXPECT_EQ("a\\u007fb", Written("a\x7F"
                                   "b"));
    EXPECT_EQ("\\u009b31m", Written("\u009B31m")) << "an escape in one character";
    EXPECT_EQ("\\u202egpj.exe", Written("\u202Egpj.exe")) << "turns the reading direction";
    EXPECT_EQ("a\\u2028b", Written("a\u2028b")) << "a line end to some";
    EXPECT_EQ("\\udb40\\udc01", Written("\U000E0001")) << "beyond the first 65,536 characters";
    EXPECT_EQ("\\n\\t\\\"\\\\", Written("\n\t\"\\"));
}

TEST(JsonOutputTest, NamesOfMembersAreEscapedAlike) {
    PObject task;
    task["\u202E"] = "\u009B";
    task["\xFF"] = 7;
    EXPECT_EQ("{\"\\u202e\":\"\\u009b\",\"\uFFFD\":7}", JsonLine(ToJson(task)));
}

TEST(JsonOutputTest, BytesThatAreNoUtf8NeverGetOut) {
    EXPECT_EQ("\"\\ufffdx\"", JsonLine(Json::Value("\x9Bx")));
    EXPECT_EQ("\"\uFFFDx\"", JsonLine(JsonText("\x9Bx")));
}

TEST(JsonOutputTest, AnAnswerIsIndentedAndEscapedToo) {
    Json::Value answer;
    answer["name"] = "\u202E";
    testing::internal::CaptureStdout();
    PrintJson(answer);
    EXPECT_EQ("{\n  \"name\" : \"\\u202e\"\n}\n", testing::internal::GetCapturedStdout());
}
