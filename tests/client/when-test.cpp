#include "client/when.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <limits>

#include "client/exit-status.h"

namespace {

constexpr char BERLIN[] = "CET-1CEST,M3.5.0,M10.5.0/3";
// The clocks change at midnight: the day of the change begins at one.
constexpr char MIDNIGHT[] = "<-03>3<-02>,M11.1.0/0,M2.3.0/0";
constexpr char SYDNEY[] = "AEST-10AEDT,M10.1.0,M4.1.0/3";

class WhenTest : public testing::Test {
protected:
    WhenTest() {
        const char* zone = getenv("TZ");
        m_had_zone = zone != nullptr;
        if (m_had_zone) m_zone = zone;
        SetZone(BERLIN);
    }
    ~WhenTest() override {
        m_had_zone ? setenv("TZ", m_zone.c_str(), 1) : unsetenv("TZ");
        tzset();
    }

    static void SetZone(const char* zone) {
        setenv("TZ", zone, 1);
        tzset();
    }
    static time_t Utc(int year, int month, int day, int hour = 0, int minute = 0, int second = 0) {
        tm fields{};
        fields.tm_year = year - 1900;
        fields.tm_mon = month - 1;
        fields.tm_mday = day;
        fields.tm_hour = hour;
        fields.tm_min = minute;
        fields.tm_sec = second;
        return timegm(&fields);
    }
    static time_t Since(const std::string& text, time_t now) {
        return ParseWhen(text, WhenEdge::BEGIN, now);
    }
    static time_t Until(const std::string& text, time_t now) {
        return ParseWhen(text, WhenEdge::END, now);
    }

