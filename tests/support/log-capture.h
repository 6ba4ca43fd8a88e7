// Collects every log line of the process while it lives: one at a time. Threads: any may log.
#pragma once

#include <string>
#include <vector>

class LogCapture {
public:
    LogCapture();
    ~LogCapture();
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

    // All lines so far, as "[TAG] text": without file and line, and without the newline at the end.
    [[nodiscard]] std::vector<std::string> Lines() const;
    // True when a line equals `line` ("[ERR] text"), or when one contains `part`.
    [[nodiscard]] bool Has(const std::string& line) const;
    [[nodiscard]] bool Contains(const std::string& part) const;
    [[nodiscard]] int Count(const std::string& line) const;
    void Clear();
};
