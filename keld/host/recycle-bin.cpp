#include "host/recycle-bin.h"

#include <fcntl.h>
#include <keld/error.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

#include "host/copy-error.h"
#include "host/recycle-folder.h"
#include "utils/confined-path.h"
#include "utils/log.h"

namespace keld_host {
namespace {

constexpr const char* BIN_NAME = "#recycle";
constexpr int FOLDER_FLAGS = O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
// A bin that is emptied at the same moment takes its folders away from under a move.
constexpr int ATTEMPTS = 3;
constexpr unsigned NUMBER_MAX = 1U << 30U;

std::string Join(const std::vector<std::string>& components) {
    std::string path;
    for (const std::string& component : components) {
        if (!path.empty()) path += '/';
        path += component;
    }
    return path;
}

bool IsThere(int dir_fd, const std::string& name) {
    struct stat found {};
    return fstatat(dir_fd, name.c_str(), &found, AT_SYMLINK_NOFOLLOW) == 0 || errno != ENOENT;
}

int SourceError(int error) {
    if (error == ENOENT || error == ENOTDIR) return KELDERR_SRC_MISS_PATH;
    return CopyDestinationError(error);
}

}  // namespace

int RecycleMove::Run(std::string_view relative_path, bool is_folder) {
    if (!SplitPath(relative_path)) return KELDERR_INVALID_ARGUMENT;
    m_is_folder = is_folder;
    if (const int error = OpenSource(); error != 0) return SourceError(error);
    if (IsBinItself()) return KELDERR_INVALID_ARGUMENT;
    int error = 0;
    for (int attempt = 0; attempt < ATTEMPTS; ++attempt) {
        if (const int code = FindSource(is_folder); code != KELDERR_SUCCESS) return code;
        const UniqueFd bin = OpenBin();
        if (!bin.IsValid()) return CopyDestinationError(errno);
        error = OpenTarget(bin.Get());
        if (error == 0) error = MoveToTarget();
        if (error != ENOENT) break;
    }
    if (error == EXDEV || error == EBUSY) {
        SLOG_ERR("'%s' in '%s' is a mount point or on another file system than the recycle bin",
                 std::string(relative_path).c_str(), m_share_path.c_str());
        return KELDERR_FILE_OPERATION;
    }
    return error == 0 ? KELDERR_SUCCESS : CopyDestinationError(error);
}

// False for a path that is refused.
bool RecycleMove::SplitPath(std::string_view relative_path) {
    while (!relative_path.empty()) {
        const size_t slash = relative_path.find('/');
        const std::string_view component = relative_path.substr(0, slash);
        relative_path.remove_prefix(slash == relative_path.npos ? relative_path.size() : slash + 1);
        if (component == "..") return false;
        if (!component.empty() && component != ".") m_folders.emplace_back(component);
    }
    if (m_folders.empty()) return false;
    m_name = m_folders.back();
    m_folders.pop_back();
    return true;
}

int RecycleMove::OpenSource() {
    m_root.Reset(open(m_share_path.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!m_root.IsValid()) return errno;
    m_source = OpenBeneath(m_root.Get(), Join(m_folders), O_PATH | O_DIRECTORY);
    return m_source.IsValid() ? 0 : errno;
}

// Gives a KELDERR value.
int RecycleMove::FindSource(bool is_folder) const {
    struct stat found {};
    if (fstatat(m_source.Get(), m_name.c_str(), &found, AT_SYMLINK_NOFOLLOW) != 0) {
        return SourceError(errno);
    }
    return S_ISDIR(found.st_mode) == is_folder ? KELDERR_SUCCESS : KELDERR_INVALID_ARGUMENT;
}

// Where a file system takes upper and lower case for the same, the bin has more than one name.
bool RecycleMove::IsBinItself() const {
    const std::string& first = m_folders.empty() ? m_name : m_folders.front();
    if (first == BIN_NAME) return true;
    // A spelling that nobody uses: if it is there, case makes no difference. Not by comparing inode
    // numbers: exFAT gives each spelling one of its own.
    return strcasecmp(first.c_str(), BIN_NAME) == 0 && IsThere(m_root.Get(), "#rEcYcLe");
}

// None with errno on failure.
UniqueFd RecycleMove::OpenBin() const {
    UniqueFd bin(openat(m_root.Get(), BIN_NAME, O_PATH | FOLDER_FLAGS));
    if (bin.IsValid() || errno != ENOENT) return bin;
    if (mkdirat(m_root.Get(), BIN_NAME, 0700) != 0 && errno != EEXIST) return {};
    bin.Reset(openat(m_root.Get(), BIN_NAME, O_RDONLY | FOLDER_FLAGS));
    // Not every file system has modes: the bin works without.
    if (bin.IsValid() && !m_is_admin_only) (void)!fchmod(bin.Get(), 0777);
    return bin;
}

int RecycleMove::OpenTarget(int bin_fd) {
    m_target = OpenBeneath(bin_fd, Join(m_folders), O_PATH | O_DIRECTORY);
    if (m_target.IsValid()) return 0;
    // Not all of the path is there yet, or something else is in its way.
    UniqueFd source;
    for (const std::string& name : m_folders) {
        source.Reset(openat(source.IsValid() ? source.Get() : m_root.Get(), name.c_str(),
                            O_PATH | FOLDER_FLAGS));
        if (!source.IsValid()) return errno;
        m_target =
            EnterRecycleFolder(m_target.IsValid() ? m_target.Get() : bin_fd, name, source.Get());
        if (!m_target.IsValid()) return errno;
    }
    return 0;
}

int RecycleMove::MoveToTarget() const {
    int error = MoveTo(m_name);
    while (error == EEXIST) {
        const std::string name = FreeName();
        if (name.empty()) return EEXIST;
        error = MoveTo(name);
    }
    return error;
}

int RecycleMove::MoveTo(const std::string& name) const {
    if (renameat2(m_source.Get(), m_name.c_str(), m_target.Get(), name.c_str(), RENAME_NOREPLACE) ==
        0) {
        return 0;
    }
    if (errno != EINVAL && errno != ENOSYS) return errno;
    return MoveOverPlaceholder(name);
}

// For file systems whose rename cannot refuse a taken name: takes the name with an empty file or
// folder of our own, which the rename then replaces.
int RecycleMove::MoveOverPlaceholder(const std::string& name) const {
    if (m_is_folder) {
        if (mkdirat(m_target.Get(), name.c_str(), 0700) != 0) return errno;
    } else {
        const UniqueFd file(openat(m_target.Get(), name.c_str(),
                                   O_CREAT | O_EXCL | O_WRONLY | O_NOFOLLOW | O_CLOEXEC, 0600));
        if (!file.IsValid()) return errno;
    }
    if (renameat(m_source.Get(), m_name.c_str(), m_target.Get(), name.c_str()) == 0) return 0;
    const int error = errno;
    unlinkat(m_target.Get(), name.c_str(), m_is_folder ? AT_REMOVEDIR : 0);
    return error;
}

// The next number, by doubling and halving: one name may have been recycled thousands of times.
// Empty when there is none.
std::string RecycleMove::FreeName() const {
    const auto name_of = [this](unsigned number) {
        return NumberedNameIn(m_target.Get(), m_name, number, m_is_folder);
    };
    unsigned taken = 0;
    unsigned free = 1;
    while (IsThere(m_target.Get(), name_of(free))) {
        if (free >= NUMBER_MAX) return {};
        taken = free;
        free *= 2;
    }
    while (free - taken > 1) {
        const unsigned middle = taken + (free - taken) / 2;
        (IsThere(m_target.Get(), name_of(middle)) ? taken : free) = middle;
    }
    return name_of(free);
}

}  // namespace keld_host
