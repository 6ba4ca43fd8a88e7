// When an entry of the scheduler runs: the accepted JSON form (see <keld/sched.h>) and the times
// that cron is told.
#pragma once

#include <json/forwards.h>

#include <optional>
#include <string>
#include <vector>

namespace keld_host {

enum TimetableDateType : int { DATE_TYPE_WEEK_DAYS = 0, DATE_TYPE_DATE = 1 };

enum TimetableRepeat : int {
    REPEAT_DAILY_OLD = -1,
    REPEAT_ONCE = 0,
    // 1 to 12: after so many months
    REPEAT_YEARLY = 12,
    REPEAT_DAILY = 1001,
    REPEAT_WEEKLY = 1002,
};

// One set of times in cron's form.
struct CronTime {
    std::string fields;  // "min hour day month weekday"
    // Shell test that has to hold besides, as "DATE_FORMAT OPERATOR VALUE" for date(1) and test(1);
    // cron knows no years. Empty when there is none.
    std::string dateFormat;
    std::string dateOperator;
    std::string dateValue;
};

struct Timetable {
    int hour = 0;
    int minute = 0;
    int dateType = DATE_TYPE_WEEK_DAYS;
    unsigned weekDays = 0x7F;  // bit 0 is Sunday; at least one is set
    int year = 1970;           // the date, when dateType says so
    int month = 1;
    int day = 1;
    int repeat = REPEAT_ONCE;
    int stepMinutes = 0;  // between repeats on one day; 0 for none
    int lastWorkHour = 23;

    // The times, one element for each set of hours that share their minutes.
    [[nodiscard]] std::vector<CronTime> CronTimes() const;
    [[nodiscard]] Json::Value ToJson() const;
};

// Reads the object `schedule`. True and an empty optional for one without a timetable; false, with
// `timetable` unchanged, for anything that is refused.
[[nodiscard]] bool ParseTimetable(const Json::Value& schedule, std::optional<Timetable>* timetable);

}  // namespace keld_host
