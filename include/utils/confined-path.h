// Reaches files below a root without being led out of it by a symbolic link.
//
// Folders of shares and devices can be written by other users, and the daemon is root: a link that
// is planted in the middle of a path, or put in place of a folder while a copy is under way, must
// not take an operation elsewhere. Below a registered root no component is followed through a
// link, and ".." does not leave the root. The road to the root itself is the administrator's and
// is followed as usual. Paths may be longer than PATH_MAX.
//
// Threads: every operation may be called from any thread.
#pragma once

#include <sys/types.h>

#include <optional>
#include <string>
#include <string_view>

#include "utils/unique-fd.h"

// Opens `relative` (no leading "/"; empty is the folder itself) below the open folder `dir_fd`.
// Returns a descriptor, or -1 with errno: ELOOP when a component is a link, EXDEV when the path
// leads out of the folder, else as open(2). With O_PATH | O_NOFOLLOW the last component may be a
// link, which is then opened itself. O_CLOEXEC is added.
[[nodiscard]] UniqueFd OpenBeneath(int dir_fd, std::string_view relative, int flags,
                                   mode_t mode = 0);

// Registers a root (absolute, without a trailing slash) for as long as one object for it lives.
class ConfinedRoot {
public:
    explicit ConfinedRoot(std::string path);
    ~ConfinedRoot();
    ConfinedRoot(const ConfinedRoot&) = delete;
    ConfinedRoot& operator=(const ConfinedRoot&) = delete;

    [[nodiscard]] const std::string& Path() const { return m_path; }

private:
    std::string m_path;
};

// The innermost registered root that `path` lies below, or nothing.
[[nodiscard]] std::optional<std::string> ConfinedRootOf(std::string_view path);

// For tests: false takes the way of kernels before 5.6, one component at a time.
void ConfinedPathUseOpenat2(bool is_used);

constexpr int PLACE_KEEP_MS = 50;

// While one lives, its thread opens each folder that a PathPlace needs only once: the calls for one
// file go to the same two folders again and again. The folders stay open until the outermost scope
// of the thread ends, so a scope is as short as the work on one file: an open folder holds a device
// that is to be unmounted. A folder that is moved meanwhile is still the one that was checked.
class PathPlaceScope {
public:
    PathPlaceScope();
    ~PathPlaceScope();
    PathPlaceScope(const PathPlaceScope&) = delete;
    PathPlaceScope& operator=(const PathPlaceScope&) = delete;

    // The folders stay open after this scope, for the next one of the thread: for work that goes on
    // in the same folders and has not moved or removed any. A scope that begins PLACE_KEEP_MS after
    // the first was opened begins with none all the same.
    static void KeepForNext();
    // Closes what was kept for the next scope. To be called before the thread waits.
    static void CloseKept();
};

// Where a file system call on `path` has to be made: the open folder that holds the last component,
// and that component's name, for the ...at() calls with AT_SYMLINK_NOFOLLOW or O_NOFOLLOW.
// Below no registered root, and for a root itself, this is AT_FDCWD with the whole path, unless
// that is longer than one call takes. Must not outlive the PathPlaceScope it was made in.
class PathPlace {
public:
    explicit PathPlace(const std::string& path);
    // As above, below the given root instead of a registered one; `path` is the root or below it.
    PathPlace(const std::string& root, const std::string& path);

    // False when the folder cannot be reached; Error() is the errno (ENOENT, ELOOP, ...).
    [[nodiscard]] bool IsReached() const { return m_error == 0; }
    [[nodiscard]] int Error() const { return m_error; }
    [[nodiscard]] int DirFd() const { return m_dir.IsValid() ? m_dir.Get() : m_base; }
    [[nodiscard]] const char* Name() const { return m_name.c_str(); }
    // True when links on the way to the folder were refused: the call itself must not follow
    // either.
    [[nodiscard]] bool IsConfined() const { return m_is_confined; }
    // openat(2) there, with O_CLOEXEC, and O_NOFOLLOW when confined; -1 with errno.
    [[nodiscard]] UniqueFd Open(int flags, mode_t mode = 0) const;
    // AT_SYMLINK_NOFOLLOW when confined, else 0: for calls that follow a link by their nature.
    [[nodiscard]] int FollowFlag() const;

private:
    void Reach(std::string_view root, const std::string& path);
    void ReachLong(const std::string& path);

    UniqueFd m_dir;
    int m_base;  // AT_FDCWD, or a folder that the scope keeps open
    int m_error = 0;
    bool m_is_confined = false;
    std::string m_name;
};
