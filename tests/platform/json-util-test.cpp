#include "platform/json-util.h"

#include <gtest/gtest.h>
#include <json/value.h>

#include "ipc/pobject.h"

namespace {

PObject Array(const std::vector<std::string>& texts) {
    PObject array;
    array = PObject::empty_array;
    for (const std::string& text : texts) array.AsArray().emplace_back(text);
    return array;
}

std::vector<std::string> Texts(const PObject& array) {
    std::vector<std::string> texts;
    for (const PObject& element : array.AsArray()) {
        EXPECT_TRUE(element.IsString());
        texts.push_back(element.AsString());
    }
    return texts;
}

const std::vector<std::string> kOddNames = {"",
                                            "*",
                                            "it's",
                                            "\"quoted\"",
                                            "\\",
                                            "two\nlines",
                                            "%s",
                                            "\xc3\xbc",
                                            "\xff\xfe\x80",
                                            "\x01\x1f\x7f",
                                            "\xf0\x9f\x93\xb7",
                                            std::string("nul\0nul", 7)};

TEST(JsonUtilTest, ArrayBecomesAMemberWithItsTexts) {
    Json::Value json;
    PObjectArrayToJson(Array({"b", "a", "b"}), "names", json);
    PObjectArrayToJson(Array({}), "none", json);
    EXPECT_EQ("{\"names\":[\"b\",\"a\",\"b\"],\"none\":[]}", WriteJson(json));
}

TEST(JsonUtilTest, MemberThatIsThereIsReplaced) {
    Json::Value json(Json::objectValue);
    json["names"] = "text";
    json["other"] = 1;
    PObjectArrayToJson(Array({"a"}), "names", json);
    EXPECT_EQ("{\"names\":[\"a\"],\"other\":1}", WriteJson(json));
}

TEST(JsonUtilTest, EmptyKeyIsNotWrittenAndNotRead) {
    Json::Value json(Json::objectValue);
    PObjectArrayToJson(Array({"a"}), "", json);
    EXPECT_EQ("{}", WriteJson(json));
    json[""].append("a");
    PObject array = Array({"old"});
    JsonToPObjectArray(json, "", array);
    EXPECT_TRUE(array.IsArray());
    EXPECT_TRUE(array.IsEmpty());
}

TEST(JsonUtilTest, ValueThatIsNoArrayGivesAnEmptyOne) {
    Json::Value json;
    PObjectArrayToJson(PObject("text"), "names", json);
    EXPECT_EQ("{\"names\":[]}", WriteJson(json));
}

TEST(JsonUtilTest, ReadingSkipsElementsThatAreNoStrings) {
    Json::Value json;
    ASSERT_EQ(0, ParseJson(R"({"names":["a",1,null,"b",["c"],{"d":"e"},true,1.5]})", json));
    PObject array;
    JsonToPObjectArray(json, "names", array);
    EXPECT_EQ((std::vector<std::string>{"a", "b"}), Texts(array));
}

TEST(JsonUtilTest, MissingMemberOrOneThatIsNoArrayReadsAsEmpty) {
    Json::Value json;
    ASSERT_EQ(0, ParseJson(R"({"names":"a","map":{"0":"a"}})", json));
    for (const char* key : {"names", "map", "missing"}) {
        PObject array = Array({"old"});
        JsonToPObjectArray(json, key, array);
        EXPECT_TRUE(array.IsArray()) << key;
        EXPECT_TRUE(array.IsEmpty()) << key;
    }
}

TEST(JsonUtilTest, JsonThatIsNoObjectReadsAsEmpty) {
    for (const char* text : {"null", "[[\"a\"]]", "\"names\"", "7"}) {
        Json::Value json;
        ASSERT_EQ(0, ParseJson(text, json)) << text;
        PObject array = Array({"old"});
        JsonToPObjectArray(json, "names", array);
        EXPECT_TRUE(array.IsArray() && array.IsEmpty()) << text;
    }
}

TEST(JsonUtilTest, NamesReadBackByteForByte) {
    Json::Value json;
    PObjectArrayToJson(Array(kOddNames), "names", json);
    const std::string text = WriteJson(json);
    EXPECT_EQ(std::string::npos, text.find('\n')) << "one line";
    Json::Value read;
    ASSERT_EQ(0, ParseJson(text, read));
    PObject array;
    JsonToPObjectArray(read, "names", array);
    EXPECT_EQ(kOddNames, Texts(array));
}

TEST(JsonUtilTest, TextThatIsNoJsonAsAWholeIsRefused) {
    for (const char* text : {"", " ", "{", "{\"a\":}", "{\"a\":1} x", "{}{}", "nonsense", "{'a':1}",
                             "[1,2", "\"open", "{\"a\" 1}"}) {
        Json::Value json;
        EXPECT_EQ(-1, ParseJson(text, json)) << text;
    }
}

TEST(JsonUtilTest, TextThatIsNestedTooDeeplyIsRefused) {
    for (const size_t depth : {size_t{1001}, size_t{1000000}}) {
        Json::Value json;
        EXPECT_EQ(-1, ParseJson(std::string(depth, '['), json));
        EXPECT_EQ(-1, ParseJson(std::string(depth, '[') + std::string(depth, ']'), json));
    }
    Json::Value json;
    EXPECT_EQ(0, ParseJson(std::string(900, '[') + std::string(900, ']'), json));
}

}  // namespace
