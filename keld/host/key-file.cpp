// Key files: lines key="value".
#include <keld/keyfile.h>
#include <unistd.h>

#include <cerrno>
#include <optional>
#include <string>
#include <string_view>

#include "host/host-error.h"
#include "host/replace-file.h"
#include "host/text.h"

using keld_host::Fail;
using keld_host::FailErrno;

namespace {

// 16 MiB: a key file is a handful of lines.
constexpr size_t MAX_FILE = size_t{16} << 20;
constexpr unsigned FILE_MODE = 0644;

// The lines of a text, each with its newline; a last line without one is given as it is.
template <typename Visit>
void ForEachLine(std::string_view text, Visit visit) {
    while (!text.empty()) {
        const size_t end = text.find('\n');
        const size_t length = end == std::string_view::npos ? text.size() : end + 1;
        visit(text.substr(0, length));
        text.remove_prefix(length);
    }
}

// The value in a line of `key`; empty when the line is not one of this key. Without quotes the
// value is the rest of the line, as files written by hand have it.
std::optional<std::string_view> ValueIn(std::string_view line, std::string_view key) {
    line = keld_host::Trim(line);
    if (line.substr(0, key.size()) != key) return std::nullopt;
    line = keld_host::Trim(line.substr(key.size()));
    if (line.empty() || line.front() != '=') return std::nullopt;
    line = keld_host::Trim(line.substr(1));
    const bool isQuoted = !line.empty() && line.front() == '"';
    if (!isQuoted) return line;
    const size_t end = line.find('"', 1);
    // A line cut in its middle is no value that could be trusted.
    if (end == std::string_view::npos) return std::nullopt;
    return line.substr(1, end - 1);
}

bool IsGoodKey(std::string_view key) {
    return !key.empty() && key.front() != '#' &&
           key.find_first_of(" \t\r\n\"=") == std::string_view::npos;
}

// Reads the file; a missing one is an empty text. Returns 0, or an errno.
int ReadText(const char* path, std::string& text) {
    const int error = keld_host::ReadFile(path, MAX_FILE, text);
    return error == ENOENT ? 0 : error;
}

std::optional<std::string> FindValue(std::string_view text, std::string_view key) {
    std::optional<std::string> found;
    ForEachLine(text, [&](std::string_view line) {
        const auto value = ValueIn(line, key);
        if (value && !found) found = std::string(*value);
    });
    return found;
}

// Writes key and value in the places of the two "%s" of `format`; empty when it has another form.
std::string Render(std::string_view format, std::string_view key, std::string_view value) {
    const std::string_view values[] = {key, value};
    size_t used = 0;
    std::string line;
    for (size_t i = 0; i < format.size(); ++i) {
        if (format[i] != '%') {
            line += format[i];
            continue;
        }
        const bool isText = i + 1 < format.size() && format[i + 1] == 's';
        if (!isText || used == 2) return {};
        line += values[used++];
        ++i;
    }
    return used == 2 ? line : std::string();
}

// The line to be written; empty when the value could not be read back from it as it is.
std::string LineFor(const char* format, std::string_view key, std::string_view value) {
    const std::string line = Render(format == nullptr ? KELD_KEY_VALUE_FORMAT : format, key, value);
    const bool isOneLine = !line.empty() && line.find('\n') == line.size() - 1;
    if (!isOneLine || value.find_first_of("\"\r") != std::string_view::npos) return {};
    return FindValue(line, key) == value ? line : std::string();
}

// The text with the first line of `key` replaced by `line` (or gone, when that is empty) and the
// others of it gone. `wasThere` tells whether there was one.
std::string Exchange(std::string_view text, std::string_view key, std::string_view line,
                     bool& wasThere) {
    std::string result;
    wasThere = false;
    ForEachLine(text, [&](std::string_view old) {
        if (!ValueIn(old, key)) {
            result += old;
            return;
        }
        if (!wasThere) result += line;
        wasThere = true;
    });
    return result;
}

}  // namespace

int KLIBCFileGetKeyValue(const char* path, const char* key, char* buffer, size_t size, int flags) {
    static_cast<void>(flags);
    if (path == nullptr || key == nullptr || buffer == nullptr || size == 0) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    buffer[0] = '\0';
    std::string text;
    const int error = ReadText(path, text);
    if (error != 0) return FailErrno(error);
    const auto value = FindValue(text, key);
    if (!value) return 0;
    // Half a path would name another folder: it is never cut.
    return keld_host::FillBuffer(*value, buffer, size) ? 1 : Fail(KELDERR_INVALID_ARGUMENT);
}

int KLIBCFileSetKeyValue(const char* path, const char* key, const char* value, const char* format) {
    if (path == nullptr || key == nullptr || value == nullptr || !IsGoodKey(key)) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    const std::string line = LineFor(format, key, value);
    if (line.empty()) return Fail(KELDERR_INVALID_ARGUMENT);
    std::string text;
    int error = ReadText(path, text);
    if (error != 0) return FailErrno(error);
    bool wasThere = false;
    std::string changed = Exchange(text, key, line, wasThere);
    if (!wasThere) {
        if (!changed.empty() && changed.back() != '\n') changed += '\n';
        changed += line;
    }
    error = keld_host::ReplaceFile(path, changed, FILE_MODE);
    return error == 0 ? 0 : FailErrno(error);
}

int KLIBCFileCheckKeyValue(const char* path, const char* key, const char* value) {
    if (path == nullptr || key == nullptr || value == nullptr)
        return Fail(KELDERR_INVALID_ARGUMENT);
    std::string text;
    const int error = ReadText(path, text);
    if (error != 0) return FailErrno(error);
    return FindValue(text, key) == std::string_view(value) ? 1 : 0;
}

int KLIBCFileRemoveKey(const char* path, const char* key) {
    if (path == nullptr || key == nullptr || !IsGoodKey(key)) return Fail(KELDERR_INVALID_ARGUMENT);
    std::string text;
    int error = ReadText(path, text);
    if (error != 0) return FailErrno(error);
    bool wasThere = false;
    const std::string changed = Exchange(text, key, {}, wasThere);
    if (!wasThere) return 0;
    error = keld_host::ReplaceFile(path, changed, FILE_MODE);
    return error == 0 ? 1 : FailErrno(error);
}

int KLIBCFileExist(const char* path) { return path != nullptr && access(path, F_OK) == 0 ? 1 : 0; }
