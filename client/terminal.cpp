#include "client/terminal.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <cstdlib>
#include <string_view>

namespace {

bool IsColourRefused() {
    const char* refused = getenv("NO_COLOR");
    return refused != nullptr && *refused != '\0';
}

// It knows no orders. One that is not named may not know them either.
bool IsDumb() {
    const char* kind = getenv("TERM");
    return kind == nullptr || std::string_view(kind) == "dumb";
}

const char* Sequence(Colour colour) {
    switch (colour) {
        case Colour::BOLD:
            return "\033[1m";
        case Colour::RED:
            return "\033[31m";
        case Colour::GREEN:
            return "\033[32m";
        case Colour::YELLOW:
            return "\033[33m";
        case Colour::CYAN:
            return "\033[36m";
        case Colour::GREY:
            return "\033[90m";
        case Colour::PLAIN:
            break;
    }
    return "";
}

}  // namespace

Terminal::Terminal(int descriptor)
    : m_descriptor(descriptor),
      m_is_terminal(isatty(descriptor) == 1),
      m_is_dumb(IsDumb()),
      m_has_colour(m_is_terminal && !m_is_dumb && !IsColourRefused()) {}

std::string Terminal::Paint(Colour colour, const std::string& text) const {
    if (!m_has_colour || colour == Colour::PLAIN) return text;
    return Sequence(colour) + text + "\033[0m";
}

size_t Terminal::Columns() const {
    constexpr size_t COLUMNS = 80;
    winsize size{};
    if (!m_is_terminal || ioctl(m_descriptor, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) {
        return COLUMNS;
    }
    return size.ws_col;
}
