#include "utils/confined-path.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <pthread.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <ctime>
#include <map>
#include <optional>
#include <vector>

#include "utils/mutex-lock.h"

namespace {

pthread_mutex_t g_roots_mutex = PTHREAD_MUTEX_INITIALIZER;

// Root path and how many objects stand for it. Never destroyed: worker threads may outlive statics.
std::map<std::string, int, std::less<>>& Roots() {
    static auto* roots = new std::map<std::string, int, std::less<>>;
    return *roots;
}

// Opens a folder on the way. Not with O_DIRECTORY: that says ENOTDIR for a link and a file alike,
// and a second look to tell them apart may find something else already.
UniqueFd OpenStep(int dir_fd, const char* name) {
    UniqueFd fd(openat(dir_fd, name, O_PATH | O_NOFOLLOW | O_CLOEXEC));
    struct stat st {};
    if (!fd.IsValid() || fstat(fd.Get(), &st) != 0) return {};
    if (S_ISDIR(st.st_mode)) return fd;
    errno = S_ISLNK(st.st_mode) ? ELOOP : ENOTDIR;
    return {};
}

UniqueFd OpenLast(int dir_fd, const char* name, int flags, mode_t mode) {
    UniqueFd fd(openat(dir_fd, name, flags | O_NOFOLLOW | O_CLOEXEC, mode));
    if (fd.IsValid() || errno != ENOTDIR) return fd;
    char target = 0;
    errno = readlinkat(dir_fd, name, &target, 1) >= 0 ? ELOOP : ENOTDIR;
    return {};
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
        if (is_last) return OpenLast(at, component.c_str(), flags, mode);
        UniqueFd next = OpenStep(at, component.c_str());
        if (!next.IsValid()) return next;
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

// The folders that the scopes of a thread keep open.
class KeptFolders {
public:
    static bool IsOn() { return s_depth > 0; }
    static void Enter() {
        if (s_depth++ > 0) return;
        s_is_kept_for_next = false;
        if (s_folders.size() > kMostToStartWith || NowMs() - s_opened >= PLACE_KEEP_MS) Close();
    }
    static void Leave() {
        if (--s_depth == 0 && !s_is_kept_for_next) Close();
    }
    static void KeepForNext() { s_is_kept_for_next = true; }
    static void Close() { s_folders.clear(); }
    static int Find(std::string_view root, std::string_view folder) {
        for (const Folder& kept : s_folders) {
            if (kept.root_size == root.size() && kept.path == folder) return kept.fd.Get();
        }
        return -1;
    }
    // Takes `fd` over when there is room; returns what is to stand as base of the place. Nothing is
    // thrown out for a new one: a place may still use it.
    static int Keep(std::string_view root, std::string_view folder, UniqueFd& fd) {
        if (s_folders.size() >= kMost) return AT_FDCWD;
        if (s_folders.empty()) s_opened = NowMs();
        const int number = fd.Get();
        s_folders.push_back({root.size(), std::string(folder), std::move(fd)});
        return number;
    }

private:
    struct Folder {
        size_t root_size;  // the same folder below another root is another way there
        std::string path;
        UniqueFd fd;
    };
    static constexpr size_t kMost = 8;  // source, destination, and the folders above them
    static constexpr size_t kMostToStartWith = 5;  // leaves room for those of another folder

    static int64_t NowMs() {
        timespec now{};
        clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
        return static_cast<int64_t>(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
    }

    static thread_local int s_depth;
    static thread_local bool s_is_kept_for_next;
    static thread_local int64_t s_opened;  // the first of them
    static thread_local std::vector<Folder> s_folders;
};

thread_local int KeptFolders::s_depth = 0;
thread_local bool KeptFolders::s_is_kept_for_next = false;
thread_local int64_t KeptFolders::s_opened = 0;
thread_local std::vector<KeptFolders::Folder> KeptFolders::s_folders;

// The open folder of a root, or -1 with errno. `owner` closes it unless the thread's scope does.
int OpenRoot(std::string_view root, std::string_view kept_as, UniqueFd& owner) {
    if (const int kept = KeptFolders::Find(root, kept_as); kept >= 0) return kept;
    owner.Reset(open(std::string(root).c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    const int fd = owner.Get();
    if (owner.IsValid() && KeptFolders::IsOn()) KeptFolders::Keep(root, kept_as, owner);
    return fd;
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
    const auto folder_path = std::string_view(path).substr(0, root.size() + folder.size() + 1);
    if (const int kept = KeptFolders::Find(root, folder_path); kept >= 0) {
        m_base = kept;
        return;
    }
    UniqueFd root_dir;
    const int base = OpenRoot(root, std::string_view(path).substr(0, root.size() + 1), root_dir);
    if (base < 0) {
        m_error = errno;
    } else if (folder.empty()) {
        m_dir = std::move(root_dir);
        m_base = base;
    } else {
        m_dir = OpenBeneath(base, folder, O_PATH | O_DIRECTORY);
        if (!m_dir.IsValid()) {
            m_error = errno;
        } else if (KeptFolders::IsOn()) {
            m_base = KeptFolders::Keep(root, folder_path, m_dir);
        }
    }
}

PathPlaceScope::PathPlaceScope() { KeptFolders::Enter(); }

PathPlaceScope::~PathPlaceScope() { KeptFolders::Leave(); }

void PathPlaceScope::KeepForNext() { KeptFolders::KeepForNext(); }

void PathPlaceScope::CloseKept() { KeptFolders::Close(); }

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
