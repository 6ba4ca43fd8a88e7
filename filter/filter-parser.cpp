#include "filter/filter-parser.h"

#include <cstdio>
#include <cstdlib>
#include <limits>
#include <memory>
#include <new>

#include "filter/filter-error.h"
#include "filter/filter-record.h"
#include "filter/filter-value.h"
#include "utils/unique-fd.h"

namespace {

// What may come next; several may.
enum State : unsigned {
    STATE_SECTION = 1,
    STATE_KEY = 2,
    STATE_VALUE = 4,
};

class Parser {
public:
    Parser(const FilterSchema& schema, void* record)
        : m_schema(schema), m_record(static_cast<char*>(record)) {}

    // Takes one line, with its newline if it has one; a FilterError.
    int ParseLine(std::string_view text);
    [[nodiscard]] int UnknownKeys() const { return m_unknown_keys; }

private:
    int ParseSection(FilterLine& line);
    int ParseKey(FilterLine& line);
    int ParseValue(FilterLine& line);
    int ParseNumber(FilterLine& line);
    int ParseString(FilterLine& line);
    int ParseList(FilterLine& line);

    // Where the value of the present key goes.
    template <typename T>
    T& Target() {
        return *reinterpret_cast<T*>(m_record + m_section->offset + m_key->offset);
    }

