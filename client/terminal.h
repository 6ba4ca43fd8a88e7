// What standard output is: a terminal with colours, one without, or a pipe or file.
//
// Threads: belongs to one thread.
#pragma once

#include <cstddef>
#include <string>

enum class Colour { PLAIN, BOLD, RED, GREEN, YELLOW, CYAN, GREY };

class Terminal {
public:
    // Looks at the descriptor and at the environment: no colour with a non-empty NO_COLOR or the
    // terminal "dumb".
    explicit Terminal(int descriptor);

    [[nodiscard]] bool IsTerminal() const { return m_is_terminal; }
    // Whether what is written can be drawn over.
    [[nodiscard]] bool CanRedraw() const { return m_is_terminal && !m_is_dumb; }
    // The text in that colour; the text itself where colours are not wanted.
    [[nodiscard]] std::string Paint(Colour colour, const std::string& text) const;
    // Columns of the terminal now; 80 when that cannot be told.
    [[nodiscard]] size_t Columns() const;

private:
    int m_descriptor;
    bool m_is_terminal;
    bool m_is_dumb;
    bool m_has_colour;
};
