#include "platform/tree-remover.h"

#include <fcntl.h>
#include <keld/ea.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>

#include "platform/sdk-mutex.h"
#include "utils/log.h"

namespace {

constexpr size_t kBufferBytes = 65536;
constexpr int kOpenFlags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
// Some file systems leave entries out of a listing while others are being removed: a folder that is
// not empty afterwards is gone through again, but not for ever, as somebody may be filling it.
constexpr int kMaxSweeps = 100;

bool IsDotName(const char* name) {
    return name[0] == '.' && (name[1] == '\0' || (name[1] == '.' && name[2] == '\0'));
}

void LogRemoveFailure(const std::string& path) {
    SLOG_ERR("Failed to remove file '%s'\n", path.c_str());
}

void LogOpenFailure(const std::string& path) {
    SLOG_ERR("Failed to open dir '%s'\n", path.c_str());
}

}  // namespace

TreeRemover::TreeRemover(int parent_fd, std::string name, std::string path)
    : m_parent_fd(parent_fd),
      m_name(std::move(name)),
      m_path(std::move(path)),
      m_buffer(kBufferBytes) {}

bool TreeRemover::RemoveAttributes(const std::string& path) {
    const SDK::ReentrantLock lock;
    errno = 0;
    if (KELDEARemove(path.c_str(), -1, 0) == 0) return true;
    SLOG_ERR("Failed to remove ea '%s', [%d, %s]\n", path.c_str(), errno, std::strerror(errno));
    return false;
}

bool TreeRemover::Remove() {
    if (!Enter(m_parent_fd, m_name.c_str())) return !m_has_failed;
    while (!m_frames.empty()) {
        Frame& top = m_frames.back();
        m_path.resize(top.path_length);
        if (top.sweeps == 0) Sweep(top);
        if (top.sub_dirs.empty()) {
            if (!Leave()) return false;
            continue;
        }
        const std::string name = std::move(top.sub_dirs.back());
        top.sub_dirs.pop_back();
        m_path.append("/").append(name);
        Enter(top.fd.Get(), name.c_str());
    }
    return !m_has_failed;
}

// Opens the folder at m_path and makes it the one in hand.
bool TreeRemover::Enter(int parent_fd, const char* name) {
    UniqueFd fd(openat(parent_fd, name, kOpenFlags));
    if (!fd.IsValid()) {
        if (errno == ENOENT) return false;  // somebody else has removed it
        LogOpenFailure(m_path);
        NoteFailure();
        return false;
    }
    if (!IsOnSameFileSystem(fd.Get())) {
        SLOG_ERR("Failed to remove '%s', another file system is mounted there\n", m_path.c_str());
        NoteFailure();
        return false;
    }
    m_frames.emplace_back();
    m_frames.back().fd = std::move(fd);
    m_frames.back().path_length = m_path.size();
    CloseFarFolder();
    return true;
}

// The outermost folder is measured by the one above it.
bool TreeRemover::IsOnSameFileSystem(int fd) {
    struct stat st {};
    if (m_frames.empty()) {
        if (fstatat(fd, "..", &st, 0) != 0) return false;
        m_device = st.st_dev;
    }
    return fstat(fd, &st) == 0 && st.st_dev == m_device;
}

// Closes the innermost open folder beyond the number that may be open.
void TreeRemover::CloseFarFolder() {
    if (m_frames.size() <= MAX_OPEN) return;
    Frame& far = m_frames[m_frames.size() - 1 - MAX_OPEN];
    struct stat st {};
    if (!far.fd.IsValid() || fstat(far.fd.Get(), &st) != 0) return;
    far.device = st.st_dev;
    far.inode = st.st_ino;
    far.fd.Reset();
}

