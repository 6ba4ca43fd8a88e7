// A white list made ready for checking. Immutable once made; any thread may ask it.
#pragma once

#include <string_view>

#include "filter/filter-matcher.h"
#include "filter/filter-record.h"

class WhiteListRules {
public:
    explicit WhiteListRules(const WhiteFilter& list);

    // 0, or FILTER_NOT_WHITE. The path is in lower case. A file passes by its own name, by its
    // extension, or by lying under a folder with a listed name.
    [[nodiscard]] int Check(std::string_view path, bool is_dir) const;

private:
    // A list of names in which "*" stands for all.
    struct Names {
        explicit Names(const std::vector<std::string>& items);
        [[nodiscard]] bool Matches(std::string_view text) const;

        NameMatcher items;
        bool takes_all;
    };

    Names m_names;
    Names m_extensions;
};
