#include "service/usable-volume.h"

#include "platform/sdk-volume.h"
#include "utils/log.h"

namespace {

bool IsUsable(const SDK::Volume& volume) {
    if (!volume.is_mounted || !volume.is_writable) {
        SLOG_INFO("%s:%d volume not mounted or writable", __FILE__, __LINE__);
        return false;
    }
    if (!volume.is_internal) {
        SLOG_INFO("%s:%d volume not internal (%d)", __FILE__, __LINE__, volume.is_internal);
        return false;
    }
    return true;
}

}  // namespace

bool IsVolumeMounted(const std::string& path) {
    SDK::Volume volume;
    return !path.empty() && SDK::GetVolume(path, volume) && volume.is_mounted;
}

std::string FindUsableVolume() {
    std::vector<SDK::Volume> volumes;
    if (SDK::ListVolumes(volumes) < 0) return "";
    for (const SDK::Volume& volume : volumes) {
        if (IsUsable(volume)) return volume.mount_path;
    }
    return "";
}
