#include "client/when.h"

#include <algorithm>
#include <limits>
#include <optional>
#include <string_view>

#include "client/exit-status.h"
#include "client/text.h"

namespace {

constexpr int64_t MINUTE = 60;
constexpr int64_t HOUR = 60 * MINUTE;
constexpr int64_t DAY = 24 * HOUR;

// Local times are counted in seconds as if they were UTC.
struct LocalSpan {
    int64_t begin = 0;
    int64_t length = 1;
};

int64_t OffsetAt(int64_t time) {
    const auto value = static_cast<time_t>(time);
    tm local{};
    return localtime_r(&value, &local) == nullptr ? 0 : local.tm_gmtoff;
}

int64_t LocalTimeAt(int64_t time) { return time + OffsetAt(time); }

// The first moment after `early` with another offset than there; at the latest `late`, which has
// one.
int64_t ChangeBetween(int64_t early, int64_t late) {
    const int64_t offset = OffsetAt(early);
    while (late - early > 1) {
        const int64_t middle = early + (late - early) / 2;
        (OffsetAt(middle) == offset ? early : late) = middle;
    }
    return late;
}

int64_t TimeOfLocal(int64_t local, WhenEdge edge) {
    const bool is_begin = edge == WhenEdge::BEGIN;
    const int64_t before = OffsetAt(local - DAY);
    const int64_t after = OffsetAt(local + DAY);
    const int64_t early = local - std::max(before, after);
    const int64_t late = local - std::min(before, after);
    const bool is_early = LocalTimeAt(early) == local;
    const bool is_late = LocalTimeAt(late) == local;
    if (is_early && (is_begin || !is_late)) return early;
    if (is_late) return late;
    const int64_t change = ChangeBetween(early, late);
    return is_begin ? change : change - 1;
}

// Exactly so many digits.
bool Take(std::string_view& text, size_t digits, int& number) {
    if (text.size() < digits) return false;
    number = 0;
    for (const char c : text.substr(0, digits)) {
        if (c < '0' || c > '9') return false;
        number = number * 10 + (c - '0');
    }
    text.remove_prefix(digits);
    return true;
}

bool Take(std::string_view& text, char c) {
    if (!text.starts_with(c)) return false;
    text.remove_prefix(1);
    return true;
}

// "2026-11-21"
bool TakeDate(std::string_view& text, LocalSpan& span) {
    int year = 0;
    int month = 0;
    int day = 0;
    if (!Take(text, 4, year) || !Take(text, '-') || !Take(text, 2, month) || !Take(text, '-') ||
        !Take(text, 2, day)) {
        return false;
    }
    tm date{};
    date.tm_year = year - 1900;
    date.tm_mon = month - 1;
    date.tm_mday = day;
    span = {timegm(&date), DAY};
    // A day that there is not has become another one.
    return date.tm_mon == month - 1 && date.tm_mday == day;
}

// "12:30" or "12:30:05" on the day of the span.
bool TakeClock(std::string_view& text, LocalSpan& span) {
    int hour = 0;
    int minute = 0;
    int second = 0;
    if (!Take(text, 2, hour) && !Take(text, 1, hour)) return false;
    if (!Take(text, ':') || !Take(text, 2, minute)) return false;
    const bool has_seconds = Take(text, ':');
    if (has_seconds && !Take(text, 2, second)) return false;
    if (hour > 23 || minute > 59 || second > 59) return false;
    span.begin += hour * HOUR + minute * MINUTE + second;
    span.length = has_seconds ? 1 : MINUTE;
    return true;
}

LocalSpan Today(time_t now) {
    const int64_t local = LocalTimeAt(now);
    return {local - ((local % DAY) + DAY) % DAY, DAY};
}

std::optional<LocalSpan> ParseDay(std::string_view text, time_t now) {
    LocalSpan span = Today(now);
    if (text == "today") return span;
    if (text == "yesterday") return LocalSpan{span.begin - DAY, DAY};
    std::string_view clock = text;
    if (TakeClock(clock, span)) return clock.empty() ? std::optional(span) : std::nullopt;
    if (!TakeDate(text, span)) return std::nullopt;
    if (text.empty()) return span;
    if (!Take(text, 'T') && !Take(text, ' ')) return std::nullopt;
    return TakeClock(text, span) && text.empty() ? std::optional(span) : std::nullopt;
}

// "30min", "2h", "3d", "2w" ago.
std::optional<int64_t> ParseAgo(std::string_view text, WhenEdge edge, time_t now) {
    constexpr size_t MAX_DIGITS = 6;
    const size_t digits = std::min(text.find_first_not_of("0123456789"), text.size());
    int number = 0;
    if (digits == 0 || digits > MAX_DIGITS || !Take(text, digits, number)) return std::nullopt;
    if (text == "min") return now - number * MINUTE;
    if (text == "h") return now - number * HOUR;
    if (text != "d" && text != "w") return std::nullopt;
    return TimeOfLocal(LocalTimeAt(now) - number * (text == "d" ? DAY : 7 * DAY), edge);
}

std::optional<int64_t> Parse(const std::string& text, WhenEdge edge, time_t now) {
    const auto span = ParseDay(text, now);
    if (!span) return ParseAgo(text, edge, now);
    const bool is_begin = edge == WhenEdge::BEGIN;
    return TimeOfLocal(is_begin ? span->begin : span->begin + span->length - 1, edge);
}

}  // namespace

uint32_t ParseWhen(const std::string& text, WhenEdge edge, time_t now) {
    const auto time = Parse(text, edge, now);
    if (!time) {
        throw CommandError(EXIT_USAGE, "\"" + Printable(text) +
                                           "\" is no time; times are written as 2026-11-21, "
                                           "\"2026-11-21 12:30\", 2026-11-21T12:30:05, today, "
                                           "yesterday, 12:30, and 30min, 2h, 3d or 2w (ago)");
    }
    return static_cast<uint32_t>(
        std::clamp<int64_t>(*time, 1, std::numeric_limits<uint32_t>::max()));
}
