#include "strategy/spelling-key.h"

#include <unicode/bytestream.h>
#include <unicode/normalizer2.h>
#include <unicode/stringpiece.h>

#include <algorithm>

namespace {

bool IsAscii(std::string_view text) {
    return std::ranges::all_of(text, [](char c) { return static_cast<unsigned char>(c) < 0x80; });
}

std::string AsciiLower(std::string_view text) {
    std::string lower(text);
    for (char& c : lower) {
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    }
    return lower;
}

std::string UnicodeFold(std::string_view text) {
    UErrorCode error = U_ZERO_ERROR;
    const icu::Normalizer2* fold = icu::Normalizer2::getNFKCCasefoldInstance(error);
    std::string folded;
    icu::StringByteSink<std::string> sink(&folded);
    if (U_SUCCESS(error)) {
        const icu::StringPiece piece(text.data(), static_cast<int32_t>(text.size()));
        fold->normalizeUTF8(0, piece, sink, nullptr, error);
    }
    return U_SUCCESS(error) ? folded : AsciiLower(text);
}

}  // namespace

std::string SpellingKey(std::string_view name) {
    name = WithoutTail(name);
    return IsAscii(name) ? AsciiLower(name) : UnicodeFold(name);
}

std::string_view WithoutTail(std::string_view name) {
    return name.substr(0, name.find_last_not_of(". ") + 1);
}