    // Saturday, 21 November 2026, 19:04:33 in Berlin.
    const time_t m_now = Utc(2026, 11, 21, 18, 4, 33);

private:
    bool m_had_zone = false;
    std::string m_zone;
};

TEST_F(WhenTest, DateIsItsFirstOrItsLastSecond) {
    EXPECT_EQ(Utc(2026, 11, 20, 23), Since("2026-11-21", m_now));
    EXPECT_EQ(Utc(2026, 11, 21, 22, 59, 59), Until("2026-11-21", m_now));
    EXPECT_EQ(Utc(2026, 7, 31, 22), Since("2026-08-01", m_now)) << "summer time";
    EXPECT_EQ(Utc(2028, 2, 28, 23), Since("2028-02-29", m_now));
}

TEST_F(WhenTest, TimeOfADay) {
    EXPECT_EQ(Utc(2026, 11, 21, 11, 30), Since("2026-11-21 12:30", m_now));
    EXPECT_EQ(Utc(2026, 11, 21, 11, 30, 59), Until("2026-11-21 12:30", m_now));
    EXPECT_EQ(Utc(2026, 11, 21, 11, 30, 5), Since("2026-11-21T12:30:05", m_now));
    EXPECT_EQ(Utc(2026, 11, 21, 11, 30, 5), Until("2026-11-21T12:30:05", m_now));
    EXPECT_EQ(Utc(2026, 11, 21, 11, 30, 5), Until("2026-11-21 12:30:05", m_now));
    EXPECT_EQ(Utc(2026, 11, 21, 11, 30), Since("12:30", m_now));
    EXPECT_EQ(Utc(2026, 11, 21, 11, 30, 59), Until("12:30", m_now));
    EXPECT_EQ(Utc(2026, 11, 21, 8, 5, 7), Since("9:05:07", m_now));
    EXPECT_EQ(Utc(2026, 11, 20, 23), Since("00:00", m_now));
}

TEST_F(WhenTest, TodayAndYesterday) {
    EXPECT_EQ(Utc(2026, 11, 20, 23), Since("today", m_now));
    EXPECT_EQ(Utc(2026, 11, 21, 22, 59, 59), Until("today", m_now));
    EXPECT_EQ(Utc(2026, 11, 19, 23), Since("yesterday", m_now));
    EXPECT_EQ(Utc(2026, 11, 20, 22, 59, 59), Until("yesterday", m_now));
    const time_t past_midnight = Utc(2026, 11, 20, 23, 0, 1);
    EXPECT_EQ(past_midnight - 1, Since("today", past_midnight));
    EXPECT_EQ(Utc(2026, 11, 19, 23), Since("today", past_midnight - 2));
}

TEST_F(WhenTest, Ago) {
    for (const WhenEdge edge : {WhenEdge::BEGIN, WhenEdge::END}) {
        EXPECT_EQ(m_now - 30 * 60, ParseWhen("30min", edge, m_now));
        EXPECT_EQ(m_now - 2 * 3600, ParseWhen("2h", edge, m_now));
        EXPECT_EQ(m_now - 3 * 86400, ParseWhen("3d", edge, m_now));
        EXPECT_EQ(m_now - 14 * 86400, ParseWhen("2w", edge, m_now));
        EXPECT_EQ(m_now, ParseWhen("0h", edge, m_now));
    }
}

// --- The clocks go forward: 29 March 2026, 2:00 becomes 3:00.

TEST_F(WhenTest, DayOf23Hours) {
    const time_t now = Utc(2026, 3, 29, 10);  // 12:00
    EXPECT_EQ(Utc(2026, 3, 28, 23), Since("today", now));
    EXPECT_EQ(Utc(2026, 3, 29, 21, 59, 59), Until("today", now));
    EXPECT_EQ(23 * 3600 - 1, Until("2026-03-29", now) - Since("2026-03-29", now));
    EXPECT_EQ(Utc(2026, 3, 29, 0, 59, 59), Since("2026-03-29 01:59:59", now));
    EXPECT_EQ(Utc(2026, 3, 29, 1), Since("2026-03-29 03:00", now));
}

TEST_F(WhenTest, HourThatIsLeftOutIsTheMomentOfTheChange) {
    const time_t change = Utc(2026, 3, 29, 1);
    for (const char* text : {"2026-03-29 02:00", "2026-03-29 02:30", "2026-03-29 02:59:59"}) {
        EXPECT_EQ(change, Since(text, m_now)) << text;
        EXPECT_EQ(change - 1, Until(text, m_now)) << text;
    }
}

TEST_F(WhenTest, DaysAgoKeepTheTimeOfDayAcrossTheSpring) {
    const time_t now = Utc(2026, 3, 30, 10);  // 12:00 in summer time
    EXPECT_EQ(Utc(2026, 3, 28, 11), Since("2d", now)) << "12:00 in winter time";
    EXPECT_EQ(Utc(2026, 3, 23, 11), Since("1w", now));
    EXPECT_EQ(now - 48 * 3600, Since("48h", now)) << "hours are hours";
    const time_t half_past_two = Utc(2026, 3, 30, 0, 30);
    EXPECT_EQ(Utc(2026, 3, 29, 1), Since("1d", half_past_two)) << "there was no such time";
}

// --- The clocks go back: 25 October 2026, 3:00 becomes 2:00.

TEST_F(WhenTest, DayOf25Hours) {
    const time_t now = Utc(2026, 10, 25, 11);  // 12:00
    EXPECT_EQ(Utc(2026, 10, 24, 22), Since("today", now));
    EXPECT_EQ(Utc(2026, 10, 25, 22, 59, 59), Until("today", now));
    EXPECT_EQ(25 * 3600 - 1, Until("2026-10-25", now) - Since("2026-10-25", now));
}

TEST_F(WhenTest, HourThatComesTwiceIsTakenWhole) {
    EXPECT_EQ(Utc(2026, 10, 25, 0, 30), Since("2026-10-25 02:30", m_now));
    EXPECT_EQ(Utc(2026, 10, 25, 1, 30, 59), Until("2026-10-25 02:30", m_now));
    EXPECT_EQ(Utc(2026, 10, 25, 0), Since("2026-10-25 02:00", m_now));
    EXPECT_EQ(Utc(2026, 10, 25, 1, 59, 59), Until("2026-10-25 02:59", m_now));
    EXPECT_EQ(Utc(2026, 10, 24, 23, 59, 59), Until("2026-10-25 01:59", m_now));
    EXPECT_EQ(Utc(2026, 10, 25, 2), Since("2026-10-25 03:00", m_now));
}

TEST_F(WhenTest, DaysAgoKeepTheTimeOfDayAcrossTheAutumn) {
    const time_t now = Utc(2026, 10, 26, 11);  // 12:00 in winter time
    EXPECT_EQ(Utc(2026, 10, 24, 10), Since("2d", now)) << "12:00 in summer time";
    EXPECT_EQ(now - 48 * 3600, Since("48h", now));
}

// --- Other zones

TEST_F(WhenTest, DayThatBeginsAtOne) {
    SetZone(MIDNIGHT);
    const time_t now = Utc(2026, 11, 1, 15);
    EXPECT_EQ(Utc(2026, 11, 1, 3), Since("2026-11-01", now)) << "1:00, two hours behind";
    EXPECT_EQ(Utc(2026, 11, 1, 2, 59, 59), Until("2026-10-31", now));
    EXPECT_EQ(Utc(2026, 11, 2, 1, 59, 59), Until("today", now));
    EXPECT_EQ(Utc(2026, 11, 1, 3), Since("00:30", now));
}

TEST_F(WhenTest, DayWhoseLastHourComesTwice) {
    SetZone(MIDNIGHT);
    const time_t now = Utc(2026, 2, 15, 15);
    EXPECT_EQ(Utc(2026, 2, 14, 2), Since("yesterday", now));
    EXPECT_EQ(Utc(2026, 2, 15, 2, 59, 59), Until("yesterday", now));
    EXPECT_EQ(Utc(2026, 2, 15, 3), Since("today", now));
}

TEST_F(WhenTest, SouthernSummerAndUtc) {
    SetZone(SYDNEY);
    EXPECT_EQ(Utc(2026, 10, 3, 14), Since("2026-10-04", m_now));
    EXPECT_EQ(23 * 3600 - 1, Until("2026-10-04", m_now) - Since("2026-10-04", m_now));
    EXPECT_EQ(25 * 3600 - 1, Until("2026-04-05", m_now) - Since("2026-04-05", m_now));
    SetZone("UTC0");
    EXPECT_EQ(Utc(2026, 11, 21), Since("today", m_now));
    EXPECT_EQ(Utc(2026, 11, 21, 23, 59, 59), Until("2026-11-21", m_now));
}

// Every second of a year lies in the day that it is shown with.
TEST_F(WhenTest, DaysFollowEachOtherWithoutGap) {
    for (const char* zone : {BERLIN, MIDNIGHT, SYDNEY, "UTC0"}) {
        SetZone(zone);
        for (int day = 0; day < 366; ++day) {
            const time_t noon = Utc(2026, 1, 1, 12) + day * 86400;
            EXPECT_EQ(Since("today", noon), Until("yesterday", noon) + 1) << zone << " " << day;
            tm local{};
            const time_t begin = Since("today", noon);
            ASSERT_NE(nullptr, localtime_r(&begin, &local));
            char text[16];
            ASSERT_EQ(10U, strftime(text, sizeof text, "%Y-%m-%d", &local));
            EXPECT_EQ(begin, Since(text, m_now)) << zone << " " << text;
        }
    }
}

// --- Edges and refusals

TEST_F(WhenTest, TimesThatNoRowCanHaveAreTheNearestOnes) {
    constexpr time_t LAST = std::numeric_limits<uint32_t>::max();
    EXPECT_EQ(1, Since("1970-01-01", m_now)) << "0 would mean any time";
    EXPECT_EQ(1, Until("1969-12-31", m_now));
    EXPECT_EQ(1, Since("999999w", m_now));
    EXPECT_EQ(LAST, Since("9999-12-31", m_now));
    EXPECT_EQ(LAST, Until("2106-02-08", m_now));
}

TEST_F(WhenTest, OtherTextsAreRefusedWithExamples) {
    for (const char* text : {"",
                             " ",
                             "tomorrow",
                             "TODAY",
                             "now",
                             "2026",
                             "2026-11",
                             "2026-13-01",
                             "2026-00-10",
                             "2026-02-29",
                             "2026-11-31",
                             "26-11-21",
                             "21.11.2026",
                             "2026-11-21 ",
                             "2026-11-21T",
                             "2026-11-21  12:30",
                             "2026-11-21 12",
                             "2026-11-21 24:00",
                             "2026-11-21 12:60",
                             "2026-11-21 12:30:60",
                             "2026-11-21 12:30:5",
                             "2026-11-21 12:30:05Z",
                             "2026-11-21x",
                             "12:3",
                             "12:30pm",
                             "123:30",
                             "-1:30",
                             "2",
                             "h",
                             "2 h",
                             "-2h",
                             "+2h",
                             "2m",
                             "2s",
                             "2hours",
                             "1.5h",
                             "1234567h",
                             "99999999999999999999d",
                             "2h ago",
                             "0x2h",
                             "\n",
                             "2h\n",
                             "\xD9\xA2h"}) {
        try {
            (void)Since(text, m_now);
            ADD_FAILURE() << "taken: " << text;
        } catch (const CommandError& error) {
            EXPECT_EQ(EXIT_USAGE, error.Status()) << text;
            EXPECT_NE(nullptr, strstr(error.what(), "2026-11-21T12:30:05")) << error.what();
            EXPECT_EQ(nullptr, strchr(error.what(), '\n')) << "made safe";
        }
    }
}

}  // namespace