    const FilterSchema& m_schema;
    char* m_record;
    unsigned m_state = STATE_SECTION;
    const FilterSection* m_section = nullptr;
    const FilterKey* m_key = nullptr;
    int m_unknown_keys = 0;
};

int RequireEnd(FilterLine& line) {
    line.SkipBlanks();
    return line.IsAtEnd() ? FILTER_NO_ERROR : FILTER_LINE_NOT_ENDED;
}

int Parser::ParseLine(std::string_view text) {
    FilterLine line(text);
    line.SkipBlanks();
    if (line.IsAtEnd()) return FILTER_NO_ERROR;
    if (line.Peek() == '[' && (m_state & STATE_SECTION) != 0) return ParseSection(line);
    if (line.Peek() == '"' && (m_state & STATE_VALUE) != 0) return ParseValue(line);
    return ParseKey(line);
}

// Takes the name and the bracket after it.
int TakeSectionName(FilterLine& line, std::string& name) {
    if (line.Peek() == ']') return FILTER_SECTION_MISSING_SECTION;
    for (; line.Peek() != ']'; line.Skip()) {
        if (line.IsAtEnd()) return FILTER_SECTION_MISSING_RIGHT_BRACKET;
        if (!IsFilterNameChar(line.Peek())) return FILTER_SECTION_ILLEGAL_CHARACTER;
        if (name.size() == FILTER_MAX_NAME) return FILTER_SECTION_TOO_LONG;
        name += static_cast<char>(line.Peek());
    }
    line.Skip();
    return FILTER_NO_ERROR;
}

int Parser::ParseSection(FilterLine& line) {
    line.Skip();
    std::string name;
    if (const int error = TakeSectionName(line, name); error != FILTER_NO_ERROR) return error;
    if (const int error = RequireEnd(line); error != FILTER_NO_ERROR) return error;
    for (size_t i = 0; i < m_schema.section_count; ++i) {
        if (name != m_schema.sections[i].name) continue;
        m_section = &m_schema.sections[i];
        m_state = STATE_SECTION | STATE_KEY;
        return FILTER_NO_ERROR;
    }
    return FILTER_SECTION_UNDEFINED_SECTION;
}

const FilterKey* FindKey(const FilterSection& section, std::string_view name) {
    for (size_t i = 0; i < section.key_count; ++i) {
        if (name == section.keys[i].name) return &section.keys[i];
    }
    return nullptr;
}

int Parser::ParseKey(FilterLine& line) {
    if ((m_state & STATE_KEY) == 0) return FILTER_LINE_NOT_EXPECTED;
    const std::string name(line.TakeName());
    if (name.empty()) return FILTER_KEY_MISSING_KEY;
    if (name.size() > FILTER_MAX_NAME) return FILTER_KEY_TOO_LONG;
    m_key = FindKey(*m_section, name);
    if (m_key == nullptr) {
        std::printf("warning: unknown key (%s)\n", name.c_str());
        ++m_unknown_keys;
    }
    line.SkipBlanks();
    if (line.Peek() != '=') return FILTER_KEY_ILLEGAL_CHARACTER;
    line.Skip();
    line.SkipBlanks();
    return m_key == nullptr ? FILTER_NO_ERROR : ParseValue(line);
}

int Parser::ParseValue(FilterLine& line) {
    switch (m_key->type) {
        case FILTER_KEY_INT32:
        case FILTER_KEY_UINT64:
            return ParseNumber(line);
        case FILTER_KEY_STRING:
            return ParseString(line);
        case FILTER_KEY_LIST:
            return ParseList(line);
    }
    return FILTER_INTERNAL_ERROR;
}

int Parser::ParseNumber(FilterLine& line) {
    std::string digits;
    if (const int error = TakeFilterNumber(line, digits); error != FILTER_NO_ERROR) return error;
    const long long number = std::strtoll(digits.c_str(), nullptr, 10);  // too large: the largest
    if (m_key->type == FILTER_KEY_UINT64) {
        Target<uint64_t>() = static_cast<uint64_t>(number);
    } else {
        using Limits = std::numeric_limits<int32_t>;
        Target<int32_t>() = number > Limits::max()   ? Limits::max()
                            : number < Limits::min() ? Limits::min()
                                                     : static_cast<int32_t>(number);
    }
    return RequireEnd(line);
}

int Parser::ParseString(FilterLine& line) {
    std::string value;
    if (const int error = TakeFilterString(line, value); error != FILTER_NO_ERROR) return error;
    Target<std::string>() = std::move(value);
    return RequireEnd(line);
}

int Parser::ParseList(FilterLine& line) {
    for (;;) {
        std::string value;
        if (const int error = TakeFilterString(line, value); error != FILTER_NO_ERROR) return error;
        Target<StringList>().Add(std::move(value));
        line.SkipBlanks();
        if (line.IsAtEnd()) {
            m_state = STATE_SECTION | STATE_KEY;
            return FILTER_NO_ERROR;
        }
        if (line.Peek() != ',') return FILTER_SEPARATER_WITHOUT_NAME;
        line.Skip();
        line.SkipBlanks();
        if (line.IsAtEnd()) {
            m_state = STATE_VALUE;
            return FILTER_NO_ERROR;
        }
    }
}

using UniqueFile = std::unique_ptr<FILE, FreeWith<fclose>>;

// Reads up to a newline, the end of the file, or the length of the longest line. False at the end.
bool ReadLine(FILE* file, std::string& text) {
    text.clear();
    while (text.size() < FILTER_MAX_LINE) {
        const int c = getc_unlocked(file);
        if (c == EOF) return !text.empty();
        text += static_cast<char>(c);
        if (c == '\n') return true;
    }
    return true;
}

int ParseLine(Parser& parser, std::string_view text) {
    try {
        return parser.ParseLine(text);
    } catch (const std::bad_alloc&) {
        return FILTER_INTERNAL_ERROR;
    }
}

int ParseLines(FILE* file, Parser& parser) {
    std::string text;
    int number = 1;
    while (ReadLine(file, text)) {
        if (const int error = ParseLine(parser, text); error != FILTER_NO_ERROR) {
            std::fprintf(stderr, "parser: %s at line %d\n", FilterErrorName(error), number);
            return error;
        }
        if (text.back() == '\n') ++number;
    }
    return FILTER_NO_ERROR;
}

}  // namespace

int ParseConfigFile(const std::string& path, const FilterSchema& schema, void* record) {
    const UniqueFile file(std::fopen(path.c_str(), "re"));
    if (file == nullptr) return FILTER_PARSE_FAILED;
    Parser parser(schema, record);
    if (ParseLines(file.get(), parser) != FILTER_NO_ERROR) return FILTER_PARSE_FAILED;
    // Half a filter, or one that reads as empty, would let pass what it should keep out.
    if (std::ferror(file.get()) != 0) return FILTER_PARSE_FAILED;
    return parser.UnknownKeys() > 0 ? FILTER_PARSED_WITH_UNKNOWN_KEYS : FILTER_PARSED;
}
