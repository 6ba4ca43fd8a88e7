#include "utils/file-proof.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "utils/confined-path.h"
#include "utils/log.h"
#include "utils/path-util.h"
#include "utils/unique-fd.h"

namespace {

constexpr size_t kBufferBytes = 1 << 20;
constexpr size_t kAlignment = 4096;  // what reading past the page cache asks of a buffer

using Buffer = std::unique_ptr<char, FreeWith<std::free>>;

int LogFlushFailure(const std::string& path) {
    SLOG_ERR("Failed to flush '%s'. %s", path.c_str(), std::strerror(errno));
    return -1;
}

int FlushFolder(const std::string& path) {
    const UniqueFd dir = PathPlace(path).Open(O_RDONLY | O_DIRECTORY);
    if (!dir.IsValid()) return LogFlushFailure(path);
    if (fsync(dir.Get()) == 0) return 0;
    // Some file systems flush no single folder.
    if (errno == EINVAL && syncfs(dir.Get()) == 0) return 0;
    return LogFlushFailure(path);
}

// A file that is read at any place. Copies are read past the page cache where that works.
class Reader {
public:
    explicit Reader(const std::string& path) : m_path(path), m_file(OpenPlain()) {
        struct stat info {};
        if (!m_file.IsValid() || fstat(m_file.Get(), &info) != 0) return;
        if (!S_ISREG(info.st_mode)) {
            errno = EINVAL;
            return;
        }
        m_is_open = true;
    }

    [[nodiscard]] bool IsOpen() const { return m_is_open; }

    // What has been flushed leaves the cache; what is read then comes from the medium.
    void LeaveCache() {
        static_cast<void>(posix_fadvise(m_file.Get(), 0, 0, POSIX_FADV_DONTNEED));
        m_direct = PathPlace(m_path).Open(O_RDONLY | O_NONBLOCK | O_NOCTTY | O_DIRECT);
    }

    // Fills `size` bytes (the buffer holds kBufferBytes), fewer only at the end of the file. The
    // number, or -1.
    ssize_t Read(char* buffer, size_t size, off_t offset) {
        size_t done = 0;
        if (m_direct.IsValid() && offset % static_cast<off_t>(kAlignment) == 0) {
            const ssize_t got = pread(m_direct.Get(), buffer, kBufferBytes, offset);
            if (got < 0 && errno != EINVAL && errno != EINTR) return -1;
            if (got < 0 && errno == EINVAL) m_direct.Reset();  // promised at open, but not kept
            if (got > 0) done = std::min(static_cast<size_t>(got), size);
        }
        while (done < size) {
            const ssize_t got =
                pread(m_file.Get(), buffer + done, size - done, offset + static_cast<off_t>(done));
            if (got < 0 && errno == EINTR) continue;
            if (got < 0) return -1;
            if (got == 0) break;
            done += static_cast<size_t>(got);
        }
        return static_cast<ssize_t>(done);
    }

private:
    [[nodiscard]] UniqueFd OpenPlain() const {
        return PathPlace(m_path).Open(O_RDONLY | O_NONBLOCK | O_NOCTTY);
    }

    const std::string& m_path;
    UniqueFd m_file;
    UniqueFd m_direct;
    bool m_is_open = false;
};

FSCompareResult LogReadFailure(const std::string& path, FSCompareResult result) {
    SLOG_ERR("Failed to read '%s' for comparison. %s", path.c_str(), std::strerror(errno));
    return result;
}

Buffer MakeBuffer() { return Buffer(static_cast<char*>(aligned_alloc(kAlignment, kBufferBytes))); }

}  // namespace

int FSFlushFile(const std::string& path, const std::string& root) {
    const UniqueFd file = PathPlace(path).Open(O_RDONLY | O_NONBLOCK | O_NOCTTY);
    if (!file.IsValid() || fsync(file.Get()) != 0) return LogFlushFailure(path);
    std::string folder = PathDirName(path);
    for (;;) {
        if (FlushFolder(folder) < 0) return -1;
        // Each folder may have been made a moment ago, and stands in the one above.
        if (folder.size() <= root.size()) return 0;
        folder = PathDirName(folder);
    }
}

FSCompareResult FSCompareOnMedium(const std::string& source, const std::string& copy,
                                  const std::atomic<int>* abort_flag) {
    Reader from(source);
    if (!from.IsOpen()) return LogReadFailure(source, FS_COMPARE_SOURCE_FAILED);
    Reader to(copy);
    if (!to.IsOpen()) return LogReadFailure(copy, FS_COMPARE_COPY_FAILED);
    to.LeaveCache();
    const Buffer from_bytes = MakeBuffer();
    const Buffer to_bytes = MakeBuffer();
    if (!from_bytes || !to_bytes) return LogReadFailure(copy, FS_COMPARE_COPY_FAILED);
    for (off_t offset = 0;; offset += static_cast<off_t>(kBufferBytes)) {
        if (abort_flag != nullptr && abort_flag->load() != 0) return FS_COMPARE_ABORTED;
        const ssize_t left = from.Read(from_bytes.get(), kBufferBytes, offset);
        if (left < 0) return LogReadFailure(source, FS_COMPARE_SOURCE_FAILED);
        const ssize_t right = to.Read(to_bytes.get(), kBufferBytes, offset);
        if (right < 0) return LogReadFailure(copy, FS_COMPARE_COPY_FAILED);
        if (left != right ||
            std::memcmp(from_bytes.get(), to_bytes.get(), static_cast<size_t>(left)) != 0) {
            SLOG_ERR("File '%s' differs from '%s' on the disk", copy.c_str(), source.c_str());
            return FS_COMPARE_DIFFERENT;
        }
        if (static_cast<size_t>(left) < kBufferBytes) return FS_COMPARE_EQUAL;
    }
}

int FileIdentity::Take(const std::string& path) {
    m_file = PathPlace(path).Open(O_PATH | O_NOFOLLOW);
    if (m_file.IsValid() && fstat(m_file.Get(), &m_state) == 0) return 0;
    SLOG_ERR("Failed to look at '%s'. %s", path.c_str(), std::strerror(errno));
    m_file.Reset();
    return -1;
}

bool FileIdentity::IsAt(const std::string& path) const {
    const PathPlace place(path);
    struct stat now {};
    if (!m_file.IsValid() || !place.IsReached() ||
        fstatat(place.DirFd(), place.Name(), &now, AT_SYMLINK_NOFOLLOW) != 0) {
        return false;
    }
    const auto is_same_time = [](const timespec& left, const timespec& right) {
        return left.tv_sec == right.tv_sec && left.tv_nsec == right.tv_nsec;
    };
    return now.st_dev == m_state.st_dev && now.st_ino == m_state.st_ino &&
           now.st_mode == m_state.st_mode && now.st_size == m_state.st_size &&
           is_same_time(now.st_mtim, m_state.st_mtim) && is_same_time(now.st_ctim, m_state.st_ctim);
}
