#include "client/shell-word.h"

#include "client/text.h"

namespace {

constexpr std::string_view PLAIN =
    "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789_./:=@%+,-";

}  // namespace

std::string ShellWord(std::string_view bytes) {
    if (!bytes.empty() && bytes.find_first_not_of(PLAIN) == std::string_view::npos) {
        return std::string(bytes);
    }
    const bool is_printable = Printable(bytes) == bytes;
    if (is_printable && bytes.find('\'') == std::string_view::npos) {
        return "'" + std::string(bytes) + "'";
    }
    // In the form with escapes "\xNN" is a byte, so a backslash of the name's own is masked.
    std::string masked;
    for (const char byte : bytes) {
        if (byte == '\'' || byte == '\\') masked += '\\';
        masked += byte;
    }
    return "$'" + Printable(masked) + "'";
}
