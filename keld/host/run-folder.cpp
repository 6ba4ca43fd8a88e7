// Running the programs of a hook folder.
#include <dirent.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "host/run-program.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

// Whether others than root and ourselves may write there.
bool IsOpenToOthers(const struct stat& info) {
    const bool is_other_group = info.st_gid != 0 && info.st_gid != getegid();
    return (info.st_mode & S_IWOTH) != 0 || ((info.st_mode & S_IWGRP) != 0 && is_other_group) ||
           (info.st_uid != 0 && info.st_uid != geteuid());
}

// The executable regular files of a folder, by name.
std::vector<std::string> ExecutablesIn(DIR* dir) {
    std::vector<std::string> names;
    while (const dirent* entry = readdir(dir)) {
        struct stat info {};
        if (fstatat(dirfd(dir), entry->d_name, &info, 0) != 0 || !S_ISREG(info.st_mode) ||
            (info.st_mode & 0111) == 0) {
            continue;
        }
        if (IsOpenToOthers(info)) {
            SLOG_WARN("'%s' is not run: others can write to it\n", entry->d_name);
            continue;
        }
        names.emplace_back(entry->d_name);
    }
    std::sort(names.begin(), names.end());
    return names;
}

bool RunOne(const Program& program, int limitMs) {
    const int result = RunProgram(program, limitMs);
    if (result == 0) return true;
    if (result > 0) {
        SLOG_WARN("'%s' ended with %d\n", program.path.c_str(), result);
    } else {
        SLOG_WARN("'%s' failed: %s\n", program.path.c_str(), strerror(errno));
    }
    return false;
}

}  // namespace

int RunFolder(const std::string& folder, Program program, int limitMs) {
    if (folder.empty()) return 0;
    const UniqueDir dir(opendir(folder.c_str()));
    if (!dir) {
        if (errno == ENOENT) return 0;
        SLOG_WARN("cannot read '%s': %s\n", folder.c_str(), strerror(errno));
        return 1;
    }
    struct stat info {};
    if (fstat(dirfd(dir.get()), &info) != 0 || IsOpenToOthers(info)) {
        SLOG_WARN("programs of '%s' are not run: others can write there\n", folder.c_str());
        return 1;
    }
    int failures = 0;
    for (const std::string& name : ExecutablesIn(dir.get())) {
        program.path = folder + "/" + name;
        if (!RunOne(program, limitMs)) ++failures;
    }
    return failures;
}

}  // namespace keld_host
