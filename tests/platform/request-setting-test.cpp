#include "platform/request-setting.h"

#include <gtest/gtest.h>

#include "ipc/pobject.h"

namespace {

TEST(RequestSettingTest, AbsentKeysGiveTheEmptyValueAndCountAsUnchanged) {
    PObject request;
    request["other"] = 1;
    std::string text = "x";
    bool flag = true;
    int number = 5;
    uint64_t count = 5;
    EXPECT_FALSE(GetChangedString(request, "k", "old", text));
    EXPECT_FALSE(GetChangedBool(request, "k", true, flag));
    EXPECT_FALSE(GetChangedInt(request, "k", 9, number));
    EXPECT_FALSE(GetChangedUInt64(request, "k", 9, count));
    EXPECT_EQ("", text);
    EXPECT_FALSE(flag);
    EXPECT_EQ(0, number);
    EXPECT_EQ(0u, count);
}

TEST(RequestSettingTest, RequestThatIsNoMapHasNoKeys) {
    const PObject request("text");
    std::string text = "x";
    int number = 5;
    EXPECT_FALSE(GetChangedString(request, "k", "old", text));
    EXPECT_FALSE(GetChangedInt(request, "k", 9, number));
    EXPECT_EQ("", text);
    EXPECT_EQ(0, number);
}

TEST(RequestSettingTest, StringIsChangedWhenItDiffersAndIsNotEmpty) {
    PObject request;
    std::string text;
    request["k"] = "new";
    EXPECT_TRUE(GetChangedString(request, "k", "old", text));
    EXPECT_EQ("new", text);
    EXPECT_FALSE(GetChangedString(request, "k", "new", text));
    EXPECT_EQ("new", text);
    request["k"] = "";
    text = "x";
    EXPECT_FALSE(GetChangedString(request, "k", "old", text)) << "empty counts as not sent";
    EXPECT_EQ("", text);
}

TEST(RequestSettingTest, StringEndsAtItsFirstNul) {
    PObject request;
    std::string text;
    request["k"] = std::string("old\0and more", 12);
    EXPECT_FALSE(GetChangedString(request, "k", "old", text)) << "that much of it is stored";
    EXPECT_EQ("old", text);
    request["k"] = std::string("\0new", 4);
    EXPECT_FALSE(GetChangedString(request, "k", "old", text));
    EXPECT_EQ("", text);
}

TEST(RequestSettingTest, OldValueAndOutMayBeTheSameString) {
    PObject request;
    request["k"] = "new";
    std::string text = "old";
    EXPECT_TRUE(GetChangedString(request, "k", text, text));
    EXPECT_EQ("new", text);
}

TEST(RequestSettingTest, BoolIsChangedWhenItDiffers) {
    PObject request;
    bool flag = false;
    request["k"] = true;
    EXPECT_TRUE(GetChangedBool(request, "k", false, flag));
    EXPECT_TRUE(flag);
    EXPECT_FALSE(GetChangedBool(request, "k", true, flag));
    request["k"] = false;
    EXPECT_TRUE(GetChangedBool(request, "k", true, flag));
    EXPECT_FALSE(flag);
}

TEST(RequestSettingTest, NumbersAreChangedWhenTheyDiffer) {
    PObject request;
    int number = 0;
    request["k"] = -7;
    EXPECT_TRUE(GetChangedInt(request, "k", 7, number));
    EXPECT_EQ(-7, number);
    EXPECT_FALSE(GetChangedInt(request, "k", -7, number));
    uint64_t count = 0;
    request["k"] = uint64_t{18446744073709551615u};
    EXPECT_TRUE(GetChangedUInt64(request, "k", 0, count));
    EXPECT_EQ(18446744073709551615u, count);
    EXPECT_FALSE(GetChangedUInt64(request, "k", 18446744073709551615u, count));
    request["k"] = 0;
    EXPECT_TRUE(GetChangedInt(request, "k", 7, number)) << "0 that was sent is a value";
    EXPECT_TRUE(GetChangedUInt64(request, "k", 7, count));
}

}  // namespace
