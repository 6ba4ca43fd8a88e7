// Feeds the text of an INI file to inih line by line, and lifts the library's fixed limits: names
// of sections beyond 49 bytes and lines beyond 199 are handed through it under a number; a section
// without keys is told too; an indented line is a line like any other, not the continuation of the
// value before.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace keld_host {

// What the reader calls for each item; line numbers are those of the text.
class IniVisitor {
public:
    virtual ~IniVisitor() = default;
    virtual void OnSection(int line, const std::string& section) = 0;
    // `section` is empty for a key before the first section.
    virtual void OnKey(int line, const std::string& section, const std::string& key,
                       const std::string& value) = 0;
    // A line that is neither a section, nor a key with a value, nor a comment.
    virtual void OnBadLine(int line, const std::string& reason) = 0;
};

// Walks the whole text.
void ReadIni(std::string_view text, IniVisitor& visitor);

}  // namespace keld_host