// Makes sure that the folder above the one in hand is open. False when that has been moved away.
bool TreeRemover::ReopenParent() {
    Frame& parent = m_frames[m_frames.size() - 2];
    if (parent.fd.IsValid()) return true;
    UniqueFd fd(openat(m_frames.back().fd.Get(), "..", kOpenFlags));
    struct stat st {};
    if (!fd.IsValid() || fstat(fd.Get(), &st) != 0) return false;
    if (st.st_dev != parent.device || st.st_ino != parent.inode) return false;
    parent.fd = std::move(fd);
    return true;
}

// Goes through the folder in hand: removes what is no folder, notes the folders.
void TreeRemover::Sweep(Frame& frame) {
    ++frame.sweeps;
    frame.removed = 0;
    for (;;) {
        const ssize_t size = getdents64(frame.fd.Get(), m_buffer.data(), m_buffer.size());
        if (size == 0 || (size < 0 && errno == ENOENT)) return;
        if (size < 0) {
            LogOpenFailure(m_path);
            NoteFailure();
            return;
        }
        for (ssize_t at = 0; at < size;) {
            // The kernel lays the records out so that each is aligned.
            const void* record = m_buffer.data() + at;
            const auto* entry = static_cast<const dirent64*>(record);
            TakeEntry(frame, entry->d_name, entry->d_type);
            at += entry->d_reclen;
        }
    }
}

void TreeRemover::TakeEntry(Frame& frame, const char* name, unsigned char d_type) {
    if (IsDotName(name)) return;
    bool is_dir = d_type == DT_DIR;
    if (d_type == DT_UNKNOWN) {
        struct stat st {};
        is_dir =
            fstatat(frame.fd.Get(), name, &st, AT_SYMLINK_NOFOLLOW) == 0 && S_ISDIR(st.st_mode);
    }
    if (is_dir) {
        frame.sub_dirs.emplace_back(name);
        ++frame.removed;
    } else {
        RemoveEntry(frame, name);
    }
}

void TreeRemover::RemoveEntry(Frame& frame, const char* name) {
    m_path.append("/").append(name);
    if (unlinkat(frame.fd.Get(), name, 0) != 0 && errno != ENOENT) {
        LogRemoveFailure(m_path);
        NoteFailure();
    } else {
        ++frame.removed;
        if (!RemoveAttributes(m_path)) m_has_failed = true;
    }
    m_path.resize(frame.path_length);
}

std::string TreeRemover::NameOfTop() const {
    if (m_frames.size() == 1) return m_name;
    const size_t parent_length = m_frames[m_frames.size() - 2].path_length;
    return m_path.substr(parent_length + 1, m_frames.back().path_length - parent_length - 1);
}

// Removes the folder in hand, which is empty as far as is known, and goes back to the one above.
// False when there is no way back.
bool TreeRemover::Leave() {
    const bool is_outermost = m_frames.size() == 1;
    if (!is_outermost && !ReopenParent()) {
        LogOpenFailure(m_path.substr(0, m_frames[m_frames.size() - 2].path_length));
        return false;
    }
    Frame& top = m_frames.back();
    bool has_rest = top.has_rest;
    if (!has_rest) {
        const int parent_fd = is_outermost ? m_parent_fd : m_frames[m_frames.size() - 2].fd.Get();
        const bool is_gone =
            unlinkat(parent_fd, NameOfTop().c_str(), AT_REMOVEDIR) == 0 || errno == ENOENT;
        const bool is_filled = !is_gone && (errno == ENOTEMPTY || errno == EEXIST);
        if (is_filled && top.removed > 0 && top.sweeps < kMaxSweeps) {
            if (lseek(top.fd.Get(), 0, SEEK_SET) == 0) {
                Sweep(top);
                return true;
            }
        }
        has_rest = !is_gone;
        if (is_gone && !RemoveAttributes(m_path)) m_has_failed = true;
        if (!is_gone) LogRemoveFailure(m_path);
    }
    m_frames.pop_back();
    if (has_rest) NoteFailure();
    return true;
}

// Something below the folder in hand stays: so it has to stay itself.
void TreeRemover::NoteFailure() {
    m_has_failed = true;
    if (!m_frames.empty()) m_frames.back().has_rest = true;
}
