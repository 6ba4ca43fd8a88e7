#include "platform/sdk-device.h"

#include <blkid/blkid.h>
#include <keld/device.h>
#include <keld/error.h>
#include <keld/volume.h>

#include <cerrno>
#include <cstring>
#include <memory>
#include <string_view>

#include "platform/sdk-mutex.h"
#include "platform/utility.h"
#include "utils/log.h"
#include "utils/per-device-value.h"
#include "utils/unique-fd.h"

namespace SDK {
namespace {

constexpr size_t DEV_PATH_SIZE = 64;
constexpr size_t DEV_NAME_SIZE = 32;
constexpr std::string_view DEV_PREFIX = "/dev/";
constexpr int PULL_OUT_FLAGS = 4;

using UniqueProbe = std::unique_ptr<std::remove_pointer_t<blkid_probe>, FreeWith<blkid_free_probe>>;
using UniqueVolumes = std::unique_ptr<KELDMountVolInfo, FreeWith<KELDMountVolInfoFree>>;

// The uuid of the file system as it is written there; empty when it has none.
std::string ProbeUUID(blkid_probe probe) {
    const char* uuid = nullptr;
    if (blkid_do_probe(probe) != 0) return "";
    if (blkid_probe_lookup_value(probe, "UUID", &uuid, nullptr) != 0 || uuid == nullptr) return "";
    return uuid;
}

}  // namespace

int GetDeviceIdentity(const std::string& mount_path, std::string& identity) {
    const ReentrantLock lock;
    char text[KELD_DEV_IDENTITY_SIZE] = "";
    if (KELDDevIdentityGet(mount_path.c_str(), text, sizeof(text)) < 0) {
        SLOG_ERR("KELDDevIdentityGet(%s): Error code %d\n", mount_path.c_str(), KLIBCErrGet());
        return -1;
    }
    identity = text;
    return 0;
}

bool IsDevicePresent(const std::string& mount_path, const std::string& identity) {
    if (identity.empty()) return false;
    const ReentrantLock lock;
    const int present = KELDDevIsPresent(mount_path.c_str(), identity.c_str());
    if (present < 0) {
        SLOG_ERR("KELDDevIsPresent(%s): Error code %d\n", mount_path.c_str(), KLIBCErrGet());
    }
    return present > 0;
}

int GetDevPath(const std::string& volume_path, std::string& dev_path) {
    if (volume_path.empty()) {
        SLOG_ERR("path is empty\n");
        return -1;
    }
    const ReentrantLock lock;
    char path[DEV_PATH_SIZE] = "";
    const int result = KELDVolPathToDevPath(volume_path.c_str(), path, sizeof(path));
    if (result < 0) {
        SLOG_ERR("KELDVolPathToDevPath: failed to get dev path for '%s', [ret = %d]\n",
                 volume_path.c_str(), result);
        return result;
    }
    dev_path = path;
    return 0;
}

int GetUUID(const std::string& usb_share_path, const std::string& dev_path, std::string& uuid) {
    if (usb_share_path.empty() || dev_path.empty()) {
        SLOG_ERR("usb_share_path or dev_path is empty\n");
        return -1;
    }
    const ReentrantLock lock;
    const UniqueProbe probe(blkid_new_probe_from_filename(dev_path.c_str()));
    if (!probe) {
        SLOG_ERR("GetUUID: failed to open device: %s, %s\n", dev_path.c_str(), strerror(errno));
        return -1;
    }
    const std::string blk_uuid = ProbeUUID(probe.get());
    if (!blk_uuid.empty()) {
        uuid = ToLower(blk_uuid);
        SLOG_DBG("blk_uuid = %s, uuid = %s\n", blk_uuid.c_str(), uuid.c_str());
        return 0;
    }
    std::string key_file_uuid;
    if (!GetPerDeviceValue(usb_share_path, "uuid", key_file_uuid)) {
        SLOG_ERR("GetUUID: Failed to read uuid from ferrix copy config %s\n",
                 usb_share_path.c_str());
        return -1;
    }
    uuid = ToLower(key_file_uuid);
    return 0;
}

int GetKELDDevName(const std::string& dev_path, std::string& name) {
    if (dev_path.empty()) {
        SLOG_ERR("dev_path is empty\n");
        return -1;
    }
    std::string_view partition = dev_path;
    if (partition.starts_with(DEV_PREFIX)) partition.remove_prefix(DEV_PREFIX.size());
    const ReentrantLock lock;
    char disk[DEV_NAME_SIZE] = "";
    if (DiskPartitionNumRemove(std::string(partition).c_str(), disk, sizeof(disk)) < 0) {
        SLOG_ERR("Failed to remove disk partition number for '%s'\n", dev_path.c_str());
        return -1;
    }
    name = disk;
    return 0;
}

bool IsFrontPortDevice(const std::string& name, bool& is_usb_dev) {
    if (name.empty()) {
        SLOG_ERR("keld_dev_name is empty\n");
        return false;
    }
    const ReentrantLock lock;
    KELDUSBDevInfo info = {};
    if (KELDUSBDevGetInfo(name.c_str(), &info) < 0) {
        SLOG_ERR("Fail to get USB dev info for keld dev name '%s', keld_err = '%d'\n", name.c_str(),
                 KLIBCErrGet());
        return false;
    }
    const int location = KELDUSBGetLocation(&info);
    if (location != KELD_USB_LOCATION_FRONT && location != KELD_USB_LOCATION_SD_SLOT) return false;
    is_usb_dev = location == KELD_USB_LOCATION_FRONT;
    return true;
}

int GetPartitionCount(const std::string& name) {
    if (name.empty()) {
        SLOG_ERR("keld_dev_name is empty\n");
        return -1;
    }
    const ReentrantLock lock;
    const int count = DiskPartitionsLayoutGet(name.c_str(), nullptr, 0);
    if (count < 0) {
        SLOG_ERR("Fail to get disk partion layout of [%s]", name.c_str());
        return -1;
    }
    return count;
}

int GetMountedVolumes(std::map<std::string, std::string>& volumes) {
    volumes.clear();
    const ReentrantLock lock;
    const UniqueVolumes list(KELDMountVolAllEnum(0, KELD_MOUNT_VOL_REMOVABLE));
    if (!list && KLIBCErrGet() != KELDERR_SUCCESS) {
        SLOG_ERR("KELDMountVolAllEnum: Error code %d\n", KLIBCErrGet());
        return -1;
    }
    for (const KELDMountVolInfo* volume = list.get(); volume != nullptr; volume = volume->next) {
        volumes[volume->mount_path] = volume->device_path;
    }
    return 0;
}

int EjectDevice(const std::string& name) {
    const ReentrantLock lock;
    return KELDExtStgPullOut(name.c_str(), PULL_OUT_FLAGS);
}

}  // namespace SDK
