#include "host/host-conf-edit.h"

#include <algorithm>
#include <vector>

#include "host/host-conf-reader.h"
#include "host/host-conf.h"
#include "host/text.h"

namespace keld_host {
namespace {

constexpr std::string_view SHARE_KIND = "share";

using TextLines = std::vector<std::string>;

// Lines count from 0.
struct ShareSection {
    std::string label;
    size_t headerLine = 0;
    size_t lastLine = 0;  // of the header or a key
    size_t pathLine = 0;
    std::string pathText;  // as it stands in the line
};

class SectionFinder : public IniVisitor {
public:
    void OnSection(int line, const std::string& section) override {
        const size_t blank = section.find_first_of(" \t");
        m_isShare = section.substr(0, blank) == SHARE_KIND;
        if (!m_isShare) return;
        ShareSection found;
        if (blank != std::string::npos) found.label = Trim(section.substr(blank));
        found.headerLine = found.lastLine = LineIndex(line);
        m_sections.push_back(std::move(found));
    }

    void OnKey(int line, const std::string& section, const std::string& key,
               const std::string& value) override {
        static_cast<void>(section);
        if (!m_isShare) return;
        m_sections.back().lastLine = LineIndex(line);
        if (key != "path") return;
        m_sections.back().pathLine = LineIndex(line);
        m_sections.back().pathText = value;
    }

    void OnBadLine(int line, const std::string& reason) override {
        static_cast<void>(line);
        static_cast<void>(reason);
    }

    [[nodiscard]] const std::vector<ShareSection>& Sections() const { return m_sections; }

private:
    static size_t LineIndex(int line) { return static_cast<size_t>(line) - 1; }

    bool m_isShare = false;
    std::vector<ShareSection> m_sections;
};

std::vector<ShareSection> SectionsOf(const std::string& text) {
    SectionFinder finder;
    ReadIni(text, finder);
    return finder.Sections();
}

std::optional<ShareSection> FindSection(const std::string& text, const std::string& path) {
    for (const ShareSection& section : SectionsOf(text)) {
        if (CleanPath(section.pathText) == path) return section;
    }
    return std::nullopt;
}

// Each line with its line end, if it has one.
TextLines SplitLines(std::string_view text) {
    TextLines lines;
    while (!text.empty()) {
        const size_t end = text.find('\n');
        const size_t length = end == std::string_view::npos ? text.size() : end + 1;
        lines.emplace_back(text.substr(0, length));
        text.remove_prefix(length);
    }
    return lines;
}

std::string Join(const TextLines& lines) {
    std::string text;
    for (const std::string& line : lines) text += line;
    return text;
}

bool IsBlank(const std::string& line) { return Trim(line).empty(); }

std::string Header(const std::string& path) {
    return "[" + std::string(SHARE_KIND) + " " + std::string(BaseNameOf(path)) + "]";
}

// What stands around the header in its line, a comment for example, stays.
bool ReplaceHeader(std::string& line, const std::string& path) {
    const size_t begin = line.find('[');
    const size_t end = line.find(']', begin);
    if (begin == std::string::npos || end == std::string::npos) return false;
    line.replace(begin, end - begin + 1, Header(path));
    return true;
}

bool ReplaceValue(std::string& line, const std::string& value, const std::string& newValue) {
    const size_t equals = line.find_first_of("=:");
    if (equals == std::string::npos) return false;
    const size_t begin = line.find_first_not_of(" \t", equals + 1);
    if (begin == std::string::npos || line.compare(begin, value.size(), value) != 0) return false;
    line.replace(begin, value.size(), newValue);
    return true;
}

// One blank line of those around what was taken out before `at` would be one too many.
void CloseGap(TextLines& lines, size_t at) {
    const bool hasBlankBefore = at == 0 || IsBlank(lines[at - 1]);
    if (!hasBlankBefore) return;
    if (at < lines.size() && IsBlank(lines[at])) {
        lines.erase(lines.begin() + static_cast<ptrdiff_t>(at));
    } else if (at == lines.size() && at > 0) {
        lines.pop_back();
    }
}

// The text, if it reads as `before` with `change` made to its shares.
template <typename Change>
std::optional<std::string> IfItReads(const std::string& before, std::string after, Change change) {
    HostConf expected;
    HostConf found;
    HostConfError error;
    if (!ParseHostConf(before, expected, error) || !ParseHostConf(after, found, error)) {
        return std::nullopt;
    }
    change(expected.shares);
    if (found != expected) return std::nullopt;
    return after;
}

// The header is a name for the reader of the file alone, so that the parser does not tell it.
bool IsLabelled(const std::string& text, const std::string& path) {
    const auto section = FindSection(text, path);
    return section && section->label == BaseNameOf(path);
}

}  // namespace

bool HasShareSection(const std::string& text, std::string_view label) {
    const std::vector<ShareSection> sections = SectionsOf(text);
    return std::any_of(sections.begin(), sections.end(),
                       [&](const ShareSection& section) { return section.label == label; });
}

std::optional<std::string> WithShareAdded(const std::string& text, const std::string& path) {
    const std::string end = text.find("\r\n") != std::string::npos ? "\r\n" : "\n";
    std::string added = text;
    if (!added.empty() && added.back() != '\n') added += end;
    if (!added.empty()) added += end;
    added += Header(path) + end + "path = " + path + end;
    if (!IsLabelled(added, path)) return std::nullopt;
    return IfItReads(text, std::move(added),
                     [&](std::vector<ShareConf>& shares) { shares.push_back({.path = path}); });
}

std::optional<std::string> WithShareRemoved(const std::string& text, const std::string& path) {
    const auto section = FindSection(text, path);
    if (!section) return std::nullopt;
    TextLines lines = SplitLines(text);
    lines.erase(lines.begin() + static_cast<ptrdiff_t>(section->headerLine),
                lines.begin() + static_cast<ptrdiff_t>(section->lastLine) + 1);
    CloseGap(lines, section->headerLine);
    return IfItReads(text, Join(lines), [&](std::vector<ShareConf>& shares) {
        std::erase_if(shares, [&](const ShareConf& share) { return share.path == path; });
    });
}

std::optional<std::string> WithShareMoved(const std::string& text, const std::string& path,
                                          const std::string& newPath) {
    const auto section = FindSection(text, path);
    if (!section) return std::nullopt;
    TextLines lines = SplitLines(text);
    if (!ReplaceHeader(lines[section->headerLine], newPath) ||
        !ReplaceValue(lines[section->pathLine], section->pathText, newPath)) {
        return std::nullopt;
    }
    std::string moved = Join(lines);
    if (!IsLabelled(moved, newPath)) return std::nullopt;
    return IfItReads(text, std::move(moved), [&](std::vector<ShareConf>& shares) {
        for (ShareConf& share : shares) {
            if (share.path == path) share.path = newPath;
        }
    });
}

}  // namespace keld_host
