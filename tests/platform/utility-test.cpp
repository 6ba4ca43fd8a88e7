#include "platform/utility.h"

#include <gtest/gtest.h>

#include "fake/fake-keld.h"
#include "support/log-capture.h"

namespace {

struct tm SomeTime() {
    struct tm time = {};
    time.tm_year = 2024 - 1900;
    time.tm_mon = 1;
    time.tm_mday = 29;
    time.tm_hour = 7;
    time.tm_min = 5;
    time.tm_sec = 9;
    return time;
}

TEST(UtilityTest, EveryIdButZeroIsValid) {
    EXPECT_FALSE(IsValidID(0));
    EXPECT_TRUE(IsValidID(1));
    EXPECT_TRUE(IsValidID(0x100000000u));
    EXPECT_TRUE(IsValidID(UINT64_MAX));
}

TEST(UtilityTest, ToLowerChangesAsciiLettersAndKeepsOtherBytes) {
    EXPECT_EQ("abz09-_ \xc3\x84\xff", ToLower("ABz09-_ \xc3\x84\xff"));
    EXPECT_EQ(std::string("a\0b", 3), ToLower(std::string("A\0B", 3)));
    EXPECT_EQ("", ToLower(""));
}

TEST(UtilityTest, TimeStringsHaveTheFormsInUse) {
    const struct tm time = SomeTime();
    std::string text;
    EXPECT_EQ(0, GetTimeString(time, "Ferrix Copy_%F_%H%M%S", text));
    EXPECT_EQ("Ferrix Copy_2024-02-29_070509", text);
    EXPECT_EQ(0, GetTimeString(time, "%F", text));
    EXPECT_EQ("2024-02-29", text);
    EXPECT_EQ(0, GetTimeString(time, "%F_%H%M%S", text));
    EXPECT_EQ("2024-02-29_070509", text);
}

// The compiler would refuse these formats as literals.
TEST(UtilityTest, TimeStringThatIsEmptyOrTooLongFailsAndLeavesTheOutAlone) {
    const struct tm time = SomeTime();
    const std::string formats[] = {"", std::string(1024, 'x'),
                                   std::string(110, ' ') + "%F" + std::string(904, 'x')};
    for (const std::string& format : formats) {
        const LogCapture log;
        std::string text = "as it was";
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
        EXPECT_EQ(-1, GetTimeString(time, format.c_str(), text)) << format;
#pragma GCC diagnostic pop
        EXPECT_EQ("as it was", text);
        EXPECT_EQ(std::vector<std::string>{"[ERR] Failed to strftime"}, log.Lines());
    }
}

TEST(UtilityTest, TimeStringOf1023BytesFits) {
    const std::string format(1023, 'x');
    std::string text;
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    EXPECT_EQ(0, GetTimeString(SomeTime(), format.c_str(), text));
#pragma GCC diagnostic pop
    EXPECT_EQ(format, text);
}

TEST(UtilityTest, DeviceIsSupportedByEitherCapability) {
    FakeKeld& fake = FakeKeld::Reset();
    InitDeviceSupport();
    EXPECT_FALSE(IsDeviceSupported());
    EXPECT_EQ((std::vector<std::vector<std::string>>{{"sdferrix"}, {"ferrix"}}),
              fake.CallsOf("KLIBCSupportGet"));

    fake.SetCapability("ferrix");
    EXPECT_FALSE(IsDeviceSupported()) << "the answer is kept";
    InitDeviceSupport();
    EXPECT_TRUE(IsDeviceSupported());

    FakeKeld::Reset().SetCapability("sdferrix");
    InitDeviceSupport();
    EXPECT_TRUE(IsDeviceSupported());
    EXPECT_EQ(1, fake.CallCount("KLIBCSupportGet")) << "the second is asked only if it must be";

    FakeKeld::Reset();
    InitDeviceSupport();
    EXPECT_FALSE(IsDeviceSupported());
}

}  // namespace
