#include "utils/confined-path.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <pthread.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <climits>
#include <map>
#include <optional>

#include "utils/mutex-lock.h"

namespace {

pthread_mutex_t g_roots_mutex = PTHREAD_MUTEX_INITIALIZER;

// Root path and how many objects stand for it. Never destroyed: worker threads may outlive statics.
std::map<std::string, int, std::less<>>& Roots() {
    static auto* roots = new std::map<std::string, int, std::less<>>;
    return *roots;
}

// Before Linux 5.6: one component at a time.
UniqueFd OpenStepwise(int dir_fd, std::string_view relative, int flags, mode_t mode) {
    UniqueFd current;
    int at = dir_fd;
    while (true) {
        const size_t start = relative.find_first_not_of('/');
        relative = start == std::string_view::npos ? std::string_view(".") : relative.substr(start);
        const size_t end = relative.find('/');
        const std::string component(relative.substr(0, end));
        if (component == "..") {
            errno = EXDEV;
            return {};
        }
        const bool is_last =
            end == std::string_view::npos || relative.find_first_not_of('/', end) == relative.npos;
        const int step_flags = is_last ? flags : O_PATH | O_DIRECTORY;
        UniqueFd next(openat(at, component.c_str(), step_flags | O_NOFOLLOW | O_CLOEXEC, mode));
        // A link in the middle answers ENOTDIR to O_DIRECTORY: tell it apart from a plain file.
        if (!next.IsValid() && errno == ENOTDIR) {
            char target = 0;
            if (readlinkat(at, component.c_str(), &target, 1) >= 0)
                errno = ELOOP;
            else
                errno = ENOTDIR;
        }
        if (!next.IsValid() || is_last) return next;
        current = std::move(next);
        at = current.Get();
        relative.remove_prefix(end);
    }
}

std::atomic<bool> g_has_openat2{true};

UniqueFd OpenPiece(int dir_fd, std::string_view relative, int flags, mode_t mode) {
    if (!g_has_openat2.load(std::memory_order_relaxed)) {
        return OpenStepwise(dir_fd, relative, flags, mode);
    }
    const std::string name(relative);
    open_how how{};
    how.flags = static_cast<unsigned>(flags | O_CLOEXEC);
    how.mode = (flags & (O_CREAT | __O_TMPFILE)) != 0 ? mode : 0;
    how.resolve = RESOLVE_NO_SYMLINKS | RESOLVE_BENEATH;
    for (;;) {
        const long fd = syscall(SYS_openat2, dir_fd, name.c_str(), &how, sizeof(how));
        if (fd >= 0) return UniqueFd(static_cast<int>(fd));
        if (errno == EAGAIN || errno == EINTR) continue;  // a rename elsewhere disturbed the walk
        if (errno != ENOSYS && errno != EPERM) return {};
        // EPERM also comes from sandboxes that know no openat2; a real one comes back stepwise too.
        if (errno == ENOSYS) g_has_openat2 = false;
        return OpenStepwise(dir_fd, relative, flags, mode);
    }
}

}  // namespace

UniqueFd OpenBeneath(int dir_fd, std::string_view relative, int flags, mode_t mode) {
    UniqueFd current;
    while (relative.size() >= PATH_MAX) {
        const size_t cut = relative.rfind('/', PATH_MAX - 1);
        if (cut == std::string_view::npos || cut == 0) {
            errno = ENAMETOOLONG;
            return {};
        }
        current = OpenPiece(current.IsValid() ? current.Get() : dir_fd, relative.substr(0, cut),
                            O_PATH | O_DIRECTORY, 0);
        if (!current.IsValid()) return {};
        relative.remove_prefix(cut);
        relative.remove_prefix(std::min(relative.find_first_not_of('/'), relative.size()));
    }
    if (relative.empty()) relative = ".";
    return OpenPiece(current.IsValid() ? current.Get() : dir_fd, relative, flags, mode);
}

