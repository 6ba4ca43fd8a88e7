#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <ctime>

#include "utils/confined-path.h"
#include "utils/file-op.h"
#include "utils/log.h"

FSType FSTypeFromMode(mode_t mode) {
    switch (mode & S_IFMT) {
        case S_IFREG:
            return FS_TYPE_FILE;
        case S_IFDIR:
            return FS_TYPE_DIR;
        case S_IFLNK:
            return FS_TYPE_LINK;
        case S_IFCHR:
        case S_IFBLK:
            return FS_TYPE_DEVICE;
        case S_IFIFO:
            return FS_TYPE_FIFO;
        case S_IFSOCK:
            return FS_TYPE_SOCKET;
        default:
            return FS_TYPE_UNKNOWN;
    }
}

FSType FSTypeFromDirent(unsigned char d_type) {
    return d_type == DT_UNKNOWN ? FS_TYPE_UNKNOWN : FSTypeFromMode(DTTOIF(d_type));
}

namespace {

std::string LastComponent(std::string_view path) {
    while (path.size() > 1 && path.back() == '/') path.remove_suffix(1);
    return PathBaseName(path);
}

// The errno of an lstat.
int StatErrno(const std::string& path, struct stat& st) {
    const PathPlace place(path);
    if (!place.IsReached()) return place.Error();
    return fstatat(place.DirFd(), place.Name(), &st, AT_SYMLINK_NOFOLLOW) == 0 ? 0 : errno;
}

}  // namespace

int FSStatNoFollow(const std::string& path, FSInfo& info) {
    info = FSInfo();
    info.path = path;
    info.name = LastComponent(path);
    struct stat st {};
    const int error = path.empty() ? EINVAL : StatErrno(path, st);
    if (error == ENOENT || error == ENOTDIR) {
        info.type = FS_TYPE_FILE;
        info.full_mtime = time(nullptr);
        info.mtime = static_cast<uint32_t>(info.full_mtime);
        return 0;
    }
    if (error != 0) {
        errno = error;
        return -1;
    }
    info.type = FSTypeFromMode(st.st_mode);
    if (info.type == FS_TYPE_UNKNOWN) return -1;
    info.full_mtime = st.st_mtime;
    info.mtime = static_cast<uint32_t>(st.st_mtime);
    info.size = static_cast<uint64_t>(st.st_size);
    info.exist = true;
    info.uid = st.st_uid;
    info.gid = st.st_gid;
    return 0;
}

int FSStat(const std::string& path, FSInfo& info) {
    if (path.empty()) return -1;
    return FSStatNoFollow(path, info) == 0 ? 0 : -2;
}

bool FSExists(const std::string& path) {
    if (path.empty()) return false;
    const PathPlace place(path);
    if (!place.IsReached()) return false;
    return faccessat(place.DirFd(), place.Name(), F_OK, place.FollowFlag()) == 0;
}

int FSUtime(const std::string& path, int64_t atime, int64_t mtime) {
    if (path.empty()) return -1;
    const PathPlace place(path);
    if (!place.IsReached()) {
        errno = place.Error();
        return -1;
    }
    const timespec times[2] = {
        {static_cast<time_t>(atime), 0},
        {static_cast<time_t>(mtime), 0}
    };
    return utimensat(place.DirFd(), place.Name(), times, place.FollowFlag()) == 0 ? 0 : -1;
}

int FSSyncFileSystem(const std::string& path) {
    if (path.empty()) return -1;
    const UniqueFd fd = PathPlace(path).Open(O_RDONLY | O_NONBLOCK);
    if (fd.IsValid() && syncfs(fd.Get()) == 0) return 0;
    SLOG_ERR("FSSyncFileSystem: Failed to flush '%s'. %s\n", path.c_str(), std::strerror(errno));
    return -1;
}
