// What the kernel knows of a block device. Threads: any; nothing is kept between calls.
#pragma once

#include <sys/types.h>

#include <optional>
#include <set>
#include <string>
#include <vector>

#include "host/host-conf.h"
#include "host/mount-table.h"

namespace keld_host {

struct BlockDevice {
    std::string name;      // kernel name, "sdb1"
    std::string node;      // "/dev/sdb1"
    std::string disk;      // kernel name of the whole disk, "sdb"
    std::string diskPath;  // of the disk in sysfs
    std::string usbPort;   // "1-1.2", empty when it is not on USB
    bool isPartition = false;
    bool isUsb = false;
    bool isMmc = false;
    bool isRemovable = false;  // the kernel calls it so
};

// Empty when there is no such device (any more).
[[nodiscard]] std::optional<BlockDevice> BlockDeviceOf(dev_t number);
[[nodiscard]] std::optional<BlockDevice> BlockDeviceOf(const std::string& name);

// A partition, or a disk without any. Positions and sizes are in bytes.
struct PartitionPlace {
    std::string name;
    unsigned long long start = 0;
    unsigned long long size = 0;
};
// The partitions of a disk, by their start; empty when it has none.
[[nodiscard]] std::vector<PartitionPlace> PartitionsOf(const BlockDevice& disk);
// In bytes; 0 for a drive without a medium.
[[nodiscard]] unsigned long long SizeOf(const BlockDevice& device);

// The whole disks that the running system stands on: those below the file system of "/".
[[nodiscard]] std::set<std::string> SystemDisks(const MountTable& mounts);

// Whether a device counts as plugged-in storage: the kernel knows it as removable, USB or MMC, or
// host.conf names it; a disk that the system stands on never does.
[[nodiscard]] bool IsPluggedIn(const BlockDevice& device, const HostConf& conf,
                               const std::set<std::string>& systemDisks);
// Whether a mount of such a device is the system's own ("/boot" on an SD card), not a user's.
[[nodiscard]] bool IsSystemFolder(std::string_view target);

}  // namespace keld_host
