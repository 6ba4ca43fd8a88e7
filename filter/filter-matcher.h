// The comparisons of the filter, each prepared once so that a check does not grow with the lists.
//
// Upper and lower case of ASCII letters count as the same. The texts that are asked about must be
// in lower case already (FilterLower); items are taken as they come.
#pragma once

#include <bitset>
#include <string>
#include <string_view>
#include <unordered_set>
#include <vector>

[[nodiscard]] std::string FilterLower(std::string_view text);

// Any character of a set occurs in the text.
class CharMatcher {
public:
    explicit CharMatcher(std::string_view chars);
    [[nodiscard]] bool Matches(std::string_view text) const;

private:
    std::bitset<256> m_chars;
    bool m_is_empty;
};

// Items to which a text, or one of its ends, may be equal.
class NameMatcher {
public:
    explicit NameMatcher(const std::vector<std::string>& items);
    [[nodiscard]] bool Equals(std::string_view text) const;
    // The text starts, or ends, with an item.
    [[nodiscard]] bool IsStartOf(std::string_view text) const;
    [[nodiscard]] bool IsEndOf(std::string_view text) const;
    // The path equals an item, or starts with one that "/" follows.
    [[nodiscard]] bool IsFolderOf(std::string_view path) const;

private:
    struct Hash {
        using is_transparent = void;
        size_t operator()(std::string_view text) const {
            return std::hash<std::string_view>()(text);
        }
    };

    std::unordered_set<std::string, Hash, std::equal_to<>> m_items;
    std::vector<size_t> m_lengths;  // that occur, ascending
};

// The whole text matches an item in which "*" stands for any run of characters.
class GlobMatcher {
public:
    explicit GlobMatcher(const std::vector<std::string>& items);
    [[nodiscard]] bool Matches(std::string_view text) const;

private:
    std::vector<std::string> m_items;
};

// A file's path in its parts; `folder` ends in "/".
struct FilterPath {
    std::string_view folder;
    std::string_view name;
    std::string_view extension;
};

// 0; -1 for a path that does not start with "/" and for a part that is too long.
[[nodiscard]] int SplitFilterPath(std::string_view path, FilterPath& parts);

constexpr size_t FILTER_MAX_COMPONENT = 511;

// Calls visit(component) for each component of the path; a longer one than FILTER_MAX_COMPONENT
// comes in pieces. Ends with the first result that is not 0, and gives it; else 0.
template <typename Visit>
int ForEachComponent(std::string_view path, Visit visit) {
    while (!path.empty()) {
        if (path.front() == '/') {
            path.remove_prefix(1);
            continue;
        }
        const std::string_view piece =
            path.substr(0, path.find('/')).substr(0, FILTER_MAX_COMPONENT);
        if (const int result = visit(piece); result != 0) return result;
        path.remove_prefix(piece.size());
    }
    return 0;
}
