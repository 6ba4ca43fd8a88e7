// Names, partitions and places of plugged-in disks.
#include <keld/device.h>

#include <algorithm>
#include <cctype>
#include <cstring>
#include <string>
#include <string_view>

#include "host/block-device.h"
#include "host/host-conf.h"
#include "host/host-error.h"
#include "host/mount-table.h"
#include "host/text.h"

using keld_host::BlockDevice;
using keld_host::BlockDeviceOf;
using keld_host::Fail;
using keld_host::FillBuffer;

namespace {

constexpr std::string_view DIGITS = "0123456789";

// Drivers whose disks end in a digit themselves: only "p" and a number is a partition there.
constexpr std::string_view kNumberedDisks[] = {"mmcblk", "nvme", "loop", "md", "nbd",
                                               "zram",   "ram",  "dm-",  "sr", "pmem"};

bool IsNumberedDisk(std::string_view name) {
    return std::any_of(std::begin(kNumberedDisks), std::end(kNumberedDisks), [&](auto prefix) {
        return name.size() > prefix.size() && name.substr(0, prefix.size()) == prefix &&
               isdigit(static_cast<unsigned char>(name[prefix.size()])) != 0;
    });
}

std::string_view DiskNameOf(std::string_view name) {
    const std::string_view stem = name.substr(0, name.find_last_not_of(DIGITS) + 1);
    if (stem.size() == name.size()) return name;
    const bool hasMark = stem.size() >= 2 && stem.back() == 'p' &&
                         isdigit(static_cast<unsigned char>(stem[stem.size() - 2])) != 0;
    if (hasMark) return stem.substr(0, stem.size() - 1);
    return IsNumberedDisk(name) ? name : stem;
}

}  // namespace

int DiskPartitionNumRemove(const char* partition, char* disk, size_t size) {
    const std::string_view name = partition == nullptr ? "" : partition;
    const std::string_view found = DiskNameOf(name);
    if (found.empty() || name.find('/') != std::string_view::npos) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    return FillBuffer(found, disk, size) ? 0 : Fail(KELDERR_INVALID_ARGUMENT);
}

int DiskPartitionsLayoutGet(const char* disk, DiskPartition* layout, int capacity) {
    const auto device = BlockDeviceOf(std::string(disk == nullptr ? "" : disk));
    if (!device || device->isPartition) return Fail(KELDERR_SRC_MISS);
    auto partitions = keld_host::PartitionsOf(*device);
    if (partitions.empty()) {
        const unsigned long long size = keld_host::SizeOf(*device);
        if (size == 0) return Fail(KELDERR_SRC_MISS);  // a drive without a medium
        partitions.push_back({device->name, 0, size});
    }
    for (size_t i = 0; i < partitions.size() && static_cast<int>(i) < capacity; ++i) {
        DiskPartition& entry = layout[i];
        if (!FillBuffer(partitions[i].name, entry.name, sizeof(entry.name))) {
            return Fail(KELDERR_INVALID_ARGUMENT);
        }
        entry.start = partitions[i].start;
        entry.size = partitions[i].size;
    }
    return static_cast<int>(partitions.size());
}

int KELDUSBDevGetInfo(const char* name, KELDUSBDevInfo* info) {
    if (info == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    *info = KELDUSBDevInfo{};
    const auto device = BlockDeviceOf(std::string(name == nullptr ? "" : name));
    if (!device) return Fail(KELDERR_SRC_MISS);
    const auto mounts = keld_host::CurrentMounts();
    if (!mounts) return Fail(KELDERR_SYSTEM);
    if (!FillBuffer(device->name, info->name, sizeof(info->name)) ||
        !FillBuffer(device->usbPort, info->port, sizeof(info->port))) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    info->is_usb = device->isUsb ? 1 : 0;
    info->is_mmc = device->isMmc ? 1 : 0;
    const auto conf = keld_host::CurrentHostConf();
    info->is_removable =
        keld_host::IsPluggedIn(*device, *conf, keld_host::SystemDisks(*mounts)) ? 1 : 0;
    return 0;
}

int KELDUSBGetLocation(const KELDUSBDevInfo* info) {
    if (info == nullptr || info->name[0] == '\0') return Fail(KELDERR_INVALID_ARGUMENT);
    const auto conf = keld_host::CurrentHostConf();
    if (keld_host::MatchesAny(conf->sdSlot, info->name)) return KELD_USB_LOCATION_SD_SLOT;
    if (keld_host::MatchesAny(conf->frontUsb, info->name)) return KELD_USB_LOCATION_FRONT;
    if (info->port[0] != '\0' && keld_host::MatchesAny(conf->frontUsb, info->port)) {
        return KELD_USB_LOCATION_FRONT;
    }
    return KELD_USB_LOCATION_OTHER;
}
