#include "service/usable-volume.h"

#include <sys/stat.h>

#include <algorithm>

#include "platform/sdk-volume.h"
#include "utils/log.h"
#include "utils/path-util.h"

namespace {

// 1, 0 or -1. A lookup of one volume does not tell whether it has failed; the list of all does.
int Get(const std::string& path, SDK::Volume& volume) {
    if (path.empty()) return 0;
    if (SDK::GetVolume(path, volume)) return 1;
    std::vector<SDK::Volume> volumes;
    if (SDK::ListVolumes(volumes) < 0) return -1;
    const auto found = std::ranges::find(volumes, path, &SDK::Volume::mount_path);
    if (found == volumes.end()) return 0;
    volume = *found;
    return 1;
}

bool IsReady(const SDK::Volume& volume) {
    if (volume.is_mounted && volume.is_writable) return true;
    SLOG_INFO("%s:%d volume not mounted or writable", __FILE__, __LINE__);
    return false;
}

bool IsUsable(const SDK::Volume& volume) {
    if (!IsReady(volume)) return false;
    if (!volume.is_internal) {
        SLOG_INFO("%s:%d volume not internal (%d)", __FILE__, __LINE__, volume.is_internal);
        return false;
    }
    return true;
}

}  // namespace

int LookUpVolume(const std::string& path) {
    SDK::Volume volume;
    const int found = Get(path, volume);
    return found > 0 && !volume.is_mounted ? 0 : found;
}

bool IsVolumeMounted(const std::string& path) { return LookUpVolume(path) > 0; }

bool IsVolumeWritable(const std::string& path) {
    SDK::Volume volume;
    return Get(path, volume) > 0 && IsReady(volume);
}

int FindUsableVolume(std::string& path) {
    std::vector<SDK::Volume> volumes;
    if (SDK::ListVolumes(volumes) < 0) return -1;
    const auto found = std::ranges::find_if(volumes, IsUsable);
    if (found == volumes.end()) return 0;
    path = found->mount_path;
    return 1;
}

bool IsSameFolder(const std::string& a, const std::string& b) {
    if (a.empty() || b.empty()) return false;
    if (PathWithoutTrailingSlashes(a) == PathWithoutTrailingSlashes(b)) return true;
    struct stat first = {};
    struct stat second = {};
    return stat(a.c_str(), &first) == 0 && stat(b.c_str(), &second) == 0 &&
           first.st_dev == second.st_dev && first.st_ino == second.st_ino;
}
