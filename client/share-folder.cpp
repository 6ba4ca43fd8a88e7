#include "client/share-folder.h"

#include <algorithm>
#include <vector>

#include "client/exit-status.h"
#include "client/text.h"
#include "platform/sdk-share.h"
#include "platform/task-utils.h"
#include "utils/confined-path.h"
#include "utils/file-op.h"

namespace {

// With one "/" before each component and none at the end; "/" for nothing.
std::string CleanFolder(const std::string& text) {
    std::string folder;
    for (size_t begin = 0; begin < text.size();) {
        const size_t end = std::min(text.find('/', begin), text.size());
        const std::string name = text.substr(begin, end - begin);
        begin = end + 1;
        if (name.empty() || name == ".") continue;
        if (name == "..") {
            throw CommandError(EXIT_USAGE, "\"" + Printable(text) + "\": \"..\" leads out of it");
        }
        folder += "/" + name;
    }
    return folder.empty() ? "/" : folder;
}

bool IsShare(const std::string& name) {
    constexpr int ALL_SHARES = 3;
    std::vector<std::string> names;
    return SDK::ListShares(ALL_SHARES, names) == 0 &&
           std::find(names.begin(), names.end(), name) != names.end();
}

}  // namespace

ShareFolder SplitDisplayPath(const std::string& path) {
    const size_t end = path.find('/', 1);
    return {path.substr(1, end == std::string::npos ? end : end - 1),
            end == std::string::npos ? "/" : path.substr(end)};
}

ShareFolder ParseShareFolder(const std::string& text) {
    const std::string path = CleanFolder(text);
    if (path == "/") throw CommandError(EXIT_USAGE, "the name of a share is missing");
    const ShareFolder by_name = SplitDisplayPath(path);
    if (text.front() != '/' || IsShare(by_name.share)) return by_name;
    std::string share;
    std::string share_path;
    if (SDK::GetShareNameByPath(path, share, share_path) < 0) return by_name;
    return {share, CleanFolder(path.substr(share_path.size()))};
}

std::string ParseDeviceFolder(const std::string& text, const std::string& mount_path) {
    std::string folder = CleanFolder(text);
    if (mount_path.empty() || !text.starts_with('/')) return folder;
    const std::string root = CleanFolder(mount_path);
    if (folder == root) return "/";
    return folder.starts_with(root + "/") ? folder.substr(root.size()) : folder;
}

void CheckDeviceFolder(const std::string& mount_path, const std::string& folder) {
    std::string path;
    GetUSBDirFullPath(mount_path, folder, path);
    const ConfinedRoot root(mount_path);
    FSInfo info;
    if (FSStat(path, info) == 0 && info.exist && info.type == FS_TYPE_DIR) return;
    throw CommandError(EXIT_REFUSED, "the device on " + Printable(mount_path) +
                                         " has no folder \"" + Printable(folder) +
                                         "\": look what it has, or leave --from out for all of it");
}
