// Copies and recycle bins, carried out on the disk.
#include <fcntl.h>
#include <keld/copy.h>
#include <keld/recycle.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <string_view>

#include "fake/fake-state.h"
#include "utils/confined-path.h"
#include "utils/unique-fd.h"

struct KELDCopyTHRArgs {
    KELDCopyIsCancel callback = nullptr;
    void* user_data = nullptr;
};

namespace {

constexpr mode_t PERMISSION_BITS = 0777;
constexpr std::string_view RECYCLE = "#recycle";

bool IsCancelled(const KELDCopyTHRArgs* args) {
    return args != nullptr && args->callback != nullptr && args->callback(args->user_data) != 0;
}

// Copies the content; 0 or -1 with the error set.
int Pump(int from, int to, const KELDCopyTHRArgs* args) {
    char buffer[65536];
    for (;;) {
        if (IsCancelled(args)) return FakeError(KELDERR_CANCELLED);
        const ssize_t got = read(from, buffer, sizeof(buffer));
        if (got == 0) return 0;
        if (got < 0) return FakeError(FakeErrorOf(errno));
        for (ssize_t done = 0; done < got;) {
            const ssize_t put = write(to, buffer + done, static_cast<size_t>(got - done));
            if (put < 0) return FakeError(FakeErrorOf(errno));
            done += put;
        }
    }
}

// 0, or the error for a destination that may not be written.
int CheckDestination(const PathPlace& to, bool overwrite) {
    if (!to.IsReached()) return FakeError(KELDERR_FILE_OPERATION);
    struct stat info;
    if (fstatat(to.DirFd(), to.Name(), &info, AT_SYMLINK_NOFOLLOW) != 0) return 0;
    if (!S_ISREG(info.st_mode)) return FakeError(KELDERR_DST_TYPE_CONFLICT);
    return overwrite ? 0 : FakeError(KELDERR_DST_EXISTS);
}

int Copy(const std::string& from_path, const std::string& to_path, const KELDCopyOptions& options,
         const KELDCopyTHRArgs* args) {
    static std::atomic<int> counter;
    const PathPlace from(from_path);
    if (!from.IsReached()) return FakeError(FakeErrorOf(from.Error()));
    const UniqueFd source(openat(from.DirFd(), from.Name(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
    if (!source.IsValid()) {
        return FakeError(errno == ELOOP ? KELDERR_INVALID_ARGUMENT : FakeErrorOf(errno));
    }
    struct stat info;
    if (fstat(source.Get(), &info) != 0) return FakeError(KELDERR_IO);
    if (!S_ISREG(info.st_mode)) return FakeError(KELDERR_INVALID_ARGUMENT);

    const PathPlace to(to_path);
    if (CheckDestination(to, options.overwrite == 1) < 0) return -1;
    const std::string whole = to.Name();
    const size_t slash = whole.rfind('/');  // an unconfined place keeps the whole path
    const std::string folder = slash == std::string::npos ? "" : whole.substr(0, slash + 1);
    const std::string temporary = folder + ".fake-copy-" + std::to_string(++counter);
    UniqueFd copy(
        openat(to.DirFd(), temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
    if (!copy.IsValid()) return FakeError(FakeErrorOf(errno));
    if (Pump(source.Get(), copy.Get(), args) < 0) {
        unlinkat(to.DirFd(), temporary.c_str(), 0);
        return -1;
    }
    fchmod(copy.Get(), info.st_mode & PERMISSION_BITS);
    if (renameat(to.DirFd(), temporary.c_str(), to.DirFd(), to.Name()) != 0) {
        const int error = errno;
        unlinkat(to.DirFd(), temporary.c_str(), 0);
        return FakeError(FakeErrorOf(error));
    }
    return 0;
}

bool Exists(const std::string& root, const std::string& path) {
    const PathPlace place(root, path);
    struct stat info;
    return place.IsReached() &&
           fstatat(place.DirFd(), place.Name(), &info, AT_SYMLINK_NOFOLLOW) == 0;
}

// Makes the folders of a path in the bin, without the last component; their errors come out at the
// move.
void MakeParents(const std::string& root, const std::string& path, mode_t bin_mode) {
    for (size_t end = path.find('/', root.size() + 1); end != std::string::npos;
         end = path.find('/', end + 1)) {
        const bool is_bin = end == root.size() + 1 + RECYCLE.size();
        const PathPlace place(root, path.substr(0, end));
        if (place.IsReached()) mkdirat(place.DirFd(), place.Name(), is_bin ? bin_mode : 0777);
    }
}

int Recycle(const std::string& root, const std::string& relative, bool is_dir, mode_t bin_mode) {
    if (relative.empty() || relative.find("..") != std::string::npos ||
        FakeIsBelow(relative, std::string(RECYCLE))) {
        return FakeError(KELDERR_INVALID_ARGUMENT);
    }
    const PathPlace from(root, root + "/" + relative);
    if (!from.IsReached()) return FakeError(FakeErrorOf(from.Error()));
    struct stat info;
    if (fstatat(from.DirFd(), from.Name(), &info, AT_SYMLINK_NOFOLLOW) != 0) {
        return FakeError(FakeErrorOf(errno));
    }
    if (S_ISDIR(info.st_mode) != is_dir) return FakeError(KELDERR_INVALID_ARGUMENT);

    std::string target = root + "/" + std::string(RECYCLE) + "/" + relative;
    MakeParents(root, target, bin_mode);
    const size_t slash = target.rfind('/');
    const size_t dot = is_dir ? std::string::npos : target.rfind('.');
    const size_t stem = dot == std::string::npos || dot <= slash + 1 ? target.size() : dot;
    std::string free_name = target;
    for (int number = 1; Exists(root, free_name); ++number) {
        free_name =
            target.substr(0, stem) + " (" + std::to_string(number) + ")" + target.substr(stem);
    }
    const PathPlace to(root, free_name);
    if (!to.IsReached()) return FakeError(FakeErrorOf(to.Error()));
    if (renameat(from.DirFd(), from.Name(), to.DirFd(), to.Name()) != 0) {
        return FakeError(FakeErrorOf(errno));
    }
    LockedState()->recycled.emplace_back(root, relative);
    return 0;
}

}  // namespace

extern "C" {

KELDCopyTHRArgs* KELDCopyTHRArgsAlloc(void) {
    return FakeFails("KELDCopyTHRArgsAlloc") ? nullptr : new KELDCopyTHRArgs;
}

void KELDCopyTHRArgsFree(KELDCopyTHRArgs* args) {
    FakeRecord("KELDCopyTHRArgsFree");
    delete args;
}

int KELDCopyTHRSetCallbackIsCancel(KELDCopyTHRArgs* args, KELDCopyIsCancel callback,
                                   void* user_data) {
    if (FakeFails("KELDCopyTHRSetCallbackIsCancel")) return -1;
    if (args == nullptr) return FakeError(KELDERR_INVALID_ARGUMENT);
    args->callback = callback;
    args->user_data = user_data;
    return 0;
}

int KELDFileCopy_r(const char* from, const char* to, const KELDCopyOptions* options,
                   KELDCopyTHRArgs* args) {
    if (FakeFails("KELDFileCopy_r",
                  {FakeText(from), FakeText(to), std::to_string(options->overwrite),
                   std::to_string(options->owner), std::to_string(options->group)})) {
        return -1;
    }
    if (Copy(FakeText(from), FakeText(to), *options, args) < 0) return -1;
    LockedState()->copies.emplace_back(FakeText(from), FakeText(to));
    return 0;
}

int KELDRecycleUnlinkFileWithSharePath(const char* share_path, const char* relative_path) {
    if (FakeFails("KELDRecycleUnlinkFileWithSharePath",
                  {FakeText(share_path), FakeText(relative_path)})) {
        return -1;
    }
    return Recycle(FakeText(share_path), FakeText(relative_path), false, 0777);
}

int KELDRecycleRmDirWithSharePath(const char* share_path, const char* relative_path, int reserved,
                                  int admin_only) {
    if (FakeFails("KELDRecycleRmDirWithSharePath",
                  {FakeText(share_path), FakeText(relative_path), std::to_string(reserved),
                   std::to_string(admin_only)})) {
        return -1;
    }
    return Recycle(FakeText(share_path), FakeText(relative_path), true,
                   admin_only == 1 ? 0700 : 0777);
}

}  // extern "C"
