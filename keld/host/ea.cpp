// Plain Linux keeps a file's attributes in its inode: nothing is stored beside it.
#include <keld/ea.h>
#include <sys/stat.h>

#include <cerrno>

#include "host/host-error.h"

int KELDEARemove(const char* path, int fd, int flags) {
    static_cast<void>(fd);
    static_cast<void>(flags);
    if (path == nullptr || path[0] == '\0') return keld_host::Fail(KELDERR_INVALID_ARGUMENT);
    return 0;  // the attributes went with the file
}

int KELDArchiveBit(const char* path, int value) {
    static_cast<void>(value);
    if (path == nullptr || path[0] == '\0') return keld_host::Fail(KELDERR_INVALID_ARGUMENT);
    struct stat info {};
    return lstat(path, &info) == 0 ? 0 : keld_host::FailErrno(errno);
}
