#include "client/timetable.h"

#include <array>
#include <cstdio>
#include <string_view>

#include "client/exit-status.h"
#include "client/json-output.h"
#include "client/text.h"

namespace {

constexpr int DAYS = 7;
constexpr int REPEAT_DAILY = 1001;
constexpr std::array<std::string_view, DAYS> DAY_NAMES = {"sun", "mon", "tue", "wed",
                                                          "thu", "fri", "sat"};
constexpr std::array<std::string_view, DAYS> SHOWN_DAYS = {"Sun", "Mon", "Tue", "Wed",
                                                           "Thu", "Fri", "Sat"};

int DayNumber(std::string_view name) {
    for (int day = 0; day < DAYS; ++day) {
        if (DAY_NAMES[static_cast<size_t>(day)] == name) return day;
    }
    throw CommandError(EXIT_USAGE, "\"" + Printable(name) +
                                       "\" is no day: write \"mon\", \"tue\" and so on, or a range "
                                       "such as \"mon-fri\"");
}

void AddDays(const std::string& text, std::array<bool, DAYS>& days) {
    const size_t dash = text.find('-');
    if (dash == std::string::npos) {
        days[static_cast<size_t>(DayNumber(text))] = true;
        return;
    }
    const int last = DayNumber(std::string_view(text).substr(dash + 1));
    for (int day = DayNumber(std::string_view(text).substr(0, dash));; day = (day + 1) % DAYS) {
        days[static_cast<size_t>(day)] = true;
        if (day == last) return;
    }
}

int Number(const Json::Value& schedule, const char* key) {
    return schedule[key].isInt() ? schedule[key].asInt() : 0;
}

std::string DaysText(const std::string& numbers) {
    std::string text;
    for (const char number : numbers) {
        if (number < '0' || number >= '0' + DAYS) continue;
        if (!text.empty()) text += ", ";
        text += SHOWN_DAYS[static_cast<size_t>(number - '0')];
    }
    return text;
}

}  // namespace

Timetable MakeTimetable(const std::string& time, const std::vector<std::string>& day_texts) {
    int hour = 0;
    int minute = 0;
    char rest = 0;
    if (sscanf(time.c_str(), "%2d:%2d%c", &hour, &minute, &rest) != 2 || hour < 0 || hour > 23 ||
        minute < 0 || minute > 59) {
        throw CommandError(EXIT_USAGE, "\"" + Printable(time) +
                                           "\" is no time of the day: write "
                                           "\"02:30\"");
    }
    std::array<bool, DAYS> days{};
    for (const std::string& text : day_texts) AddDays(text, days);
    std::string week_day;
    for (int day = 0; day < DAYS; ++day) {
        if (!day_texts.empty() && !days[static_cast<size_t>(day)]) continue;
        if (!week_day.empty()) week_day += ',';
        week_day += static_cast<char>('0' + day);
    }
    Timetable timetable;
    timetable.is_enabled = true;
    timetable.schedule["date_type"] = 0;
    timetable.schedule["hour"] = hour;
    timetable.schedule["minute"] = minute;
    timetable.schedule["week_day"] = week_day;
    timetable.schedule["repeat_date"] = REPEAT_DAILY;
    timetable.schedule["repeat_hour"] = 0;
    timetable.schedule["repeat_min"] = 0;
    timetable.schedule["last_work_hour"] = hour;
    return timetable;
}

std::string ScheduleText(const Timetable& timetable) { return JsonLine(timetable.schedule); }

std::string TimetableText(const Timetable& timetable) {
    const Json::Value& schedule = timetable.schedule;
    if (!timetable.is_enabled || schedule.empty()) return "";
    char time[32];
    snprintf(time, sizeof time, "%02d:%02d", Number(schedule, "hour"), Number(schedule, "minute"));
    std::string text = time;
    if (Number(schedule, "date_type") == 1) {
        text += " on " + Printable(schedule["date"].asString());
        if (Number(schedule, "repeat_date") != 0) text += " and again from then on";
    } else {
        const std::string days = DaysText(schedule["week_day"].asString());
        constexpr size_t ALL_DAYS = 7 * 3 + 6 * 2;  // names and the commas between
        text += days.empty() || days.size() == ALL_DAYS ? " every day" : " on " + days;
    }
    const int hours = Number(schedule, "repeat_hour");
    const int minutes = Number(schedule, "repeat_min");
    if (hours != 0 || minutes != 0) {
        text += ", again after " +
                DurationText(static_cast<uint64_t>(hours * 3600 + minutes * 60)) + " until " +
                std::to_string(Number(schedule, "last_work_hour")) + " o'clock";
    }
    return text;
}

Json::Value TimetableJson(const Timetable& timetable) {
    Json::Value json;
    json["enabled"] = timetable.is_enabled;
    json["schedule"] = timetable.schedule;
    return json;
}
