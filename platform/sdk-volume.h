// Volumes: the file systems of the box itself, and those of plugged-in devices.
//
// Threads: any; each operation holds the lock of the layer for its platform call.
#pragma once

#include <string>
#include <vector>

namespace SDK {

struct Volume {
    std::string mount_path;  // without a slash at the end
    bool is_mounted = false;
    bool is_writable = false;
    bool is_internal = false;  // of the box, not of plugged-in storage
};

// All volumes, in the platform's order. 0, or -1 (logged) and an empty list.
[[nodiscard]] int ListVolumes(std::vector<Volume>& volumes);
// The volume whose root is `path`. False when there is none.
[[nodiscard]] bool GetVolume(const std::string& path, Volume& volume);

}  // namespace SDK
