// Which volumes can hold the repository. Threads: any. Failures and refusals are logged.
#pragma once

#include <string>

// True when this is the root of a volume that is mounted now.
[[nodiscard]] bool IsVolumeMounted(const std::string& path);

// The first volume of the box that is mounted and writable; empty when there is none.
[[nodiscard]] std::string FindUsableVolume();
