#include "filter/filter-matcher.h"

#include <algorithm>

namespace {

constexpr size_t kFolderLimit = 4096;
constexpr size_t kNameLimit = 512;

char Lower(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }

bool GlobMatches(std::string_view pattern, std::string_view text) {
    size_t p = 0;
    size_t t = 0;
    size_t star = pattern.npos;  // the last one met, and how much of the text it has to take
    size_t taken = 0;
    while (t < text.size()) {
        if (p < pattern.size() && pattern[p] == '*') {
            star = p++;
            taken = t;
        } else if (p < pattern.size() && pattern[p] == text[t]) {
            ++p;
            ++t;
        } else if (star != pattern.npos) {
            p = star + 1;
            t = ++taken;
        } else {
            return false;
        }
    }
    return pattern.find_first_not_of('*', p) == pattern.npos;
}

}  // namespace

std::string FilterLower(std::string_view text) {
    std::string lower(text);
    std::transform(lower.begin(), lower.end(), lower.begin(), Lower);
    return lower;
}

CharMatcher::CharMatcher(std::string_view chars) : m_is_empty(chars.empty()) {
    for (const char c : chars) m_chars.set(static_cast<unsigned char>(Lower(c)));
}

bool CharMatcher::Matches(std::string_view text) const {
    return !m_is_empty && std::any_of(text.begin(), text.end(), [this](char c) {
        return m_chars.test(static_cast<unsigned char>(c));
    });
}

NameMatcher::NameMatcher(const std::vector<std::string>& items) {
    for (const std::string& item : items) {
        m_items.insert(FilterLower(item));
        m_lengths.push_back(item.size());
    }
    std::sort(m_lengths.begin(), m_lengths.end());
    m_lengths.erase(std::unique(m_lengths.begin(), m_lengths.end()), m_lengths.end());
}

bool NameMatcher::Equals(std::string_view text) const {
    return !m_items.empty() && m_items.find(text) != m_items.end();
}

bool NameMatcher::IsStartOf(std::string_view text) const {
    for (const size_t length : m_lengths) {
        if (length > text.size()) return false;
        if (Equals(text.substr(0, length))) return true;
    }
    return false;
}

bool NameMatcher::IsEndOf(std::string_view text) const {
    for (const size_t length : m_lengths) {
        if (length > text.size()) return false;
        if (Equals(text.substr(text.size() - length))) return true;
    }
    return false;
}

bool NameMatcher::IsFolderOf(std::string_view path) const {
    for (const size_t length : m_lengths) {
        if (length > path.size()) return false;
        const bool is_cut_at_slash = length == path.size() || path[length] == '/';
        if (is_cut_at_slash && Equals(path.substr(0, length))) return true;
    }
    return false;
}

GlobMatcher::GlobMatcher(const std::vector<std::string>& items) {
    for (const std::string& item : items) m_items.push_back(FilterLower(item));
}

bool GlobMatcher::Matches(std::string_view text) const {
    return std::any_of(m_items.begin(), m_items.end(),
                       [text](const std::string& item) { return GlobMatches(item, text); });
}

int SplitFilterPath(std::string_view path, FilterPath& parts) {
    if (path.empty() || path.front() != '/') return -1;
    const size_t name_at = path.rfind('/') + 1;
    parts.folder = path.substr(0, name_at);
    parts.name = path.substr(name_at);
    const size_t dot = parts.name.rfind('.');
    const bool has_extension = dot != parts.name.npos && dot != 0;
    parts.extension = has_extension ? parts.name.substr(dot + 1) : std::string_view();
    const bool fits = parts.folder.size() < kFolderLimit && parts.name.size() < kNameLimit;
    return fits ? 0 : -1;
}
