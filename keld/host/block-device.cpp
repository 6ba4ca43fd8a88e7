#include "host/block-device.h"

#include <dirent.h>
#include <libudev.h>
#include <sys/sysmacros.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "host/text.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

using UniqueUdev = std::unique_ptr<udev, FreeWith<udev_unref>>;
using UniqueUdevDevice = std::unique_ptr<udev_device, FreeWith<udev_device_unref>>;

constexpr unsigned long long SECTOR = 512;  // sysfs counts in these, whatever the disk's own size

std::string OrEmpty(const char* text) { return text == nullptr ? "" : text; }

bool HasParent(udev_device* device, const char* subsystem) {
    return udev_device_get_parent_with_subsystem_devtype(device, subsystem, nullptr) != nullptr;
}

BlockDevice Describe(udev_device* device) {
    BlockDevice found;
    found.name = OrEmpty(udev_device_get_sysname(device));
    found.node = OrEmpty(udev_device_get_devnode(device));
    if (found.node.empty()) found.node = "/dev/" + found.name;
    found.isPartition = OrEmpty(udev_device_get_devtype(device)) == "partition";
    udev_device* disk = found.isPartition
                            ? udev_device_get_parent_with_subsystem_devtype(device, "block", "disk")
                            : device;
    if (disk == nullptr) disk = device;
    found.disk = OrEmpty(udev_device_get_sysname(disk));
    found.diskPath = OrEmpty(udev_device_get_syspath(disk));
    found.isRemovable = OrEmpty(udev_device_get_sysattr_value(disk, "removable")) == "1";
    udev_device* usb = udev_device_get_parent_with_subsystem_devtype(disk, "usb", "usb_device");
    found.isUsb = usb != nullptr;
    if (usb != nullptr) found.usbPort = OrEmpty(udev_device_get_sysname(usb));
    found.isMmc = !found.isUsb && HasParent(disk, "mmc");
    return found;
}

// Adds the disks below a device: through the layers of LVM, LUKS and RAID.
void AddDisksBelow(const BlockDevice& device, std::set<std::string>& disks) {
    if (!disks.insert(device.disk).second) return;
    const std::string folder = device.diskPath + "/slaves";
    const UniqueDir dir(opendir(folder.c_str()));
    while (const dirent* entry = dir ? readdir(dir.get()) : nullptr) {
        if (entry->d_name[0] == '.') continue;
        const auto slave = BlockDeviceOf(std::string(entry->d_name));
        if (slave) AddDisksBelow(*slave, disks);
    }
}

}  // namespace

std::optional<BlockDevice> BlockDeviceOf(dev_t number) {
    const UniqueUdev context(udev_new());
    if (!context) return std::nullopt;
    const UniqueUdevDevice device(udev_device_new_from_devnum(context.get(), 'b', number));
    if (!device) return std::nullopt;
    return Describe(device.get());
}

std::optional<BlockDevice> BlockDeviceOf(const std::string& name) {
    if (name.empty() || name.find('/') != std::string::npos || name.front() == '.') {
        return std::nullopt;
    }
    const UniqueUdev context(udev_new());
    if (!context) return std::nullopt;
    const UniqueUdevDevice device(
        udev_device_new_from_subsystem_sysname(context.get(), "block", name.c_str()));
    if (!device) return std::nullopt;
    return Describe(device.get());
}

std::vector<PartitionPlace> PartitionsOf(const BlockDevice& disk) {
    std::vector<PartitionPlace> partitions;
    const UniqueDir dir(opendir(disk.diskPath.c_str()));
    while (const dirent* entry = dir ? readdir(dir.get()) : nullptr) {
        const std::string folder = disk.diskPath + "/" + entry->d_name;
        if (entry->d_name[0] == '.' || ReadAttribute(folder + "/partition").empty()) continue;
        PartitionPlace place;
        place.name = entry->d_name;
        place.start = strtoull(ReadAttribute(folder + "/start").c_str(), nullptr, 10) * SECTOR;
        place.size = strtoull(ReadAttribute(folder + "/size").c_str(), nullptr, 10) * SECTOR;
        partitions.push_back(std::move(place));
    }
    std::sort(partitions.begin(), partitions.end(),
              [](const auto& a, const auto& b) { return a.start < b.start; });
    return partitions;
}

unsigned long long SizeOf(const BlockDevice& device) {
    const std::string folder =
        device.isPartition ? device.diskPath + "/" + device.name : device.diskPath;
    return strtoull(ReadAttribute(folder + "/size").c_str(), nullptr, 10) * SECTOR;
}

std::set<std::string> SystemDisks(const MountTable& mounts) {
    std::set<std::string> disks;
    const MountEntry* root = mounts.FindAt("/");
    if (root == nullptr || root->block == 0) return disks;
    const auto device = BlockDeviceOf(root->block);
    if (device) AddDisksBelow(*device, disks);
    return disks;
}

bool IsPluggedIn(const BlockDevice& device, const HostConf& conf,
                 const std::set<std::string>& systemDisks) {
    if (systemDisks.count(device.disk) != 0) return false;
    return device.isRemovable || device.isUsb || device.isMmc ||
           MatchesAny(conf.removableDevices, device.node) ||
           MatchesAny(conf.removableDevices, "/dev/" + device.disk);
}

bool IsSystemFolder(std::string_view target) {
    for (const char* folder : {"/", "/home", "/opt", "/root", "/srv", "/tmp", "/var", "/var/lib",
                               "/var/log", "/var/tmp"}) {
        if (target == folder) return true;
    }
    for (const char* folder : {"/boot", "/dev", "/efi", "/etc", "/proc", "/sys", "/usr"}) {
        if (IsSameOrBelow(target, folder)) return true;
    }
    return false;
}

}  // namespace keld_host
