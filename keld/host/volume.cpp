// Volumes of the box and file systems of plugged-in devices.
#include <keld/volume.h>
#include <sys/stat.h>
#include <sys/statvfs.h>

#include <memory>
#include <string>

#include "host/block-device.h"
#include "host/host-error.h"
#include "host/mount-table.h"
#include "host/share-table.h"
#include "host/text.h"

using keld_host::CurrentMounts;
using keld_host::CurrentShares;
using keld_host::Fail;
using keld_host::FillBuffer;
using keld_host::MountEntry;
using keld_host::MountTable;
using keld_host::ShareEntry;
using keld_host::ShareTable;
using keld_host::VolumeEntry;

namespace {

// A node with the texts that its fields point at.
struct VolumeRecord : KELDMountVolInfo {
    VolumeRecord(std::string mount, std::string device, bool isInternal)
        : KELDMountVolInfo{}, mountText(std::move(mount)), deviceText(std::move(device)) {
        mount_path = mountText.c_str();
        device_path = deviceText.c_str();
        is_internal = isInternal ? 1 : 0;
        struct stat info {};
        struct statvfs usage {};
        is_mounted = stat(mount_path, &info) == 0 && S_ISDIR(info.st_mode) ? 1 : 0;
        is_writable =
            is_mounted != 0 && statvfs(mount_path, &usage) == 0 && (usage.f_flag & ST_RDONLY) == 0
                ? 1
                : 0;
    }
    std::string mountText;
    std::string deviceText;
};

// The node name of the device behind a mount, or the table's own word for what has none.
std::string DeviceOf(const MountEntry& mount) {
    const auto device = mount.block != 0 ? keld_host::BlockDeviceOf(mount.block) : std::nullopt;
    return device ? device->node : mount.source;
}

VolumeRecord* NewVolume(const VolumeEntry& volume, const MountTable& mounts) {
    const MountEntry* mount = mounts.FindHolding(volume.path);
    return std::make_unique<VolumeRecord>(volume.path, mount != nullptr ? DeviceOf(*mount) : "",
                                          volume.isInternal)
        .release();
}

VolumeRecord* NewDevice(const ShareEntry& device) {
    return std::make_unique<VolumeRecord>(device.path, device.devicePath, false).release();
}

}  // namespace

KELDMountVolInfo* KELDMountVolAllEnum(int reserved, int kinds) {
    static_cast<void>(reserved);
    keld_host::SetError(KELDERR_SUCCESS, "", 0);
    const auto mounts = CurrentMounts();
    if (!mounts) {
        Fail(KELDERR_SYSTEM);
        return nullptr;
    }
    const auto table = CurrentShares();
    if (kinds == 0) kinds = KELD_MOUNT_VOL_INTERNAL | KELD_MOUNT_VOL_REMOVABLE;
    KELDMountVolInfo* first = nullptr;
    KELDMountVolInfo** link = &first;
    const auto append = [&](VolumeRecord* record) {
        *link = record;
        link = &record->next;
    };
    if ((kinds & KELD_MOUNT_VOL_INTERNAL) != 0) {
        for (const VolumeEntry& volume : table->volumes) append(NewVolume(volume, *mounts));
    }
    if ((kinds & KELD_MOUNT_VOL_REMOVABLE) != 0) {
        for (const ShareEntry& share : table->shares) {
            if (share.isDevice) append(NewDevice(share));
        }
    }
    return first;
}

KELDMountVolInfo* KELDMountVolInfoGet(const char* path) {
    const auto mounts = CurrentMounts();
    if (path == nullptr || path[0] != '/' || !mounts) {
        Fail(path == nullptr || path[0] != '/' ? KELDERR_INVALID_ARGUMENT : KELDERR_SYSTEM);
        return nullptr;
    }
    const std::string clean = keld_host::CleanPath(path);
    const auto table = CurrentShares();
    const VolumeEntry* volume = table->FindVolume(clean);
    if (volume != nullptr && volume->path == clean) return NewVolume(*volume, *mounts);
    const ShareEntry* share = table->FindByPath(clean);
    if (share != nullptr && share->isDevice && share->path == clean) return NewDevice(*share);
    Fail(KELDERR_SRC_MISS);
    return nullptr;
}

void KELDMountVolInfoFree(KELDMountVolInfo* list) {
    while (list != nullptr) {
        KELDMountVolInfo* next = list->next;
        delete static_cast<VolumeRecord*>(list);
        list = next;
    }
}

int VolumePathParseEx(const char* path, char* volume_path, size_t size) {
    if (path == nullptr || path[0] != '/') return Fail(KELDERR_INVALID_ARGUMENT);
    const auto table = CurrentShares();
    const ShareEntry* share = table->FindByPath(path);
    const VolumeEntry* volume = table->FindVolume(path);
    std::string found;
    if (share != nullptr) {
        found = keld_host::ParentOf(share->path);
    } else if (volume != nullptr) {
        found = volume->path;
    } else {
        return Fail(KELDERR_SRC_MISS);
    }
    return FillBuffer(found, volume_path, size) ? 0 : Fail(KELDERR_INVALID_ARGUMENT);
}

int KELDVolPathToDevPath(const char* volume_path, char* device_path, size_t size) {
    if (volume_path == nullptr || volume_path[0] != '/') return Fail(KELDERR_INVALID_ARGUMENT);
    const auto mounts = CurrentMounts();
    if (!mounts) return Fail(KELDERR_SYSTEM);
    const MountEntry* mount = mounts->FindAt(keld_host::CleanPath(volume_path));
    if (mount == nullptr || mount->block == 0) return Fail(KELDERR_SRC_MISS);
    return FillBuffer(DeviceOf(*mount), device_path, size) ? 0 : Fail(KELDERR_INVALID_ARGUMENT);
}
