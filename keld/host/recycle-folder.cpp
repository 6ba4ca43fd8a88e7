#include "host/recycle-folder.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>

#include <algorithm>
#include <cerrno>

#include "host/recycle-name.h"

namespace keld_host {
namespace {

constexpr size_t NAME_BYTES_MAX = 255;
constexpr mode_t MODE_BITS = 07777;
// So many names in a row that are no folders are no accident.
constexpr unsigned FOLDER_TRIES = 1000;
constexpr int FOLDER_FLAGS = O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

size_t LongestName(int dir_fd) {
    struct statvfs info {};
    if (fstatvfs(dir_fd, &info) != 0 || info.f_namemax == 0) return NAME_BYTES_MAX;
    return std::min<size_t>(info.f_namemax, NAME_BYTES_MAX);
}

// Returns 0 or an errno. A file system without owners or modes is no failure.
int MakeFolderLike(int dir_fd, const std::string& name, int like_fd) {
    struct stat like {};
    if (fstat(like_fd, &like) != 0) return errno;
    if (mkdirat(dir_fd, name.c_str(), 0700) != 0) return errno;
    const UniqueFd folder(openat(dir_fd, name.c_str(), O_RDONLY | FOLDER_FLAGS));
    if (!folder.IsValid()) return errno;
    (void)!fchown(folder.Get(), like.st_uid, like.st_gid);
    (void)!fchmod(folder.Get(), like.st_mode & MODE_BITS);
    return 0;
}

}  // namespace

std::string NumberedNameIn(int dir_fd, std::string_view name, unsigned number, bool is_folder) {
    std::string whole = NumberedName(name, number, is_folder);
    struct stat found {};
    if (fstatat(dir_fd, whole.c_str(), &found, AT_SYMLINK_NOFOLLOW) == 0 || errno != ENAMETOOLONG) {
        return whole;
    }
    return NumberedName(name, number, is_folder, LongestName(dir_fd));
}

UniqueFd EnterRecycleFolder(int dir_fd, const std::string& name, int like_fd) {
    std::string candidate = name;
    for (unsigned number = 1; number < FOLDER_TRIES;) {
        UniqueFd folder(openat(dir_fd, candidate.c_str(), O_PATH | FOLDER_FLAGS));
        if (folder.IsValid()) return folder;
        if (errno == ENOENT) {
            const int error = MakeFolderLike(dir_fd, candidate, like_fd);
            if (error == 0 || error == EEXIST) continue;
            errno = error;
            return {};
        }
        if (errno != ENOTDIR && errno != ELOOP) return {};
        candidate = NumberedNameIn(dir_fd, name, number++, true);
    }
    errno = ENOTDIR;
    return {};
}

}  // namespace keld_host
