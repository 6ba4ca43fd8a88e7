// The steps of taking a disk out of service, each for itself.
#pragma once

#include <string>
#include <vector>

#include "host/block-device.h"
#include "host/mount-table.h"

namespace keld_host {

// The mounts of a disk and of its partitions, the deepest first.
[[nodiscard]] std::vector<MountEntry> MountsOf(const BlockDevice& disk, const MountTable& mounts);

// Writes out what waits in memory for the file system mounted on `target`. Returns 0, or an errno.
[[nodiscard]] int FlushFileSystem(const std::string& target);

// Unmounts, never lazily. Returns 0, or an errno: EBUSY when something is in use there.
[[nodiscard]] int UnmountFileSystem(const std::string& target);

// Waits until no process holds the device open, as the program of a FUSE file system does until it
// has written its last blocks. False when one still does after `limitMs`.
[[nodiscard]] bool WaitUntilUnused(const BlockDevice& disk, int limitMs);

// Powers the disk off where the kernel can. `diskPath` is its folder in sysfs. Returns 0 when it
// did, or when it cannot for this kind of disk; else an errno.
int PowerOff(const std::string& diskPath);

}  // namespace keld_host
