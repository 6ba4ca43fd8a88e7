#include "filter/filter-file.h"

#include <cstdarg>
#include <cstdio>

#include "filter/filter-parser.h"
#include "filter/filter-schema.h"
#include "platform/durable-file.h"

namespace {

constexpr size_t kValuesInALine = 5;

template <typename Record>
int ReadFile(Record& record, const std::string& path, const FilterSchema& schema) {
    record = Record();
    const int result = ParseConfigFile(path, schema, &record);
    const bool is_newer = record.major == 1 && record.minor >= 1;
    if (result == FILTER_PARSED || (result == FILTER_PARSED_WITH_UNKNOWN_KEYS && is_newer))
        return 0;
    record = Record();
    return -1;
}

// The form of one byte between double quotes.
std::string Written(unsigned char c) {
    switch (c) {
        case '\t':
            return "\\t";
        case '\n':
            return "\\n";
        case '\v':
            return "\\v";
        case '\f':
            return "\\f";
        case '"':
            return "\\\"";
        case '\\':
            return "\\\\";
        case '$':
        case '@':
        case '`':
            break;
        default:
            if (c >= 0x20 && c < 0x7f) return {static_cast<char>(c)};
    }
    char hex[5];
    std::snprintf(hex, sizeof(hex), "\\x%02x", c);
    return hex;
}

// The text of a filter file, put together in memory: it then reaches the disk in one write.
class FilterText {
public:
    FilterText(int32_t major, int32_t minor) {
        m_text = "[Version]\nmajor = " + std::to_string(major) +
                 "\nminor = " + std::to_string(minor) + "\n";
    }

    void Section(const char* name) { m_text += std::string("\n[") + name + "]\n"; }

    void Value(const char* key, const std::string& value) {
        if (value.empty()) return;
        m_text += std::string(key) + " = ";
        Quote(value);
        m_text += '\n';
    }

    void Value(const char* key, const StringList& list) {
        if (list.Count() == 0) return;
        m_text += std::string(key) + " = ";
        size_t written = 0;
        for (const std::string& value : list.Items()) {
            if (written > 0) m_text += written % kValuesInALine == 0 ? ", \n" : ", ";
            Quote(value);
            ++written;
        }
        m_text += '\n';
    }

    void Value(const char* key, uint64_t value) {
        m_text += std::string(key) + " = " + std::to_string(value) + "\n";
    }

    [[nodiscard]] const std::string& Finish() { return m_text += '\n'; }

private:
    void Quote(const std::string& value) {
        m_text += '"';
        size_t length = 0;
        for (const char c : value) {
            const std::string form = Written(static_cast<unsigned char>(c));
            if (length + form.size() > FILTER_MAX_WRITTEN) break;
            m_text += form;
            length += form.size();
        }
        m_text += '"';
    }

    std::string m_text;
};

// Writable by its owner alone. Half a list would let the next mirror remove what it protected, so
// the file is replaced whole.
int WriteFile(const std::string& path, const std::string& text) {
    return WriteDurableFile(path, text, 0644);
}

}  // namespace

int ReadBlackFilterFile(BlackFilter& record, const std::string& path) {
    return ReadFile(record, path, black_list_filter_schema);
}

int ReadWhiteFilterFile(WhiteFilter& record, const std::string& path) {
    return ReadFile(record, path, white_list_schema);
}

int WriteBlackFilterFile(const BlackFilter& record, const std::string& path) {
    FilterText text(record.major, record.minor);
    text.Section("Common");
    text.Value("black_char", record.common.black_char);
    text.Value("black_prefix", record.common.black_prefix);
    text.Value("black_dir_prefix", record.common.black_dir_prefix);
    text.Value("black_suffix", record.common.black_suffix);
    text.Value("black_name", record.common.black_name);
    text.Value("max_length", record.common.max_length);
    text.Value("max_path", record.common.max_path);
    text.Value("max_dst_path", record.common.max_dst_path);
    text.Section("File");
    text.Value("black_char", record.file.black_char);
    text.Value("black_ext", record.file.black_ext);
    text.Value("black_name", record.file.black_name);
    text.Value("black_prefix", record.file.black_prefix);
    text.Value("black_suffix", record.file.black_suffix);
    text.Value("black_glob", record.file.black_glob);
    text.Value("max_size", record.file.max_size);
    text.Section("Directory");
    text.Value("black_char", record.directory.black_char);
    text.Value("black_name", record.directory.black_name);
    text.Value("black_prefix", record.directory.black_prefix);
    text.Value("black_suffix", record.directory.black_suffix);
    text.Value("black_glob", record.directory.black_glob);
    return WriteFile(path, text.Finish());
}

int WriteWhiteFilterFile(const WhiteFilter& record, const std::string& path) {
    FilterText text(record.major, record.minor);
    text.Section("Common");
    text.Value("white_name", record.common.white_name);
    text.Section("File");
    text.Value("white_ext", record.file.white_ext);
    return WriteFile(path, text.Finish());
}

size_t FilterWrittenLength(std::string_view value) {
    size_t length = 0;
    for (const char c : value) length += Written(static_cast<unsigned char>(c)).size();
    return length;
}
