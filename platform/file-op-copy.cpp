#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "utils/confined-path.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr size_t kBufferBytes = 33554432;
constexpr mode_t kPermissionBits = 0777;  // no set-uid, set-gid or sticky bit goes along

using Buffer = std::unique_ptr<char, FreeWith<std::free>>;

// Always -1.
int LogOpenFailure(const std::string& path) {
    SLOG_ERR("CopyFile: open(%s): %s (%d)\n", path.c_str(), std::strerror(errno), errno);
    return -1;
}

// -2 for a full disk, else -1.
int LogWriteFailure() {
    const int error = errno;
    SLOG_ERR("CopyFile: write: %s (%d)\n", std::strerror(error), error);
    return error == ENOSPC ? -2 : -1;
}

int WriteAll(int fd, const char* data, size_t size) {
    while (size > 0) {
        const ssize_t done = write(fd, data, size);
        if (done < 0 && errno == EINTR) continue;
        if (done < 0) return LogWriteFailure();
        data += done;
        size -= static_cast<size_t>(done);
    }
    return 0;
}

int CopyBytes(int from, int to, char* buffer) {
    for (;;) {
        const ssize_t got = read(from, buffer, kBufferBytes);
        if (got < 0 && errno == EINTR) continue;
        if (got < 0) {
            SLOG_ERR("CopyFile: read: %s (%d)\n", std::strerror(errno), errno);
            return -1;
        }
        if (got == 0) return 0;
        const int result = WriteAll(to, buffer, static_cast<size_t>(got));
        if (result != 0) return result;
    }
}

// Opens the destination empty; -1 with errno. Not O_TRUNC: the two paths may lead to one file,
// which would be lost.
UniqueFd OpenTarget(const std::string& path, const struct stat& source) {
    const mode_t mode = source.st_mode & kPermissionBits;
    UniqueFd fd = PathPlace(path).Open(O_WRONLY | O_CREAT | O_NONBLOCK | O_NOCTTY, mode);
    struct stat st {};
    if (!fd.IsValid() || fstat(fd.Get(), &st) != 0) return {};
    if (st.st_dev == source.st_dev && st.st_ino == source.st_ino) {
        errno = EINVAL;
        return {};
    }
    if (!S_ISREG(st.st_mode)) return fd;
    if (ftruncate(fd.Get(), 0) != 0) return {};
    (void)fchmod(fd.Get(), mode);
    return fd;
}

// Flushes and closes in every case; what is not on the disk is not copied.
int Finish(UniqueFd& fd, int result) {
    const bool is_flushed = fsync(fd.Get()) == 0;
    if (!is_flushed && result == 0) result = LogWriteFailure();
    if (fd.Close() != 0 && result == 0) result = LogWriteFailure();
    return result;
}

int RemoveSource(const std::string& path) {
    const PathPlace place(path);
    if (!place.IsReached()) return -1;
    return unlinkat(place.DirFd(), place.Name(), 0) == 0 ? 0 : -1;
}

}  // namespace

int CopyFile(const std::string& from, const std::string& to, bool remove_source) {
    if (from.empty() || to.empty()) return -1;
    const UniqueFd source = PathPlace(from).Open(O_RDONLY | O_NONBLOCK | O_NOCTTY);
    struct stat st {};
    if (!source.IsValid() || fstat(source.Get(), &st) != 0) return LogOpenFailure(from);
    if (!S_ISREG(st.st_mode)) {
        // Put in the file's place meanwhile: the destination stays as it is.
        errno = S_ISDIR(st.st_mode) ? EISDIR : EINVAL;
        SLOG_ERR("CopyFile: read: %s (%d)\n", std::strerror(errno), errno);
        return -1;
    }
    const Buffer buffer(static_cast<char*>(std::malloc(kBufferBytes)));
    if (buffer == nullptr) {
        SLOG_ERR("FSCopy: malloc(%d): %s (%d)\n", static_cast<int>(kBufferBytes),
                 std::strerror(errno), errno);
        return -1;
    }
    UniqueFd target = OpenTarget(to, st);
    if (!target.IsValid()) return LogOpenFailure(to);
    const int result = Finish(target, CopyBytes(source.Get(), target.Get(), buffer.get()));
    return result == 0 && remove_source ? RemoveSource(from) : result;
}
