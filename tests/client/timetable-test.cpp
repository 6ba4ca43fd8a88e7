#include "client/timetable.h"

#include <gtest/gtest.h>

#include "client/exit-status.h"

TEST(TimetableTest, EveryDay) {
    const Timetable timetable = MakeTimetable("2:05", {});
    EXPECT_TRUE(timetable.is_enabled);
    EXPECT_EQ(2, timetable.schedule["hour"].asInt());
    EXPECT_EQ(5, timetable.schedule["minute"].asInt());
    EXPECT_EQ("0,1,2,3,4,5,6", timetable.schedule["week_day"].asString());
    EXPECT_EQ("02:05 every day", TimetableText(timetable));
}

TEST(TimetableTest, DaysAndRanges) {
    EXPECT_EQ("1,2,3,4,5", MakeTimetable("02:30", {"mon-fri"}).schedule["week_day"].asString());
    EXPECT_EQ("0,3,6", MakeTimetable("02:30", {"wed", "sat-sun"}).schedule["week_day"].asString())
        << "a range goes on over the end of the week";
    EXPECT_EQ("23:59 on Mon, Wed", TimetableText(MakeTimetable("23:59", {"wed", "mon"})));
}

TEST(TimetableTest, WhatIsNoTimeOrDayIsRefused) {
    for (const char* time : {"", "2", "24:00", "12:60", "12:30pm", "-1:00", "12-30", "noon"}) {
        EXPECT_THROW((void)MakeTimetable(time, {}), CommandError) << time;
    }
    for (const char* day : {"", "monday", "mon-", "-fri", "mon-xyz", "1"}) {
        EXPECT_THROW((void)MakeTimetable("02:30", {day}), CommandError) << day;
    }
}

TEST(TimetableTest, NoneRunsNever) {
    EXPECT_EQ("{}", ScheduleText(Timetable()));
    EXPECT_EQ("", TimetableText(Timetable()));
}

TEST(TimetableTest, OthersMadeThemWithDatesAndRepeats) {
    Timetable timetable;
    timetable.is_enabled = true;
    timetable.schedule["date_type"] = 1;
    timetable.schedule["date"] = "2026/11/21";
    timetable.schedule["hour"] = 8;
    timetable.schedule["repeat_date"] = 1002;
    timetable.schedule["repeat_min"] = 30;
    timetable.schedule["last_work_hour"] = 18;
    EXPECT_EQ(
        "08:00 on 2026/11/21 and again from then on, again after 30 min 00 s until 18 o'clock",
        TimetableText(timetable));
}
