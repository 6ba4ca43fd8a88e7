#include "host/text.h"

#include <fcntl.h>
#include <fnmatch.h>
#include <unistd.h>

#include <cstring>

#include "utils/unique-fd.h"

namespace keld_host {

bool FillBuffer(std::string_view text, char* buffer, size_t size) {
    if (buffer == nullptr || size == 0) return false;
    if (text.size() >= size) {
        buffer[0] = '\0';
        return false;
    }
    memcpy(buffer, text.data(), text.size());
    buffer[text.size()] = '\0';
    return true;
}

bool IsSameOrBelow(std::string_view path, std::string_view root) {
    if (root == "/") return !path.empty() && path.front() == '/';
    if (path.substr(0, root.size()) != root) return false;
    return path.size() == root.size() || path[root.size()] == '/';
}

std::string CleanPath(std::string_view path) {
    std::string clean;
    clean.reserve(path.size());
    for (const char c : path) {
        if (c == '/' && !clean.empty() && clean.back() == '/') continue;
        clean += c;
    }
    if (clean.size() > 1 && clean.back() == '/') clean.pop_back();
    return clean;
}

std::string ParentOf(std::string_view path) {
    const size_t slash = path.rfind('/');
    if (slash == std::string_view::npos) return ".";
    return slash == 0 ? "/" : std::string(path.substr(0, slash));
}

std::string_view BaseNameOf(std::string_view path) {
    const size_t slash = path.rfind('/');
    return slash == std::string_view::npos ? path : path.substr(slash + 1);
}

std::string_view Trim(std::string_view text) {
    constexpr std::string_view blanks = " \t\r\n";
    const size_t first = text.find_first_not_of(blanks);
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(blanks) - first + 1);
}

std::vector<std::string> SplitList(std::string_view text) {
    std::vector<std::string> items;
    while (!text.empty()) {
        const size_t comma = text.find(',');
        const std::string_view item = Trim(text.substr(0, comma));
        if (!item.empty()) items.emplace_back(item);
        text = comma == std::string_view::npos ? std::string_view{} : text.substr(comma + 1);
    }
    return items;
}

bool MatchesAny(const std::vector<std::string>& globs, const std::string& text) {
    for (const std::string& glob : globs) {
        if (fnmatch(glob.c_str(), text.c_str(), 0) == 0) return true;
    }
    return false;
}

std::string ReadAttribute(const std::string& path) {
    return ReadAttributeAt(AT_FDCWD, path.c_str());
}

std::string ReadAttributeAt(int folder, const char* name) {
    const UniqueFd fd(openat(folder, name, O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!fd.IsValid()) return {};
    char buffer[4096];
    const ssize_t length = read(fd.Get(), buffer, sizeof(buffer));
    if (length <= 0) return {};
    return std::string(Trim({buffer, static_cast<size_t>(length)}));
}

}  // namespace keld_host
