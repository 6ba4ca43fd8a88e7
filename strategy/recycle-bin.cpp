#include "strategy/recycle-bin.h"

#include "platform/keld-recycle.h"
#include "platform/keld-sdk-wrapper.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

// Below a share's root.
constexpr std::string_view BIN_NAME = "#recycle";

// What follows the share's path and one separator; empty if the path is not in the share, or is it.
std::string RelativePath(const std::string& path, const std::string& share_path) {
    const size_t found = path.find(share_path);
    if (found == std::string::npos) return {};
    const size_t start = found + share_path.size() + 1;
    return start < path.size() ? path.substr(start) : std::string();
}

bool IsInBin(std::string_view relative_path) {
    return relative_path.starts_with(BIN_NAME) &&
           (relative_path.size() == BIN_NAME.size() || relative_path[BIN_NAME.size()] == '/');
}

int Recycle(const SDK::Share& share, const std::string& share_path,
            const std::string& relative_path, bool is_dir) {
    SDK::PlatformError error;
    if (is_dir) {
        if (SDK::RecycleDir(share_path, relative_path, share.IsRecycleBinAdminOnly(), error) == 0) {
            return 0;
        }
        SLOG_ERR("Failed to recycle dir for share_path = '%s', rel_path = '%s'\n[0x%04X %s:%d]",
                 share_path.c_str(), relative_path.c_str(), static_cast<unsigned>(error.code),
                 error.file.c_str(), error.line);
        return -1;
    }
    if (SDK::RecycleFile(share_path, relative_path, error) == 0) return 0;
    SLOG_ERR("Failed to recycle file for share_path = '%s', rel_path = '%s'\n[0x%04X %s:%d]",
             share_path.c_str(), relative_path.c_str(), static_cast<unsigned>(error.code),
             error.file.c_str(), error.line);
    return -1;
}

}  // namespace

int RecycleBin::RemoveFile(const std::string& path, bool is_dir) const {
    SLOG_INFO("RemoveFile: remove path '%s'", path.c_str());
    std::string share_name;
    std::string share_path;
    if (SDK::GetShareNameByPath(path, share_name, share_path) < 0) {
        SLOG_ERR("Failed to get share name for '%s'", path.c_str());
        return -1;
    }
    SDK::Share share;
    if (share.Open(share_name) < 0) {
        SLOG_ERR("Failed to get share info '%s'", share_name.c_str());
        return -1;
    }
    const std::string relative_path = RelativePath(path, share_path);
    if (IsInBin(relative_path)) {
        SLOG_ERR("Failed to remove '%s', it belongs to the recycle bin.", path.c_str());
        return -1;
    }
    if (share.IsRecycleBinEnabled()) return Recycle(share, share_path, relative_path, is_dir);
    if (FSRemove(path) == 0) return 0;
    SLOG_ERR("Failed to remove '%s'.", path.c_str());
    return -1;
}
