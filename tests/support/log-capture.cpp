#include "support/log-capture.h"

#include <algorithm>
#include <mutex>

#include "utils/log.h"

namespace {

std::mutex g_mutex;
std::vector<std::string> g_lines;

// "[ERR] dir/file.cpp(12): text\n" becomes "[ERR] text".
std::string Stripped(std::string_view line) {
    const size_t tag_end = line.find(' ');
    const size_t place_end = line.find("): ");
    std::string out(line.substr(0, tag_end + 1));
    out += line.substr(place_end + 3);
    if (!out.empty() && out.back() == '\n') out.pop_back();
    return out;
}

void Collect(int /*priority*/, std::string_view line) {
    const std::lock_guard lock(g_mutex);
    g_lines.push_back(Stripped(line));
}

}  // namespace

LogCapture::LogCapture() {
    Clear();
    LogSetSink(Collect);
}

LogCapture::~LogCapture() { LogSetSink(nullptr); }

std::vector<std::string> LogCapture::Lines() const {
    const std::lock_guard lock(g_mutex);
    return g_lines;
}

bool LogCapture::Has(const std::string& line) const { return Count(line) > 0; }

bool LogCapture::Contains(const std::string& part) const {
    const std::lock_guard lock(g_mutex);
    return std::ranges::any_of(
        g_lines, [&](const std::string& line) { return line.find(part) != std::string::npos; });
}

int LogCapture::Count(const std::string& line) const {
    const std::lock_guard lock(g_mutex);
    return static_cast<int>(std::ranges::count(g_lines, line));
}

void LogCapture::Clear() {
    const std::lock_guard lock(g_mutex);
    g_lines.clear();
}
