#include "client/log-keyword.h"

#include <unicode/uchar.h>
#include <unicode/unorm2.h>
#include <unicode/ustring.h>
#include <unicode/utf16.h>

#include <algorithm>
#include <string_view>

#include "client/exit-status.h"
#include "client/log-parameters.h"
#include "db/log-info.h"

namespace {

constexpr char16_t REPLACEMENT = 0xFFFD;
// sqlite refuses patterns above 50000 bytes.
constexpr size_t MAX_PLAIN_PART = 1000;

int HexDigit(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    return c >= 'a' && c <= 'f' ? c - 'a' + 10 : -1;
}

// The byte that is shown as the "\xNN" at the start of `text`; -1 when none is. Printable ASCII is
// never shown so.
int ShownByte(std::string_view text) {
    if (text.size() < 4 || !text.starts_with("\\x")) return -1;
    const int high = HexDigit(text[2]);
    const int low = HexDigit(text[3]);
    if (high < 0 || low < 0) return -1;
    const int byte = high * 16 + low;
    return byte >= 0x20 && byte < 0x7F ? -1 : byte;
}

// What a part of a sentence stands for.
std::string WithoutEscapes(std::string_view text) {
    std::string plain;
    while (!text.empty()) {
        const int byte = ShownByte(text);
        if (byte >= 0) {
            plain += static_cast<char>(byte);
            text.remove_prefix(4);
            continue;
        }
        if (text.starts_with("\\\"")) text.remove_prefix(1);
        plain += text.front();
        text.remove_prefix(1);
    }
    return plain;
}

// The text as it comes back from the log. Nothing changes but bytes that are no UTF-8.
std::string AsStored(const std::string& text) {
    LogInfo row;
    row.SetDescription(LogDescription::LOG_DESC_TASK_ADDED, text);
    const auto names = LogParameters(row.description_param);
    return names && !names->empty() ? names->front() : text;
}

// In the composed form, with U+FFFD for what is no UTF-8.
std::u16string Composed(std::string_view text) {
    UErrorCode error = U_ZERO_ERROR;
    std::u16string units(text.size() + 1, u'\0');
    int32_t length = 0;
    u_strFromUTF8WithSub(units.data(), static_cast<int32_t>(units.size()), &length, text.data(),
                         static_cast<int32_t>(text.size()), REPLACEMENT, nullptr, &error);
    if (U_FAILURE(error)) return {};
    units.resize(static_cast<size_t>(length));
    std::u16string composed(units.size() * 3 + 1, u'\0');  // it never gets longer than this
    length = unorm2_normalize(unorm2_getNFCInstance(&error), units.data(), length, composed.data(),
                              static_cast<int32_t>(composed.size()), &error);
    if (U_FAILURE(error)) return units;
    composed.resize(static_cast<size_t>(length));
    return composed;
}

// Without upper case. The database, which chooses first, does so for ASCII alone: there a long s is
// not an s.
std::u16string Folded(const std::u16string& text) {
    std::u16string folded;
    const auto length = static_cast<int32_t>(text.size());
    for (int32_t at = 0; at < length;) {
        UChar32 c = 0;
        U16_NEXT(text.data(), at, length, c);
        c = u_foldCase(c, U_FOLD_CASE_DEFAULT);
        if (c > 0xFFFF) {
            folded += static_cast<char16_t>(U16_LEAD(c));
            folded += static_cast<char16_t>(U16_TRAIL(c));
        } else {
            folded += static_cast<char16_t>(c);
        }
    }
    return folded;
}

// Stored as itself by every writer of JSON, and nothing special in SQL; LogDB takes care of "%" and
// "_".
bool IsPlain(char16_t c) {
    return c >= 0x20 && c < 0x7F && c != '\'' && c != '"' && c != '\\' && c != '/';
}

// The longest run of plain characters.
std::string PlainPartOf(const std::u16string& text) {
    std::string longest;
    std::string run;
    for (size_t i = 0; i <= text.size(); ++i) {
        if (i < text.size() && IsPlain(text[i])) {
            run += static_cast<char>(text[i]);
            continue;
        }
        if (run.size() > longest.size()) longest = run;
        run.clear();
    }
    longest.resize(std::min(longest.size(), MAX_PLAIN_PART));
    return longest;
}

}  // namespace

LogKeyword::LogKeyword(const std::string& text) {
    if (text.find('\0') != std::string::npos) {
        throw CommandError(EXIT_USAGE, "no name has a NUL in it");
    }
    m_text = Folded(Composed(AsStored(text)));
    const std::u16string as_shown = Composed(AsStored(WithoutEscapes(text)));
    m_text_as_shown = Folded(as_shown);
    // Its runs of plain characters are in the text as it stands as well.
    m_plain_part = PlainPartOf(as_shown);
}

bool LogKeyword::IsIn(const std::string& name) const {
    const std::u16string folded = Folded(Composed(name));
    return folded.find(m_text) != std::u16string::npos ||
           folded.find(m_text_as_shown) != std::u16string::npos;
}

bool LogKeyword::Fits(const LogInfo& row) const {
    if (m_text.empty()) return true;
    const auto names = LogParameters(row.description_param);
    if (!names) return IsIn(row.description_param);
    return std::ranges::any_of(*names, [this](const std::string& name) { return IsIn(name); });
}
