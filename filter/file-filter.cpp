#include "filter/file-filter.h"

#include <algorithm>

#include "filter/black-list-rules.h"
#include "filter/filter-file.h"
#include "filter/filter-record.h"
#include "filter/white-list-rules.h"
#include "utils/log.h"

FileFilter::FileFilter() = default;
FileFilter::~FileFilter() = default;

int FileFilter::LoadBlackList(const std::string& path) {
    const std::lock_guard lock(m_mutex);
    m_black.reset();
    BlackFilter record;
    if (ReadBlackFilterFile(record, path) != 0) {
        SLOG_ERR("failed to read filter at '%s'\n", path.c_str());
        return -1;
    }
    m_black = std::make_unique<BlackListRules>(record);
    return 0;
}

int FileFilter::LoadWhiteList(const std::string& path) {
    const std::lock_guard lock(m_mutex);
    m_white.reset();
    WhiteFilter record;
    if (ReadWhiteFilterFile(record, path) != 0) return -1;
    m_white = std::make_unique<WhiteListRules>(record);
    return 0;
}

int FileFilter::Check(std::string_view path, bool is_dir) {
    const std::string lower = FilterLower(path);
    const std::lock_guard lock(m_mutex);
    if (m_white != nullptr) {
        if (const int reason = m_white->Check(lower, is_dir); reason < 0) return reason;
    }
    return m_black != nullptr ? m_black->Check(lower, is_dir) : FILTER_PASS;
}

bool FileFilter::IsWritableList(const Strings& list) {
    return std::all_of(list.begin(), list.end(), [](const std::string& value) {
        return !value.empty() && FilterWrittenLength(value) <= FILTER_MAX_WRITTEN;
    });
}

namespace {

StringList ToList(const FileFilter::Strings& strings) {
    StringList list;
    for (const std::string& value : strings) list.Add(value);
    return list;
}

}  // namespace

int FileFilter::WriteBlackList(const std::string& file, const Strings& names, const Strings& exts) {
    if (!IsWritableList(names) || !IsWritableList(exts)) return -1;
    BlackFilter record;
    record.major = 1;
    record.common.black_name = ToList(names);
    record.file.black_ext = ToList(exts);
    return WriteBlackFilterFile(record, file);
}

int FileFilter::WriteWhiteList(const std::string& file, const Strings& names, const Strings& exts) {
    if (!IsWritableList(names) || !IsWritableList(exts)) return -1;
    WhiteFilter record;
    record.major = 1;
    record.common.white_name = ToList(names);
    record.file.white_ext = ToList(exts);
    return WriteWhiteFilterFile(record, file);
}

int FileFilter::ReadBlackList(const std::string& file, Strings& names, Strings& exts) {
    BlackFilter record;
    const int result = ReadBlackFilterFile(record, file);
    names = record.common.black_name.Items();
    exts = record.file.black_ext.Items();
    return result;
}

int FileFilter::ReadWhiteList(const std::string& file, Strings& names, Strings& exts) {
    WhiteFilter record;
    const int result = ReadWhiteFilterFile(record, file);
    names = record.common.white_name.Items();
    exts = record.file.white_ext.Items();
    return result;
}
