// Which volumes can hold the repository. Threads: any. Failures and refusals are logged.
#pragma once

#include <string>

// 1 when this is the root of a volume that is mounted now, 0 when it is not, -1 when the platform
// does not tell.
[[nodiscard]] int LookUpVolume(const std::string& path);
// The same, where only a sure yes counts.
[[nodiscard]] bool IsVolumeMounted(const std::string& path);
[[nodiscard]] bool IsVolumeWritable(const std::string& path);

// The first volume of the box that is mounted and writable. 1 with its path, 0 when there is none,
// -1 when the volumes cannot be listed; `path` is then unchanged.
[[nodiscard]] int FindUsableVolume(std::string& path);

// One folder may have several names.
[[nodiscard]] bool IsSameFolder(const std::string& a, const std::string& b);