// There are a handful of roots, two for each loaded task, and long paths: so the roots are gone
// through, not the folders of the path.
std::optional<std::string> ConfinedRootOf(std::string_view path) {
    const MutexLock lock(g_roots_mutex);
    std::string_view longest;
    for (const auto& [root, count] : Roots()) {
        const bool is_below = path.size() > root.size() && path[root.size()] == '/' &&
                              path.substr(0, root.size()) == root;
        if (is_below && root.size() > longest.size()) longest = root;
    }
    return longest.empty() ? std::nullopt : std::optional<std::string>(longest);
}

void ConfinedPathUseOpenat2(bool is_used) { g_has_openat2 = is_used; }

ConfinedRoot::ConfinedRoot(std::string path) : m_path(std::move(path)) {
    const MutexLock lock(g_roots_mutex);
    ++Roots()[m_path];
}

ConfinedRoot::~ConfinedRoot() {
    const MutexLock lock(g_roots_mutex);
    const auto found = Roots().find(m_path);
    if (--found->second == 0) Roots().erase(found);
}

PathPlace::PathPlace(const std::string& path) : m_base(AT_FDCWD), m_name(path) {
    if (const auto root = ConfinedRootOf(path)) {
        Reach(*root, path);
    } else if (path.size() >= PATH_MAX) {
        ReachLong(path);
    }
}

PathPlace::PathPlace(const std::string& root, const std::string& path)
    : m_base(AT_FDCWD), m_name(path) {
    if (path.size() > root.size()) Reach(root, path);
}

void PathPlace::Reach(std::string_view root, const std::string& path) {
    std::string_view relative = std::string_view(path).substr(root.size());
    while (!relative.empty() && relative.front() == '/') relative.remove_prefix(1);
    while (!relative.empty() && relative.back() == '/') relative.remove_suffix(1);
    if (relative.empty()) return;
    m_is_confined = true;
    const size_t slash = relative.rfind('/');
    const auto folder = slash == relative.npos ? std::string_view() : relative.substr(0, slash);
    m_name = relative.substr(slash == relative.npos ? 0 : slash + 1);
    if (m_name == "..") {
        m_error = EXDEV;
        return;
    }
    // Not kept open between calls: an open folder would hold a device that is to be unmounted.
    UniqueFd base(open(std::string(root).c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (base.IsValid() && folder.empty()) {
        m_dir = std::move(base);
    } else if (base.IsValid()) {
        m_dir = OpenBeneath(base.Get(), folder, O_PATH | O_DIRECTORY);
    }
    if (!m_dir.IsValid()) m_error = errno;
}

// A path that no single call takes: its folders are opened in pieces, links followed as usual.
void PathPlace::ReachLong(const std::string& path) {
    std::string_view rest = path;
    while (rest.size() > 1 && rest.back() == '/') rest.remove_suffix(1);
    while (rest.find('/') != rest.npos) {
        const size_t cut = rest.rfind('/', PATH_MAX - 2);
        if (cut == rest.npos) {
            m_error = ENAMETOOLONG;
            return;
        }
        const std::string piece(rest.substr(0, cut + 1));
        UniqueFd next(openat(DirFd(), piece.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
        if (!next.IsValid()) {
            m_error = errno;
            return;
        }
        m_dir = std::move(next);
        rest.remove_prefix(std::min(rest.find_first_not_of('/', cut), rest.size()));
    }
    m_name = rest;
}

UniqueFd PathPlace::Open(int flags, mode_t mode) const {
    if (!IsReached()) {
        errno = m_error;
        return {};
    }
    const int no_follow = m_is_confined ? O_NOFOLLOW : 0;
    return UniqueFd(openat(DirFd(), Name(), flags | no_follow | O_CLOEXEC, mode));
}

int PathPlace::FollowFlag() const { return m_is_confined ? AT_SYMLINK_NOFOLLOW : 0; }
