#include "db/side-files.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "utils/log.h"

namespace {

constexpr const char* SIDE_FILES[] = {"-wal", "-shm", "-journal"};

int RemoveFile(const std::string& path) {
    if (unlink(path.c_str()) == 0 || errno == ENOENT) return 0;
    SLOG_ERR("'%s' cannot be removed: %s (%d)\n", path.c_str(), std::strerror(errno), errno);
    return -1;
}

}  // namespace

bool IsMissing(const std::string& path) {
    struct stat info = {};
    return lstat(path.c_str(), &info) != 0 && errno == ENOENT;
}

bool IsSingleFile(const std::string& path) {
    for (const char* side_file : SIDE_FILES) {
        if (!IsMissing(path + side_file)) return false;
    }
    return true;
}

bool HasJournal(const std::string& path) { return !IsMissing(path + "-journal"); }

int RemoveSideFiles(const std::string& path) {
    if (path.empty()) return -1;
    int result = 0;
    for (const char* side_file : SIDE_FILES) {
        if (RemoveFile(path + side_file) < 0) result = -1;
    }
    return result;
}

int RemoveDatabase(const std::string& path) {
    const int result = RemoveSideFiles(path);
    return !path.empty() && RemoveFile(path) == 0 ? result : -1;
}
