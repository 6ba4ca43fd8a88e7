// Devices, and what the front panel and other programs are told.
#include <keld/device.h>

#include <cstring>

#include "fake/fake-state.h"

namespace {

std::optional<FakeDevice> FindDisk(const std::string& disk) {
    const LockedState state;
    for (const auto& [path, device] : state->devices) {
        if (device.disk == disk) return device;
    }
    return std::nullopt;
}

}  // namespace

extern "C" {

int DiskPartitionNumRemove(const char* partition, char* disk, size_t size) {
    if (FakeFails("DiskPartitionNumRemove", {FakeText(partition)})) return -1;
    const std::string name = FakeText(partition);
    std::string result = FakeDiskOf(name);
    {
        // The image file of a test stands for a device: its path is no kernel name.
        const LockedState state;
        for (const auto& [path, device] : state->devices) {
            if (device.dev_path == name || device.dev_path == "/dev/" + name) result = device.disk;
        }
    }
    if (result.empty() || result.find('/') != std::string::npos) {
        return FakeError(KELDERR_INVALID_ARGUMENT);
    }
    return FakeFill(result, disk, size) ? 0 : FakeError(KELDERR_INVALID_ARGUMENT);
}

int DiskPartitionsLayoutGet(const char* disk, DiskPartition* layout, int capacity) {
    if (FakeFails("DiskPartitionsLayoutGet", {FakeText(disk)})) return -1;
    const std::optional<FakeDevice> device = FindDisk(FakeText(disk));
    if (!device || device->partitions < 0) return FakeError(KELDERR_SRC_MISS);
    for (int i = 0; i < capacity && i < device->partitions; ++i) {
        layout[i] = {};
        FakeFill(device->disk + std::to_string(i + 1), layout[i].name, sizeof(layout[i].name));
    }
    return device->partitions;
}

int KELDUSBDevGetInfo(const char* name, KELDUSBDevInfo* info) {
    if (FakeFails("KELDUSBDevGetInfo", {FakeText(name)})) return -1;
    const std::optional<FakeDevice> device = FindDisk(FakeText(name));
    if (!device) return FakeError(KELDERR_SRC_MISS);
    *info = {};
    FakeFill(device->disk, info->name, sizeof(info->name));
    info->is_usb = device->location != KELD_USB_LOCATION_SD_SLOT;
    info->is_mmc = device->location == KELD_USB_LOCATION_SD_SLOT;
    info->is_removable = 1;
    return 0;
}

int KELDUSBGetLocation(const KELDUSBDevInfo* info) {
    if (FakeFails("KELDUSBGetLocation", {info->name})) return -1;
    const std::optional<FakeDevice> device = FindDisk(info->name);
    return device ? device->location : FakeError(KELDERR_SRC_MISS);
}

int KELDExtStgPullOut(const char* name, int flags) {
    if (FakeFails("KELDExtStgPullOut", {FakeText(name), std::to_string(flags)})) return -1;
    const LockedState state;
    state->ejected.push_back(FakeText(name));
    for (auto& [path, device] : state->devices) {
        if (device.disk == name) device.mounted = false;
    }
    return 0;
}

int KELDDevIdentityGet(const char* mount_path, char* identity, size_t size) {
    if (FakeFails("KELDDevIdentityGet", {FakeText(mount_path)})) return -1;
    const LockedState state;
    for (const auto& [path, device] : state->devices) {
        if (!FakeIsBelow(FakeText(mount_path), path)) continue;
        if (!device.mounted || !device.present) return FakeError(KELDERR_SRC_MISS_PATH);
        if (FakeFill(device.identity, identity, size)) return 0;
        return FakeError(KELDERR_INVALID_ARGUMENT);
    }
    // Not on a device: the volume of a share, which is always there.
    const std::optional<FakeShare> share = FakeShareOf(*state, FakeText(mount_path));
    if (!share) return FakeError(KELDERR_SRC_MISS_PATH);
    return FakeFill(share->volume, identity, size) ? 0 : FakeError(KELDERR_INVALID_ARGUMENT);
}

int KELDDevIsPresent(const char* mount_path, const char* identity) {
    if (FakeFails("KELDDevIsPresent", {FakeText(mount_path), FakeText(identity)})) return -1;
    const LockedState state;
    for (const auto& [path, device] : state->devices) {
        if (!FakeIsBelow(FakeText(mount_path), path)) continue;
        return device.mounted && device.present && device.identity == identity ? 1 : 0;
    }
    const std::optional<FakeShare> share = FakeShareOf(*state, FakeText(mount_path));
    return share && share->volume == identity ? 1 : 0;
}

}  // extern "C"
