#include "host/host-conf-reader.h"

#include <ini.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <utility>

#include "host/text.h"

namespace keld_host {
namespace {

// inih cuts a line at 199 bytes and a key at 49, without a word; these leave it some room.
constexpr size_t MAX_PLAIN_LINE = 160;
constexpr size_t MAX_KEY = 48;
// Stands before the number of a value that was handed through.
constexpr char MARK = '\x01';
// The key that tells a section line to the handler.
constexpr const char* SECTION_KEY = "\x02";

class Reader {
public:
    Reader(std::string_view text, IniVisitor& visitor) : m_rest(text), m_visitor(visitor) {
        constexpr std::string_view bom = "\xEF\xBB\xBF";
        if (m_rest.substr(0, bom.size()) == bom) m_rest.remove_prefix(bom.size());
    }

    void Run() {
        const int line = ini_parse_stream(&Reader::NextLine, this, &Reader::OnItem, this);
        if (line > 0) {
            m_visitor.OnBadLine(m_realLines[static_cast<size_t>(line) - 1],
                                "neither [section] nor key = value");
        }
    }

private:
    // The library asks for one line at a time, of less than `size` bytes, as fgets gives it.
    static char* NextLine(char* buffer, int size, void* stream) {
        auto* self = static_cast<Reader*>(stream);
        if (!self->m_pending.empty()) {
            const std::string line = std::exchange(self->m_pending, {});
            return self->Give(line, buffer, size);
        }
        if (self->m_rest.empty()) return nullptr;
        const size_t end = self->m_rest.find('\n');
        const std::string_view line = Trim(self->m_rest.substr(0, end));
        self->m_rest =
            end == std::string_view::npos ? std::string_view{} : self->m_rest.substr(end + 1);
        ++self->m_line;
        return self->Give(self->Shorten(line), buffer, size);
    }

    char* Give(const std::string& line, char* buffer, int size) {
        m_realLines.push_back(m_line);
        snprintf(buffer, static_cast<size_t>(size), "%s\n", line.c_str());
        return buffer;
    }

    std::string Shorten(std::string_view line) {
        if (line.empty() || line.front() == ';' || line.front() == '#') return {};
        const bool isControl = std::any_of(line.begin(), line.end(), [](char c) {
            return static_cast<unsigned char>(c) < ' ' && c != '\t';
        });
        if (isControl) return Refuse("a control character");
        if (line.front() == '[') return ShortenSection(line);
        const size_t equals = line.find_first_of("=:");
        if (equals == std::string_view::npos) return Refuse("neither [section] nor key = value");
        const std::string_view key = Trim(line.substr(0, equals));
        if (key.empty()) return Refuse("a value without a key");
        if (key.size() > MAX_KEY) return Refuse("the key is too long");
        if (line.size() <= MAX_PLAIN_LINE) return std::string(line);
        m_values.push_back(WithoutComment(line.substr(equals + 1)));
        return std::string(key) + " = " + MARK + std::to_string(m_values.size() - 1);
    }

    std::string ShortenSection(std::string_view line) {
        const size_t end = line.find(']');
        if (end == std::string_view::npos) return Refuse("a section without ]");
        m_sections.emplace_back(Trim(line.substr(1, end - 1)));
        m_pending = std::string(SECTION_KEY) + " = ";
        return "[" + std::to_string(m_sections.size() - 1) + "]";
    }

    std::string Refuse(const char* reason) {
        m_visitor.OnBadLine(m_line, reason);
        return {};
    }

    // As the library does it: a comment in a line starts at a semicolon after a blank.
    static std::string WithoutComment(std::string_view value) {
        for (size_t i = 1; i < value.size(); ++i) {
            if (value[i] == ';' && (value[i - 1] == ' ' || value[i - 1] == '\t')) {
                value = value.substr(0, i);
                break;
            }
        }
        return std::string(Trim(value));
    }

    static int OnItem(void* user, const char* section, const char* key, const char* value) {
        auto* self = static_cast<Reader*>(user);
        const std::string name =
            section[0] == '\0' ? std::string() : self->m_sections[strtoul(section, nullptr, 10)];
        if (strcmp(key, SECTION_KEY) == 0) {
            self->m_visitor.OnSection(self->m_line, name);
        } else if (value[0] == MARK) {
            self->m_visitor.OnKey(self->m_line, name, key,
                                  self->m_values[strtoul(value + 1, nullptr, 10)]);
        } else {
            self->m_visitor.OnKey(self->m_line, name, key, value);
        }
        return 1;
    }

    std::string_view m_rest;
    IniVisitor& m_visitor;
    int m_line = 0;
    std::string m_pending;         // the line that comes next, made by us
    std::vector<int> m_realLines;  // the text's line of each line that the library was given
    std::vector<std::string> m_sections;
    std::vector<std::string> m_values;
};

}  // namespace

void ReadIni(std::string_view text, IniVisitor& visitor) { Reader(text, visitor).Run(); }

}  // namespace keld_host
