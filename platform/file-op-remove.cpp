#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

#include "platform/tree-remover.h"
#include "utils/confined-path.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr int kFailed = -3;

bool RemoveFile(const PathPlace& place, const std::string& path) {
    if (unlinkat(place.DirFd(), place.Name(), 0) != 0 && errno != ENOENT) {
        SLOG_ERR("Failed to remove file '%s'\n", path.c_str());
        return false;
    }
    return TreeRemover::RemoveAttributes(path);
}

}  // namespace

int FSRemove(const std::string& given_path) {
    // "link/" would lead through the link; the link itself is meant.
    const size_t last = given_path.find_last_not_of('/');
    if (last == given_path.npos) return -1;  // also the root of the whole system
    const std::string path = given_path.substr(0, last + 1);
    FSInfo info;
    if (FSStat(path, info) != 0) return -1;
    if (!info.exist) return 0;
    const PathPlace place(path);
    if (!place.IsReached()) return kFailed;
    const bool is_gone = info.type == FS_TYPE_DIR
                             ? TreeRemover(place.DirFd(), place.Name(), path).Remove()
                             : RemoveFile(place, path);
    return is_gone ? 0 : kFailed;
}
