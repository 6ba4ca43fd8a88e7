#include "filter/black-list-rules.h"

#include "filter/file-filter.h"

BlackListRules::BlackListRules(const BlackFilter& list)
    : m_common{list.common.max_length,
               CharMatcher(list.common.black_char),
               NameMatcher(list.common.black_name.Items()),
               NameMatcher(list.common.black_prefix.Items()),
               NameMatcher(list.common.black_suffix.Items()),
               NameMatcher(list.common.black_dir_prefix.Items())},
      m_file{
          CharMatcher(list.file.black_char),           NameMatcher(list.file.black_prefix.Items()),
          NameMatcher(list.file.black_suffix.Items()), GlobMatcher(list.file.black_glob.Items()),
          NameMatcher(list.file.black_name.Items()),   NameMatcher(list.file.black_ext.Items())},
      m_directory{CharMatcher(list.directory.black_char),
                  NameMatcher(list.directory.black_name.Items()),
                  NameMatcher(list.directory.black_prefix.Items()),
                  GlobMatcher(list.directory.black_glob.Items()),
                  NameMatcher(list.directory.black_suffix.Items())} {}

int BlackListRules::Check(std::string_view path, bool is_dir) const {
    if (m_common.dir_prefixes.IsFolderOf(path)) return FILTER_BLACK_DIR_PREFIX;
    std::string_view folders = path;
    if (!is_dir) {
        FilterPath parts;
        if (SplitFilterPath(path, parts) != 0) return FILTER_NOT_WHITE;
        if (const int reason = CheckFile(parts); reason != FILTER_PASS) return reason;
        folders = parts.folder;
    }
    return ForEachComponent(folders, [this](std::string_view component) {
        const int reason = CheckCommon(component);
        return reason != FILTER_PASS ? reason : CheckDirectory(component);
    });
}

// In each of these the order of the rules is fixed: it decides which reason is given.

int BlackListRules::CheckCommon(std::string_view text) const {
    if (m_common.max_length != 0 && text.size() > m_common.max_length) return FILTER_MAX_LENGTH;
    if (m_common.chars.Matches(text)) return FILTER_BLACK_CHAR;
    if (m_common.names.Equals(text)) return FILTER_BLACK_NAME;
    if (m_common.prefixes.IsStartOf(text)) return FILTER_BLACK_PREFIX;
    if (m_common.suffixes.IsEndOf(text)) return FILTER_BLACK_SUFFIX;
    return FILTER_PASS;
}

int BlackListRules::CheckFile(const FilterPath& parts) const {
    if (const int reason = CheckCommon(parts.name); reason != FILTER_PASS) return reason;
    if (m_file.chars.Matches(parts.name)) return FILTER_FILE_CHAR;
    if (m_file.prefixes.IsStartOf(parts.name)) return FILTER_FILE_PREFIX;
    if (m_file.suffixes.IsEndOf(parts.name)) return FILTER_FILE_SUFFIX;
    if (m_file.globs.Matches(parts.name)) return FILTER_FILE_GLOB;
    if (m_file.names.Equals(parts.name)) return FILTER_FILE_NAME;
    if (m_file.extensions.Equals(parts.extension)) return FILTER_FILE_EXT;
    return FILTER_PASS;
}

int BlackListRules::CheckDirectory(std::string_view component) const {
    if (m_directory.chars.Matches(component)) return FILTER_DIR_CHAR;
    if (m_directory.names.Equals(component)) return FILTER_DIR_NAME;
    if (m_directory.prefixes.IsStartOf(component)) return FILTER_DIR_PREFIX;
    if (m_directory.globs.Matches(component)) return FILTER_DIR_GLOB;
    if (m_directory.suffixes.IsEndOf(component)) return FILTER_DIR_SUFFIX;
    return FILTER_PASS;
}
