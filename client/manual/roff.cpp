#include "manual/roff.h"

#include <unicode/utf8.h>

#include <cstdio>

namespace {

const char* Escape(UChar32 c) {
    switch (c) {
        case '\\':
            return "\\(rs";
        case '-':
            return "\\-";
        case '"':  // ends an argument of a macro
            return "\\(dq";
        case '\'':  // starts an order, and would be shown as a bent quote
            return "\\(aq";
        case '`':
            return "\\(ga";
        case '^':
            return "\\(ha";
        case '~':
            return "\\(ti";
        default:
            return nullptr;
    }
}

std::string Font(char font, std::string_view text) {
    if (text.empty()) return "";
    return std::string("\\f") + font + RoffText(text) + "\\fR";
}

}  // namespace

std::string RoffText(std::string_view text) {
    std::string roff;
    const int32_t length = static_cast<int32_t>(text.size());
    for (int32_t at = 0; at < length;) {
        const int32_t begin = at;
        UChar32 c = 0;
        U8_NEXT_OR_FFFD(text.data(), at, length, c);
        const bool is_at_start = begin == 0 || text[static_cast<size_t>(begin) - 1] == '\n';
        if (c == '.' && is_at_start) {
            roff += "\\&.";
        } else if (const char* escape = Escape(c); escape != nullptr) {
            roff += escape;
        } else if (c < 0x80) {
            roff += static_cast<char>(c);
        } else {
            char name[16];
            snprintf(name, sizeof name, "\\[u%04X]", static_cast<unsigned>(c));
            roff += name;
        }
    }
    return roff;
}

std::string RoffBold(std::string_view text) { return Font('B', text); }

std::string RoffItalic(std::string_view text) { return Font('I', text); }
