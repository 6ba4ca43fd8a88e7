#include "platform/durable-file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

#include "utils/path-util.h"
#include "utils/unique-fd.h"

namespace {

bool IsWritten(const std::string& path, const std::string& content) {
    UniqueFd file(open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, 0600));
    if (!file.IsValid()) return false;
    for (size_t done = 0; done < content.size();) {
        const ssize_t length = write(file.Get(), content.data() + done, content.size() - done);
        if (length < 0) return false;
        done += static_cast<size_t>(length);
    }
    return fsync(file.Get()) == 0 && file.Close() == 0;
}

bool IsFolderSynced(const std::string& folder) {
    const UniqueFd dir(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    return dir.IsValid() && fsync(dir.Get()) == 0;
}

}  // namespace

int ReadDurableFile(const std::string& path, std::string& content) {
    const UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW));
    if (!file.IsValid()) return errno == ENOENT ? 0 : -1;
    content.clear();
    char buffer[4096];
    for (;;) {
        const ssize_t length = read(file.Get(), buffer, sizeof(buffer));
        if (length < 0) return -1;
        if (length == 0) return 1;
        content.append(buffer, static_cast<size_t>(length));
    }
}

int WriteDurableFile(const std::string& path, const std::string& content) {
    const std::string fresh = path + ".new";
    const bool is_written = IsWritten(fresh, content) && rename(fresh.c_str(), path.c_str()) == 0 &&
                            IsFolderSynced(PathDirName(path));
    return is_written ? 0 : -1;
}

int RemoveDurableFile(const std::string& path) {
    const bool is_removed = unlink(path.c_str()) == 0 || errno == ENOENT;
    return is_removed && IsFolderSynced(PathDirName(path)) ? 0 : -1;
}
