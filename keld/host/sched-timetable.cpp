#include "host/sched-timetable.h"

#include <json/value.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <cstdio>
#include <ctime>
#include <iterator>
#include <string_view>

namespace keld_host {
namespace {

constexpr int DAYS_OF_WEEK = 7;
constexpr unsigned EVERY_DAY = 0x7F;
constexpr int LAST_HOUR = 23;
constexpr int LAST_MINUTE = 59;
constexpr int REPEATS[] = {REPEAT_DAILY_OLD, REPEAT_ONCE,  1, 2, 3, 4, 6, REPEAT_YEARLY,
                           REPEAT_DAILY,     REPEAT_WEEKLY};
constexpr const char* MEMBERS[] = {"hour",   "min",         "date_type",  "week_name",     "date",
                                   "repeat", "repeat_hour", "repeat_min", "last_work_hour"};

// A member that is missing or null keeps its default; false for another type or out of range.
bool ReadNumber(const Json::Value& object, const char* name, int low, int high, int* number) {
    const Json::Value& value = object[name];
    if (value.isNull()) return true;
    if (!value.isInt() || value.asInt() < low || value.asInt() > high) return false;
    *number = value.asInt();
    return true;
}

bool ReadText(const Json::Value& object, const char* name, std::string* text) {
    const Json::Value& value = object[name];
    if (value.isNull()) return true;
    if (!value.isString()) return false;
    *text = value.asString();
    return true;
}

bool ParseWeekDays(std::string_view text, unsigned* days) {
    if (text.empty()) {
        *days = EVERY_DAY;
        return true;
    }
    unsigned found = 0;
    for (size_t at = 0; at < text.size(); at += 2) {
        const unsigned day = static_cast<unsigned char>(text[at]) - unsigned{'0'};
        if (day >= DAYS_OF_WEEK) return false;
        if (at + 1 < text.size() && (text[at + 1] != ',' || at + 2 == text.size())) return false;
        found |= 1U << day;
    }
    *days = found;
    return true;
}

int DaysOfMonth(int year, int month) {
    constexpr int DAYS[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
    const bool is_leap = (year % 4 == 0 && year % 100 != 0) || year % 400 == 0;
    return month == 2 && is_leap ? 29 : DAYS[month - 1];
}

// Takes digits from the front, at most `max_digits`.
bool TakeNumber(std::string_view* text, size_t max_digits, int* number) {
    const size_t digits = std::min(text->find_first_not_of("0123456789"), text->size());
    if (digits == 0 || digits > max_digits) return false;
    std::from_chars(text->data(), text->data() + digits, *number);
    text->remove_prefix(digits);
    return true;
}

bool TakeSlash(std::string_view* text) {
    if (!text->starts_with('/')) return false;
    text->remove_prefix(1);
    return true;
}

bool ParseDate(std::string_view text, Timetable* table) {
    if (!TakeNumber(&text, 4, &table->year) || !TakeSlash(&text) ||
        !TakeNumber(&text, 2, &table->month) || !TakeSlash(&text) ||
        !TakeNumber(&text, 2, &table->day) || !text.empty()) {
        return false;
    }
    return table->year >= 1970 && table->month >= 1 && table->month <= 12 && table->day >= 1 &&
           table->day <= DaysOfMonth(table->year, table->month);
}

bool ParseDays(const Json::Value& schedule, Timetable* table) {
    std::string week_days;
    std::string date;
    if (!ReadNumber(schedule, "date_type", DATE_TYPE_WEEK_DAYS, DATE_TYPE_DATE, &table->dateType) ||
        !ReadNumber(schedule, "repeat", REPEAT_DAILY_OLD, REPEAT_WEEKLY, &table->repeat) ||
        !ReadText(schedule, "week_name", &week_days) || !ReadText(schedule, "date", &date)) {
        return false;
    }
    if (std::find(std::begin(REPEATS), std::end(REPEATS), table->repeat) == std::end(REPEATS) ||
        !ParseWeekDays(week_days, &table->weekDays)) {
        return false;
    }
    if (table->dateType == DATE_TYPE_WEEK_DAYS && date.empty()) return true;
    return ParseDate(date, table);
}

bool ParseTimes(const Json::Value& schedule, Timetable* table) {
    int step_hours = 0;
    int step_minutes = 0;
    if (!ReadNumber(schedule, "hour", 0, LAST_HOUR, &table->hour) ||
        !ReadNumber(schedule, "min", 0, LAST_MINUTE, &table->minute) ||
        !ReadNumber(schedule, "repeat_hour", 0, LAST_HOUR, &step_hours) ||
        !ReadNumber(schedule, "repeat_min", 0, LAST_MINUTE, &step_minutes) ||
        !ReadNumber(schedule, "last_work_hour", 0, LAST_HOUR, &table->lastWorkHour)) {
        return false;
    }
    table->stepMinutes = step_hours * (LAST_MINUTE + 1) + step_minutes;
    return table->stepMinutes == 0 || table->lastWorkHour >= table->hour;
}

std::string JoinNumbers(const std::vector<int>& numbers) {
    std::string text;
    for (const int number : numbers) {
        if (!text.empty()) text += ',';
        text += std::to_string(number);
    }
    return text;
}

std::string WeekDayList(unsigned days) {
    std::vector<int> numbers;
    for (int day = 0; day < DAYS_OF_WEEK; ++day) {
        if ((days >> day & 1U) != 0) numbers.push_back(day);
    }
    return JoinNumbers(numbers);
}

int WeekDayOf(const Timetable& table) {
    std::tm date{};
    date.tm_year = table.year - 1900;
    date.tm_mon = table.month - 1;
    date.tm_mday = table.day;
    timegm(&date);  // fills in the day of the week
    return date.tm_wday;
}

std::string MonthList(int first, int step) {
    std::vector<int> months;
    for (int month = 1; month <= 12; ++month) {
        if ((month - first) % step == 0) months.push_back(month);
    }
    return months.size() == 12 ? "*" : JoinNumbers(months);
}

// "day month weekday"
std::string DayFields(const Timetable& table) {
    if (table.dateType == DATE_TYPE_WEEK_DAYS) {
        return "* * " + (table.weekDays == EVERY_DAY ? "*" : WeekDayList(table.weekDays));
    }
    switch (table.repeat) {
        case REPEAT_DAILY_OLD:
        case REPEAT_DAILY:
            return "* * *";
        case REPEAT_WEEKLY:
            return "* * " + std::to_string(WeekDayOf(table));
        default:
            break;
    }
    const int step = table.repeat == REPEAT_ONCE ? REPEAT_YEARLY : table.repeat;
    return std::to_string(table.day) + " " + MonthList(table.month, step) + " *";
}

struct HourGroup {
    std::vector<int> minutes;
    std::vector<int> hours;
};

// The times of one day, hours with the same minutes together.
std::vector<HourGroup> HourGroups(const Timetable& table) {
    std::vector<HourGroup> groups;
    const int start = table.hour * 60 + table.minute;
    std::array<std::vector<int>, LAST_HOUR + 1> minutes_of;
    const int step = table.stepMinutes == 0 ? 24 * 60 : table.stepMinutes;
    for (int time = start; time < 24 * 60; time += step) {
        if (time != start && time / 60 > table.lastWorkHour) break;
        minutes_of[static_cast<size_t>(time / 60)].push_back(time % 60);
    }
    for (size_t hour = 0; hour < minutes_of.size(); ++hour) {
        if (minutes_of[hour].empty()) continue;
        auto group = std::find_if(groups.begin(), groups.end(), [&](const HourGroup& other) {
            return other.minutes == minutes_of[hour];
        });
        if (group == groups.end()) group = groups.insert(group, {minutes_of[hour], {}});
        group->hours.push_back(static_cast<int>(hour));
    }
    return groups;
}

void SetDateTest(const Timetable& table, CronTime* time) {
    if (table.dateType != DATE_TYPE_DATE) return;
    if (table.repeat == REPEAT_ONCE) {
        time->dateFormat = "%Y";
        time->dateOperator = "-eq";
        time->dateValue = std::to_string(table.year);
        return;
    }
    time->dateFormat = "%Y%m%d";
    time->dateOperator = "-ge";
    time->dateValue = std::to_string(table.year * 10000 + table.month * 100 + table.day);
}

std::string DateText(const Timetable& table) {
    return std::to_string(table.year) + "/" + std::to_string(table.month) + "/" +
           std::to_string(table.day);
}

}  // namespace

std::vector<CronTime> Timetable::CronTimes() const {
    std::vector<CronTime> times;
    for (const HourGroup& group : HourGroups(*this)) {
        CronTime time;
        time.fields =
            JoinNumbers(group.minutes) + " " + JoinNumbers(group.hours) + " " + DayFields(*this);
        SetDateTest(*this, &time);
        times.push_back(std::move(time));
    }
    return times;
}

Json::Value Timetable::ToJson() const {
    Json::Value json(Json::objectValue);
    json["hour"] = hour;
    json["min"] = minute;
    json["date_type"] = dateType;
    json["week_name"] = WeekDayList(weekDays);
    if (dateType == DATE_TYPE_DATE) json["date"] = DateText(*this);
    json["repeat"] = repeat;
    json["repeat_hour"] = stepMinutes / 60;
    json["repeat_min"] = stepMinutes % 60;
    json["last_work_hour"] = lastWorkHour;
    return json;
}

bool ParseTimetable(const Json::Value& schedule, std::optional<Timetable>* timetable) {
    if (!schedule.isObject()) return false;
    const bool is_empty = std::none_of(std::begin(MEMBERS), std::end(MEMBERS),
                                       [&](const char* name) { return !schedule[name].isNull(); });
    if (is_empty) {
        timetable->reset();
        return true;
    }
    Timetable table;
    if (!ParseTimes(schedule, &table) || !ParseDays(schedule, &table)) return false;
    *timetable = table;
    return true;
}

}  // namespace keld_host
