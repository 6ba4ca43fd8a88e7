#include "host/recycle-name.h"

#include <algorithm>

namespace keld_host {
namespace {

// Where the extension starts, its dot included; the length of the name when there is none. A
// leading dot starts no extension.
size_t ExtensionStart(std::string_view name) {
    const size_t dot = name.rfind('.');
    return dot == name.npos || dot == 0 ? name.size() : dot;
}

// The length of the longest start of `text` that has at most `size` bytes and ends at a character.
size_t CutAtCharacter(std::string_view text, size_t size) {
    if (size >= text.size()) return text.size();
    const auto is_inside = [&](size_t at) {
        return (static_cast<unsigned char>(text[at]) & 0xC0U) == 0x80U;
    };
    // A character has at most three such bytes: more in a row are no UTF-8, and are cut anywhere.
    size_t cut = size;
    while (cut > 0 && size - cut < 3 && is_inside(cut)) --cut;
    return is_inside(cut) ? size : cut;
}

}  // namespace

std::string NumberedName(std::string_view name, unsigned number, bool is_folder, size_t max_bytes) {
    const std::string mark = " (" + std::to_string(number) + ")";
    size_t start = is_folder ? name.size() : ExtensionStart(name);
    if (max_bytes != 0 && name.size() - start + mark.size() >= max_bytes) start = name.size();
    std::string_view stem = name.substr(0, start);
    const std::string_view extension = name.substr(start);
    if (max_bytes != 0) {
        const size_t taken = std::min(max_bytes, mark.size() + extension.size());
        stem = stem.substr(0, CutAtCharacter(stem, max_bytes - taken));
    }
    return std::string(stem).append(mark).append(extension);
}

}  // namespace keld_host
