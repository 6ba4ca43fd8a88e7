#include "client/text.h"

#include <gtest/gtest.h>

#include <cstdlib>

TEST(PrintableTest, PlainNamesStayAsTheyAre) {
    EXPECT_EQ("IMG 0001.JPG", Printable("IMG 0001.JPG"));
    EXPECT_EQ("Bücher und 写真 📷", Printable("Bücher und 写真 📷"));
    EXPECT_EQ("", Printable(""));
}

TEST(PrintableTest, WhatATerminalWouldObeyIsShownAsBytes) {
    EXPECT_EQ("\\x1b[2Jgone", Printable("\033[2Jgone"));
    EXPECT_EQ("a\\x0ab\\x09c\\x00d\\x7f", Printable(std::string_view("a\nb\tc\0d\x7f", 8)));
    EXPECT_EQ("\\xe2\\x80\\xaegpj.exe", Printable("\u202Egpj.exe"))
        << "turns the reading direction";
    EXPECT_EQ("\\xc2\\x9b31m", Printable("\u009B31m")) << "an escape in one character";
}

TEST(PrintableTest, BytesThatAreNoUtf8AreShownAsBytes) {
    EXPECT_EQ("\\xff\\xfe", Printable("\xFF\xFE"));
    EXPECT_EQ("caf\\xe9", Printable("caf\xE9"));
    EXPECT_EQ("\\xc3", Printable("\xC3"));
    EXPECT_EQ("\\xed\\xa0\\x80", Printable("\xED\xA0\x80")) << "half of a pair";
}

TEST(DisplayWidthTest, CountsColumns) {
    EXPECT_EQ(5U, DisplayWidth("plain"));
    EXPECT_EQ(6U, DisplayWidth("Bücher"));
    EXPECT_EQ(4U, DisplayWidth("写真"));
    EXPECT_EQ(1U, DisplayWidth("e\u0301")) << "an accent of its own takes no column";
}

TEST(ShortenedTest, TheMiddleGoes) {
    EXPECT_EQ("short", Shortened("short", 5));
    EXPECT_EQ("/a...jpg", Shortened("/a/long/path/to/x.jpg", 8));
    EXPECT_EQ("写...写", Shortened("写写写写写写写写", 7));
    EXPECT_EQ("ab", Shortened("abcdef", 2));
    EXPECT_EQ("", Shortened("abcdef", 0));
}

TEST(PaddedTest, FillsUpToTheWidth) {
    EXPECT_EQ("ü   ", Padded("ü", 4));
    EXPECT_EQ("long", Padded("long", 2));
}

TEST(SizeTextTest, PowersOfAThousand) {
    EXPECT_EQ("0 B", SizeText(0));
    EXPECT_EQ("999 B", SizeText(999));
    EXPECT_EQ("1.0 kB", SizeText(1000));
    EXPECT_EQ("999.9 kB", SizeText(999949));
    EXPECT_EQ("1.0 MB", SizeText(999950));
    EXPECT_EQ("2.1 GB", SizeText(2100000000));
    EXPECT_EQ("18.4 EB", SizeText(UINT64_MAX));
}

TEST(DurationTextTest, TwoUnitsAtMost) {
    EXPECT_EQ("0 s", DurationText(0));
    EXPECT_EQ("59 s", DurationText(59));
    EXPECT_EQ("1 min 00 s", DurationText(60));
    EXPECT_EQ("59 min 59 s", DurationText(3599));
    EXPECT_EQ("1 h 00 min", DurationText(3600));
    EXPECT_EQ("27 h 46 min", DurationText(100000));
}

TEST(TimeTextTest, LocalTime) {
    setenv("TZ", "Europe/Berlin", 1);
    tzset();
    EXPECT_EQ("never", TimeText(0));
    EXPECT_EQ("2026-07-01 14:00:00", TimeText(1782907200));
    EXPECT_EQ("2026-12-01 13:00:00", TimeText(1796126400));
    unsetenv("TZ");
    tzset();
}
