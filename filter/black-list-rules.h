// A black list made ready for checking. Immutable once made; any thread may ask it.
#pragma once

#include <string_view>

#include "filter/filter-matcher.h"
#include "filter/filter-record.h"

class BlackListRules {
public:
    explicit BlackListRules(const BlackFilter& list);

    // 0, or the FilterReason of the first rule that refuses. The path is in lower case.
    [[nodiscard]] int Check(std::string_view path, bool is_dir) const;

private:
    [[nodiscard]] int CheckCommon(std::string_view text) const;
    [[nodiscard]] int CheckFile(const FilterPath& parts) const;
    [[nodiscard]] int CheckDirectory(std::string_view component) const;

    struct {
        uint64_t max_length;
        CharMatcher chars;
        NameMatcher names;
        NameMatcher prefixes;
        NameMatcher suffixes;
        NameMatcher dir_prefixes;
    } m_common;
    struct {
        CharMatcher chars;
        NameMatcher prefixes;
        NameMatcher suffixes;
        GlobMatcher globs;
        NameMatcher names;
        NameMatcher extensions;
    } m_file;
    struct {
        CharMatcher chars;
        NameMatcher names;
        NameMatcher prefixes;
        GlobMatcher globs;
        NameMatcher suffixes;
    } m_directory;
};
