#include <fcntl.h>
#include <keld/copy.h>
#include <keld/error.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <new>
#include <optional>
#include <string>

#include "host/copy-data.h"
#include "host/copy-error.h"
#include "host/copy-new-file.h"
#include "host/host-error.h"
#include "host/share-table.h"
#include "host/text.h"
#include "utils/confined-path.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

struct KELDCopyTHRArgs {
    keld_host::CopyCancel cancel;
};

namespace keld_host {
namespace {

constexpr mode_t PERMISSION_BITS = 0777;
constexpr mode_t ALL_MODE_BITS = 07777;
// Not blocked by a FIFO that took the file's place; no terminal becomes the daemon's.
constexpr int SOURCE_FLAGS = O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;

// The root of the last path asked for, kept for a second: one side of a run stays in one share.
// A root that is out of date confines no less than the one that would be found now.
class RootMemory {
public:
    std::optional<std::string> RootOf(const std::string& path) {
        timespec now{};
        clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
        const bool is_inside = m_root && path.size() > m_root->size() &&
                               path[m_root->size()] == '/' && path.starts_with(*m_root);
        if (!is_inside || now.tv_sec != m_second) {
            m_root = ShareRootOf(path);
            m_second = now.tv_sec;
        }
        return m_root;
    }

private:
    std::optional<std::string> m_root;
    time_t m_second = 0;
};

// Returns a descriptor, or none with errno.
UniqueFd OpenSource(const std::string& path) {
    thread_local RootMemory memory;
    const auto root = memory.RootOf(path);
    return (root ? PathPlace(*root, path) : PathPlace(path)).Open(SOURCE_FLAGS);
}

int StatSource(int fd, struct stat* source) {
    if (fstat(fd, source) != 0) return CopySourceError(errno);
    return S_ISREG(source->st_mode) ? KELDERR_SUCCESS : KELDERR_INVALID_ARGUMENT;
}

// An open FIFO would never answer, but a socket or a device without a driver cannot even be opened.
int OpenSourceError(int error) {
    return error == ENXIO || error == ENODEV ? KELDERR_INVALID_ARGUMENT : CopySourceError(error);
}

PathPlace DestinationPlace(const std::string& path) {
    thread_local RootMemory memory;
    const auto root = memory.RootOf(path);
    return root ? PathPlace(*root, path) : PathPlace(path);
}

// File systems without owners or modes refuse these, and the copy is as good as it can be there.
bool MayBeIgnored(int error) {
    return error == EPERM || error == EOPNOTSUPP || error == ENOSYS || error == EINVAL;
}

int SetOwnerAndMode(int fd, mode_t mode, const KELDCopyOptions& options) {
    const auto owner = static_cast<uid_t>(options.owner);
    const auto group = static_cast<gid_t>(options.group);
    if (fchown(fd, owner, group) != 0 && !MayBeIgnored(errno)) return CopyDestinationError(errno);
    // Most often the file was made with the mode: a look costs a tenth of setting it once more.
    struct stat made {};
    if (fstat(fd, &made) == 0 && (made.st_mode & ALL_MODE_BITS) == mode) return KELDERR_SUCCESS;
    if (fchmod(fd, mode) != 0 && !MayBeIgnored(errno)) return CopyDestinationError(errno);
    return KELDERR_SUCCESS;
}

int CopyInto(int dir_fd, const char* name, int from, const struct stat& source,
             const KELDCopyOptions& options, const CopyCancel& cancel) {
    const bool may_replace = options.overwrite != -1;
    const int found = LookAtDestination(dir_fd, name);
    if (found != KELDERR_SUCCESS && !(found == KELDERR_DST_EXISTS && may_replace)) return found;
    NewFile file(dir_fd);
    const mode_t mode = source.st_mode & PERMISSION_BITS;
    if (const int code = file.Create(mode); code != KELDERR_SUCCESS) return code;
    if (const int code = SetOwnerAndMode(file.Fd(), mode, options); code != KELDERR_SUCCESS) {
        return code;
    }
    if (const int code = CopyData(from, file.Fd(), source, cancel); code != KELDERR_SUCCESS) {
        return code;
    }
    // Before the name: a copy that is found after a crash is then known for what it is. Where it
    // cannot be set, the caller, who sets the times, tells.
    const timespec times[2] = {
        {0, UTIME_OMIT},
        source.st_mtim
    };
    static_cast<void>(futimens(file.Fd(), times));
    return file.Place(name, may_replace);
}

// A place outside every root is a whole path: its folder is opened the usual way.
int CopyIntoPath(const char* path, int from, const struct stat& source,
                 const KELDCopyOptions& options, const CopyCancel& cancel) {
    const std::string clean = CleanPath(path);
    const std::string name(BaseNameOf(clean));
    if (name.empty()) return KELDERR_DST_TYPE_CONFLICT;
    const std::string folder = ParentOf(clean);
    const UniqueFd dir(open(folder.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!dir.IsValid()) return CopyDestinationError(errno);
    return CopyInto(dir.Get(), name.c_str(), from, source, options, cancel);
}

int Copy(const std::string& from, const std::string& to, const KELDCopyOptions& options,
         const CopyCancel& cancel) {
    if (cancel.IsAsked()) return KELDERR_CANCELLED;
    const UniqueFd source_file = OpenSource(from);
    if (!source_file.IsValid()) return OpenSourceError(errno);
    struct stat source {};
    if (const int code = StatSource(source_file.Get(), &source); code != KELDERR_SUCCESS) {
        return code;
    }
    const PathPlace place = DestinationPlace(to);
    if (!place.IsReached()) {
        if (place.Error() == ELOOP) SLOG_WARN("a symbolic link on the way to '%s'", to.c_str());
        return CopyDestinationError(place.Error());
    }
    if (!place.IsConfined()) {
        return CopyIntoPath(place.Name(), source_file.Get(), source, options, cancel);
    }
    return CopyInto(place.DirFd(), place.Name(), source_file.Get(), source, options, cancel);
}

}  // namespace
}  // namespace keld_host

extern "C" {

KELDCopyTHRArgs* KELDCopyTHRArgsAlloc(void) {
    auto* args = new (std::nothrow) KELDCopyTHRArgs;
    if (args == nullptr) (void)keld_host::Fail(KELDERR_SYSTEM);
    return args;
}

void KELDCopyTHRArgsFree(KELDCopyTHRArgs* args) { delete args; }

int KELDCopyTHRSetCallbackIsCancel(KELDCopyTHRArgs* args, KELDCopyIsCancel callback,
                                   void* user_data) {
    if (args == nullptr) return keld_host::Fail(KELDERR_INVALID_ARGUMENT);
    args->cancel = {callback, user_data};
    return 0;
}

int KELDFileCopy_r(const char* from, const char* to, const KELDCopyOptions* options,
                   KELDCopyTHRArgs* args) {
    if (from == nullptr || to == nullptr || options == nullptr || *from == 0 || *to == 0) {
        return keld_host::Fail(KELDERR_INVALID_ARGUMENT);
    }
    const auto cancel = args != nullptr ? args->cancel : keld_host::CopyCancel{};
    const int code = keld_host::Copy(from, to, *options, cancel);
    return code == KELDERR_SUCCESS ? 0 : keld_host::Fail(code);
}

}  // extern "C"
