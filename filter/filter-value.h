// The texts of values in a filter file: numbers and strings between double quotes.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

// One line that is being parsed, as a rule with its newline; past the text it reads as END.
class FilterLine {
public:
    static constexpr int END = -1;

    explicit FilterLine(std::string_view text) : m_text(text) {}

    [[nodiscard]] int Peek() const {
        return m_at < m_text.size() ? static_cast<unsigned char>(m_text[m_at]) : END;
    }
    void Skip() { ++m_at; }
    void SkipBlanks();
    // True at a newline, at the end, and at a comment.
    [[nodiscard]] bool IsAtEnd() const;
    // Takes the run of letters, digits, "_" and "-" that comes next.
    [[nodiscard]] std::string_view TakeName();
    // Takes what comes before the next blank, comment or end.
    [[nodiscard]] std::string_view TakeWord();

private:
    std::string_view m_text;
    size_t m_at = 0;
};

[[nodiscard]] bool IsFilterNameChar(int c);

// Take a value; the results are FilterError values.
[[nodiscard]] int TakeFilterNumber(FilterLine& line, std::string& digits);
[[nodiscard]] int TakeFilterString(FilterLine& line, std::string& value);
