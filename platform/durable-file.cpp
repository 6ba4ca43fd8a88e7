#include "platform/durable-file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

#include "utils/path-util.h"
#include "utils/unique-fd.h"

namespace {

bool IsWritten(const std::string& path, std::string_view content, mode_t mode) {
    UniqueFd file(open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, mode));
    if (!file.IsValid() || fchmod(file.Get(), mode) != 0) return false;
    while (!content.empty()) {
        const ssize_t length = write(file.Get(), content.data(), content.size());
        if (length < 0 && errno == EINTR) continue;
        if (length < 0) return false;
        content.remove_prefix(static_cast<size_t>(length));
    }
    return fsync(file.Get()) == 0 && file.Close() == 0;
}

bool IsReplaceable(const std::string& path) {
    struct stat there {};
    if (lstat(path.c_str(), &there) != 0) return errno == ENOENT;
    if (S_ISREG(there.st_mode) || S_ISLNK(there.st_mode)) return true;
    errno = S_ISDIR(there.st_mode) ? EISDIR : EINVAL;
    return false;
}

bool IsFolderSynced(const std::string& folder) {
    const UniqueFd dir(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    return dir.IsValid() && fsync(dir.Get()) == 0;
}

}  // namespace

int ReadDurableFile(const std::string& path, std::string& content) {
    const UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW));
    if (!file.IsValid()) return errno == ENOENT ? 0 : -1;
    content.clear();
    char buffer[4096];
    for (;;) {
        const ssize_t length = read(file.Get(), buffer, sizeof(buffer));
        if (length < 0) return -1;
        if (length == 0) return 1;
        content.append(buffer, static_cast<size_t>(length));
    }
}

int WriteDurableFile(const std::string& path, std::string_view content, mode_t mode) {
    if (!IsReplaceable(path)) return -1;
    const std::string fresh = path + ".new";
    if (!IsWritten(fresh, content, mode) || rename(fresh.c_str(), path.c_str()) != 0) {
        const int error = errno;
        unlink(fresh.c_str());  // on a full disk, of all places
        errno = error;
        return -1;
    }
    return IsFolderSynced(PathDirName(path)) ? 0 : -1;
}

int RemoveDurableFile(const std::string& path) {
    const bool is_removed = unlink(path.c_str()) == 0 || errno == ENOENT;
    return is_removed && IsFolderSynced(PathDirName(path)) ? 0 : -1;
}
