#include "filter/filter-value.h"

#include "filter/filter-error.h"
#include "filter/filter-parser.h"

namespace {

constexpr size_t kMaxNumber = 1024;

// Not the functions of <cctype>: their answers change with the locale.
bool IsBlank(int c) { return c == ' ' || c == '\t' || c == '\v' || c == '\f' || c == '\r'; }
bool IsDigit(int c) { return c >= '0' && c <= '9'; }
bool IsControl(int c) { return c < 0x20 || c == 0x7f; }

int HexValue(int c) {
    if (IsDigit(c)) return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
}

int OctalValue(int c) { return c >= '0' && c <= '7' ? c - '0' : -1; }

// Takes `count` digits as one byte; -1 when one of them is none.
int TakeDigits(FilterLine& line, int count, int base, int (*value_of)(int)) {
    int byte = 0;
    for (int i = 0; i < count; ++i) {
        const int digit = value_of(line.Peek());
        if (digit < 0) return -1;
        byte = byte * base + digit;
        line.Skip();
    }
    return byte;
}

// Takes what follows a backslash; -1 when it is no escape.
int TakeEscape(FilterLine& line) {
    const int c = line.Peek();
    if (c >= '0' && c <= '3') return TakeDigits(line, 3, 8, OctalValue);
    line.Skip();
    switch (c) {
        case 'a':
            return '\a';
        case 'b':
            return '\b';
        case 'f':
            return '\f';
        case 'n':
            return '\n';
        case 'r':
            return '\r';
        case 't':
            return '\t';
        case 'v':
            return '\v';
        case '\'':
        case '"':
        case '\\':
        case '?':
            return c;
        case 'x':
            return TakeDigits(line, 2, 16, HexValue);
        default:
            return -1;
    }
}

// A sign, "0" or digits, and a fraction. Returns how much of the word that is, or an error.
int CheckNumber(std::string_view word, size_t& length) {
    const auto digit_at = [word](size_t i) { return i < word.size() && IsDigit(word[i]); };
    size_t at = word[0] == '+' || word[0] == '-' ? 1 : 0;
    if (!digit_at(at)) return FILTER_VALUE_NUMERIC_MISSING_INTEGER_PART;
    const bool is_zero = word[at] == '0';
    ++at;
    while (!is_zero && digit_at(at)) ++at;
    if (at < word.size() && word[at] == '.') {
        if (!digit_at(++at)) return FILTER_VALUE_NUMERIC_MISSING_FRACTIONAL_PART;
        while (digit_at(at)) ++at;
    }
    length = at;
    return FILTER_NO_ERROR;
}

}  // namespace

bool IsFilterNameChar(int c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || IsDigit(c) || c == '_' || c == '-';
}

void FilterLine::SkipBlanks() {
    while (IsBlank(Peek())) Skip();
}

bool FilterLine::IsAtEnd() const {
    const int c = Peek();
    return c == END || c == '\n' || c == '#';
}

std::string_view FilterLine::TakeName() {
    const size_t start = m_at;
    while (IsFilterNameChar(Peek())) Skip();
    return m_text.substr(start, m_at - start);
}

std::string_view FilterLine::TakeWord() {
    const size_t start = m_at;
    while (!IsAtEnd() && !IsBlank(Peek())) Skip();
    return m_text.substr(start, m_at - start);
}

int TakeFilterNumber(FilterLine& line, std::string& digits) {
    const std::string_view word = line.TakeWord();
    if (word.empty()) return FILTER_VALUE_NUMERIC_MISSING_VALUE;
    if (word.size() >= kMaxNumber) return FILTER_VALUE_TOO_LONG;
    size_t length = 0;
    if (const int error = CheckNumber(word, length); error != FILTER_NO_ERROR) return error;
    if (length != word.size()) return FILTER_VALUE_NUMERIC_ILLEGAL_SYNTAX;
    digits = word;
    return FILTER_NO_ERROR;
}

int TakeFilterString(FilterLine& line, std::string& value) {
    value.clear();
    if (line.Peek() != '"') return FILTER_VALUE_STRING_MISSING_LEFT_QUOTE;
    line.Skip();
    for (int c = line.Peek(); c != '"' && c != FilterLine::END; c = line.Peek()) {
        if (c == '\n') return FILTER_VALUE_STRING_MISSING_RIGHT_QUOTE;
        if (IsControl(c)) return FILTER_VALUE_STRING_ILLEGAL_CHARACTER;
        line.Skip();
        if (c == '\\') c = TakeEscape(line);
        if (c < 0) return FILTER_VALUE_STRING_ILLEGAL_CHARACTER;
        if (value.size() == FILTER_MAX_STRING) return FILTER_VALUE_TOO_LONG;
        value += static_cast<char>(c);
    }
    if (line.Peek() == '"') line.Skip();
    return value.empty() ? FILTER_VALUE_STRING_EMPTY : FILTER_NO_ERROR;
}
