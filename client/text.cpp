#include "client/text.h"

#include <unicode/uchar.h>
#include <unicode/utf8.h>

#include <cstdarg>
#include <cstdio>

namespace {

constexpr char HEX[] = "0123456789abcdef";

// Shown as it stands: a character with a form of its own, or a blank.
bool IsShown(UChar32 c) {
    if (c < 0) return false;
    const int8_t type = u_charType(c);
    return type != U_CONTROL_CHAR && type != U_FORMAT_CHAR && type != U_LINE_SEPARATOR &&
           type != U_PARAGRAPH_SEPARATOR && type != U_SURROGATE && type != U_UNASSIGNED;
}

size_t CharacterWidth(UChar32 c) {
    const int8_t type = u_charType(c);
    if (type == U_NON_SPACING_MARK || type == U_ENCLOSING_MARK) return 0;
    const int width = u_getIntPropertyValue(c, UCHAR_EAST_ASIAN_WIDTH);
    return width == U_EA_FULLWIDTH || width == U_EA_WIDE ? 2 : 1;
}

__attribute__((format(printf, 1, 2))) std::string Format(const char* format, ...) {
    char text[64];
    va_list arguments;
    va_start(arguments, format);
    vsnprintf(text, sizeof text, format, arguments);
    va_end(arguments);
    return text;
}

// The first `width` columns.
std::string Head(const std::string& text, size_t width) {
    const int32_t length = static_cast<int32_t>(text.size());
    int32_t end = 0;
    for (size_t used = 0; end < length;) {
        int32_t next = end;
        UChar32 c = 0;
        U8_NEXT(text.data(), next, length, c);
        used += c < 0 ? 1 : CharacterWidth(c);
        if (used > width) break;
        end = next;
    }
    return text.substr(0, static_cast<size_t>(end));
}

// The last `width` columns.
std::string Tail(const std::string& text, size_t width) {
    int32_t begin = static_cast<int32_t>(text.size());
    for (size_t used = 0; begin > 0;) {
        int32_t next = begin;
        UChar32 c = 0;
        U8_PREV(text.data(), 0, next, c);
        used += c < 0 ? 1 : CharacterWidth(c);
        if (used > width) break;
        begin = next;
    }
    return text.substr(static_cast<size_t>(begin));
}

}  // namespace

std::string Printable(std::string_view bytes) {
    std::string shown;
    const int32_t length = static_cast<int32_t>(bytes.size());
    for (int32_t at = 0; at < length;) {
        const int32_t begin = at;
        UChar32 c = 0;
        U8_NEXT(bytes.data(), at, length, c);
        if (IsShown(c)) {
            shown.append(bytes, static_cast<size_t>(begin), static_cast<size_t>(at - begin));
            continue;
        }
        for (int32_t i = begin; i < at; ++i) {
            const auto byte = static_cast<unsigned char>(bytes[static_cast<size_t>(i)]);
            shown += {'\\', 'x', HEX[byte >> 4], HEX[byte & 15]};
        }
    }
    return shown;
}

size_t DisplayWidth(std::string_view text) {
    size_t width = 0;
    const int32_t length = static_cast<int32_t>(text.size());
    for (int32_t at = 0; at < length;) {
        UChar32 c = 0;
        U8_NEXT(text.data(), at, length, c);
        width += c < 0 ? 1 : CharacterWidth(c);
    }
    return width;
}

std::string Shortened(const std::string& text, size_t width) {
    constexpr size_t DOTS = 3;
    if (DisplayWidth(text) <= width) return text;
    if (width <= DOTS) return Head(text, width);
    const size_t head = (width - DOTS) / 2;
    return Head(text, head) + "..." + Tail(text, width - DOTS - head);
}

std::string Padded(const std::string& text, size_t width) {
    const size_t used = DisplayWidth(text);
    return used < width ? text + std::string(width - used, ' ') : text;
}

std::string SizeText(uint64_t bytes) {
    constexpr const char* UNITS[] = {"kB", "MB", "GB", "TB", "PB", "EB"};
    if (bytes < 1000) return std::to_string(bytes) + " B";
    double value = static_cast<double>(bytes) / 1000;
    size_t unit = 0;
    // 999.95 and more would be written as "1000.0".
    while (value >= 999.95 && unit + 1 < std::size(UNITS)) {
        value /= 1000;
        ++unit;
    }
    return Format("%.1f %s", value, UNITS[unit]);
}

std::string DurationText(uint64_t seconds) {
    const auto value = static_cast<unsigned long long>(seconds);
    if (value < 60) return Format("%llu s", value);
    if (value < 3600) return Format("%llu min %02llu s", value / 60, value % 60);
    return Format("%llu h %02llu min", value / 3600, value / 60 % 60);
}

std::string TimeText(time_t time) {
    if (time == 0) return "never";
    tm local{};
    char text[64];
    if (localtime_r(&time, &local) == nullptr ||
        strftime(text, sizeof text, "%Y-%m-%d %H:%M:%S", &local) == 0) {
        return "?";
    }
    return text;
}
