#include "host/share-folder.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

#include "host/text.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

// Changes of names are on the disk only with their folder. Some file systems have no flush for one.
int FlushParent(const std::string& path) {
    const UniqueFd folder(open(ParentOf(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!folder.IsValid()) return errno;
    return fsync(folder.Get()) == 0 || errno == EINVAL ? 0 : errno;
}

// For file systems that know no flags of a rename: a folder takes the place of another one only as
// long as that is empty, and this empty one is ours.
int RenameOntoOwnFolder(const std::string& from, const std::string& to) {
    if (mkdir(to.c_str(), 0700) != 0) return errno;
    if (rename(from.c_str(), to.c_str()) == 0) return 0;
    const int error = errno;
    rmdir(to.c_str());
    return error;
}

int RenameOverNothing(const std::string& from, const std::string& to) {
    if (renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) return 0;
    return errno == EINVAL || errno == ENOSYS ? RenameOntoOwnFolder(from, to) : errno;
}

}  // namespace

int MakeShareFolder(const std::string& path, bool& wasMade) {
    wasMade = false;
    if (mkdir(path.c_str(), 0777) != 0) {
        struct stat info {};
        if (errno != EEXIST || lstat(path.c_str(), &info) != 0) return errno;
        return S_ISDIR(info.st_mode) ? 0 : ENOTDIR;
    }
    const int error = FlushParent(path);
    wasMade = error == 0;
    if (error != 0) rmdir(path.c_str());
    return error;
}

int RenameShareFolder(const std::string& from, const std::string& to) {
    int error = RenameOverNothing(from, to);
    if (error != 0) return error;
    error = FlushParent(to);
    if (error != 0) static_cast<void>(RenameOverNothing(to, from));
    return error;
}

int RemoveShareFolder(const std::string& path) {
    if (rmdir(path.c_str()) != 0) return errno;
    return FlushParent(path);
}

}  // namespace keld_host
