// Key files on the disk, and capabilities.
#include <keld/keyfile.h>
#include <keld/support.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <fstream>
#include <sstream>

#include "fake/fake-state.h"

namespace {

using Lines = std::vector<std::string>;

// 1 read, 0 no such file, negative on an error.
int ReadLines(const std::string& path, Lines& lines) {
    if (access(path.c_str(), F_OK) != 0) {
        return errno == ENOENT ? 0 : FakeError(FakeErrorOf(errno));
    }
    std::ifstream file(path);
    if (!file) return FakeError(KELDERR_NO_PERMISSION);
    std::string line;
    while (std::getline(file, line)) lines.push_back(line);
    return file.bad() ? FakeError(KELDERR_IO) : 1;
}

int WriteLines(const std::string& path, const Lines& lines) {
    const std::string temporary = path + ".new";
    {
        std::ofstream file(temporary, std::ios::trunc);
        for (const std::string& line : lines) file << line << '\n';
        if (!file.flush()) return FakeError(KELDERR_FILE_OPERATION);
    }
    chmod(temporary.c_str(), 0644);
    if (rename(temporary.c_str(), path.c_str()) != 0) return FakeError(FakeErrorOf(errno));
    return 0;
}

bool HasKey(const std::string& line, const std::string& key) {
    return line.starts_with(key + "=\"") && line.size() > key.size() + 2 && line.back() == '"';
}

// 1 found, 0 missing, negative on an error.
int Find(const std::string& path, const std::string& key, std::string& value) {
    Lines lines;
    const int result = ReadLines(path, lines);
    if (result <= 0) return result;
    for (const std::string& line : lines) {
        if (!HasKey(line, key)) continue;
        const size_t start = key.size() + 2;
        value = line.substr(start, line.size() - start - 1);
        return 1;
    }
    return 0;
}

}  // namespace

extern "C" {

int KLIBCFileGetKeyValue(const char* path, const char* key, char* buffer, size_t size, int) {
    if (size > 0) buffer[0] = '\0';
    if (FakeFails("KLIBCFileGetKeyValue", {FakeText(path), FakeText(key)})) return -1;
    std::string value;
    const int result = Find(FakeText(path), FakeText(key), value);
    if (result <= 0) return result;
    return FakeFill(value, buffer, size) ? 1 : FakeError(KELDERR_INVALID_ARGUMENT);
}

int KLIBCFileSetKeyValue(const char* path, const char* key, const char* value, const char*) {
    if (FakeFails("KLIBCFileSetKeyValue", {FakeText(path), FakeText(key), FakeText(value)})) {
        return -1;
    }
    const std::string text = FakeText(value);
    if (text.find_first_of("\"\n\r") != std::string::npos) {
        return FakeError(KELDERR_INVALID_ARGUMENT);
    }
    Lines lines;
    if (ReadLines(FakeText(path), lines) < 0) return -1;
    const std::string wanted = FakeText(key) + "=\"" + text + "\"";
    for (std::string& line : lines) {
        if (!HasKey(line, FakeText(key))) continue;
        line = wanted;
        return WriteLines(path, lines);
    }
    lines.push_back(wanted);
    return WriteLines(path, lines);
}

int KLIBCFileCheckKeyValue(const char* path, const char* key, const char* value) {
    if (FakeFails("KLIBCFileCheckKeyValue", {FakeText(path), FakeText(key), FakeText(value)})) {
        return -1;
    }
    std::string found;
    const int result = Find(FakeText(path), FakeText(key), found);
    return result <= 0 ? result : (found == value ? 1 : 0);
}

int KLIBCFileRemoveKey(const char* path, const char* key) {
    if (FakeFails("KLIBCFileRemoveKey", {FakeText(path), FakeText(key)})) return -1;
    Lines lines;
    const int result = ReadLines(FakeText(path), lines);
    if (result <= 0) return result;
    const size_t removed =
        std::erase_if(lines, [&](const std::string& line) { return HasKey(line, FakeText(key)); });
    if (removed == 0) return 0;
    return WriteLines(path, lines) < 0 ? -1 : 1;
}

int KLIBCFileExist(const char* path) {
    FakeRecord("KLIBCFileExist", {FakeText(path)});
    return access(FakeText(path).c_str(), F_OK) == 0 ? 1 : 0;
}

int KLIBCSupportGet(const char* key) {
    FakeRecord("KLIBCSupportGet", {FakeText(key)});
    const LockedState state;
    const auto found = state->capabilities.find(FakeText(key));
    return found != state->capabilities.end() && found->second ? 1 : 0;
}

}  // extern "C"
