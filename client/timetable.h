// When a task runs by the clock: from the command line, for the daemon, and in words.
#pragma once

#include <json/value.h>

#include <string>
#include <vector>

struct Timetable {
    bool is_enabled = false;
    // The object that clients send, with "hour", "minute", "week_day" and the others.
    Json::Value schedule = Json::Value(Json::objectValue);
};

// A timetable from "02:30" and days: names such as "mon", and ranges such as "mon-fri"; none are
// all days. EXIT_USAGE (CommandError) for what is neither.
[[nodiscard]] Timetable MakeTimetable(const std::string& time,
                                      const std::vector<std::string>& days);

// The text of "schedule_json_str".
[[nodiscard]] std::string ScheduleText(const Timetable& timetable);
// "02:30 on Mon, Tue"; empty when it never runs.
[[nodiscard]] std::string TimetableText(const Timetable& timetable);
[[nodiscard]] Json::Value TimetableJson(const Timetable& timetable);
