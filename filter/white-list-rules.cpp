#include "filter/white-list-rules.h"

#include "filter/file-filter.h"

WhiteListRules::Names::Names(const std::vector<std::string>& list)
    : items(list), takes_all(items.Equals("*")) {}

bool WhiteListRules::Names::Matches(std::string_view text) const {
    return takes_all || items.Equals(text);
}

WhiteListRules::WhiteListRules(const WhiteFilter& list)
    : m_names(list.common.white_name.Items()), m_extensions(list.file.white_ext.Items()) {}

int WhiteListRules::Check(std::string_view path, bool is_dir) const {
    std::string_view folders = path;
    if (!is_dir) {
        FilterPath parts;
        if (SplitFilterPath(path, parts) != 0) return FILTER_NOT_WHITE;
        if (m_names.Matches(parts.name) || m_extensions.Matches(parts.extension)) {
            return FILTER_PASS;
        }
        folders = parts.folder;
    }
    const int has_match = ForEachComponent(
        folders, [this](std::string_view component) { return m_names.Matches(component) ? 1 : 0; });
    return has_match != 0 ? FILTER_PASS : FILTER_NOT_WHITE;
}
