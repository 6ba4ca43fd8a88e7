#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>

#include "utils/confined-path.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr mode_t kDirMode = 0777;

// Gives a folder that was just made to its owner. By descriptor: under the name may by now stand
// something else, a link or a hard link to a file that is not ours to give.
void GiveDir(int dir_fd, const char* name, uid_t uid, gid_t gid) {
    if (uid == FS_KEEP_UID && gid == FS_KEEP_GID) return;
    const UniqueFd fd(openat(dir_fd, name, O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (fd.IsValid()) (void)!fchownat(fd.Get(), "", uid, gid, AT_EMPTY_PATH);
}

int MakeDir(const std::string& path, uid_t uid, gid_t gid) {
    const PathPlace place(path);
    if (!place.IsReached() || mkdirat(place.DirFd(), place.Name(), kDirMode) != 0) return -1;
    GiveDir(place.DirFd(), place.Name(), uid, gid);
    return 0;
}

bool IsLink(int dir_fd, const char* name) {
    struct stat st {};
    return fstatat(dir_fd, name, &st, AT_SYMLINK_NOFOLLOW) == 0 && S_ISLNK(st.st_mode);
}

// Makes the folders of a path one below the other, each relative to the open one before it.
class DirMaker {
public:
    DirMaker(bool is_confined, uid_t uid, gid_t gid)
        : m_is_confined(is_confined), m_uid(uid), m_gid(gid) {}

    // Opens the folder to begin with. The errno, or 0.
    int Start(const char* path) {
        m_fd.Reset(open(path, O_PATH | O_DIRECTORY | O_CLOEXEC));
        return m_fd.IsValid() ? 0 : errno;
    }

    // Makes `name` in the present folder, unless it is there. The errno, or 0.
    int Make(const std::string& name) {
        if (m_is_confined && name == "..") return EXDEV;
        if (mkdirat(At(), name.c_str(), kDirMode) == 0) {
            GiveDir(At(), name.c_str(), m_uid, m_gid);
            return 0;
        }
        if (errno != EEXIST) return errno;
        return m_is_confined && IsLink(At(), name.c_str()) ? ELOOP : 0;
    }

    int Enter(const std::string& name) {
        const int no_follow = m_is_confined ? O_NOFOLLOW : 0;
        UniqueFd next(openat(At(), name.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC | no_follow));
        if (!next.IsValid()) return errno;
        m_fd = std::move(next);
        return 0;
    }

private:
    [[nodiscard]] int At() const { return m_fd.IsValid() ? m_fd.Get() : AT_FDCWD; }

    bool m_is_confined;
    uid_t m_uid;
    gid_t m_gid;
    UniqueFd m_fd;
};

// Makes the components of `path` from `start` on; `done` is where the failed one ends.
int MakeComponents(DirMaker& maker, const std::string& path, size_t start, size_t& done) {
    for (size_t end = start; start < path.size(); start = end + 1) {
        end = std::min(path.find('/', start), path.size());
        const std::string name = path.substr(start, end - start);
        if (name.empty() || name == ".") continue;
        done = end;
        if (const int error = maker.Make(name); error != 0) return error;
        if (path.find_first_not_of('/', end) == path.npos) return 0;
        if (const int error = maker.Enter(name); error != 0) return error;
    }
    return 0;
}

}  // namespace

int FSMKDir(const std::string& path, bool recursive, uid_t uid, gid_t gid) {
    if (path.empty()) return -1;
    FSInfo info;
    if (FSStatNoFollow(path, info) != 0) {
        SLOG_ERR("FSMKDir: Can not get local file info '%s'\n", path.c_str());
        return -1;
    }
    if (info.exist && info.type == FS_TYPE_DIR) return 0;
    if (info.exist) {
        SLOG_ERR("FSMKDir: Create a folder but local file system is not directory '%d'\n",
                 info.type);
        return -1;
    }
    const int result = recursive ? FSMKDirP(path, uid, gid) : MakeDir(path, uid, gid);
    return result == 0 ? 0 : -2;
}

int FSMKDirP(const std::string& path, uid_t uid, gid_t gid) {
    if (path.empty()) return -1;
    const auto root = ConfinedRootOf(path);
    DirMaker maker(root.has_value(), uid, gid);
    size_t done = 0;
    int error = 0;
    if (root.has_value()) {
        done = root->size();
        error = maker.Start(root->c_str());
    } else if (path.front() == '/') {
        error = maker.Start("/");
    }
    if (error == 0) error = MakeComponents(maker, path, done, done);
    if (error == 0) return 0;
    SLOG_ERR("FSMKDirP: fail to create '%s'. %s\n", path.substr(0, done).c_str(),
             std::strerror(error));
    return -1;
}

int FSOpenDir(const std::string& path, uint32_t flags, FSDir& handle) {
    FSCloseDir(handle);
    UniqueFd fd;
    if (path.empty()) {
        errno = ENOENT;
    } else {
        fd = PathPlace(path).Open(O_RDONLY | O_DIRECTORY);
    }
    UniqueDir stream(fd.IsValid() ? fdopendir(fd.Get()) : nullptr);
    if (stream == nullptr) {
        const int error = errno;
        SLOG_ERR("FSOpenDir: Failed to open directory '%s'. %s\n", path.c_str(),
                 std::strerror(error));
        fd.Reset();
        errno = error;
        return -1;
    }
    (void)fd.Release();  // the stream's now
    handle.path = path;
    handle.flags = flags;
    handle.stream = std::move(stream);
    return 0;
}

namespace {

// Fetches what the directory entry does not hold. 0; -1 with errno.
int CompleteEntry(int dir_fd, bool is_stat_wanted, FSDirEntry& entry) {
    struct stat st {};
    if (fstatat(dir_fd, entry.name.c_str(), &st, AT_SYMLINK_NOFOLLOW) != 0) {
        if (errno != ENOENT) return -1;
        st.st_mtime = time(nullptr);  // gone since the folder was read
    } else if (entry.type == FS_TYPE_UNKNOWN) {
        entry.type = FSTypeFromMode(st.st_mode);
    }
    if (!is_stat_wanted) return 0;
    entry.mtime = static_cast<uint32_t>(st.st_mtime);
    entry.size = static_cast<uint64_t>(st.st_size);
    return 0;
}

}  // namespace

int FSReadDir(FSDir& handle, FSDirEntry& entry) {
    entry.type = FS_TYPE_UNKNOWN;
    entry.mtime = 0;
    entry.size = 0;
    errno = handle.stream == nullptr ? EBADF : 0;
    const dirent* found = handle.stream == nullptr ? nullptr : readdir(handle.stream.get());
    if (found == nullptr) {
        if (errno == 0) return 0;
        SLOG_ERR("FSOpenDir: Failed to read directory '%s'. %s\n", handle.path.c_str(),
                 std::strerror(errno));
        return -1;
    }
    entry.name = found->d_name;
    entry.type = FSTypeFromDirent(found->d_type);
    const bool is_stat_wanted = (handle.flags & FS_DIR_STAT) != 0;
    // A file system that gives no types in its directories must not lose its files for that.
    if (!is_stat_wanted && entry.type != FS_TYPE_UNKNOWN) return 1;
    if (CompleteEntry(dirfd(handle.stream.get()), is_stat_wanted, entry) == 0) return 1;
    SLOG_ERR("FSOpenDir: Failed to get info for '%s/%s'\n", handle.path.c_str(),
             entry.name.c_str());
    return -1;
}

void FSCloseDir(FSDir& handle) {
    handle.stream.reset();
    handle.path.clear();
}
