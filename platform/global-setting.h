// The settings of the whole package, in its file etc/setting.conf. Nothing is cached: each call
// reads or writes the file, which has no lock. Threads: any. Failures are logged.
#pragma once

#include <string>

// The volume that holds the repository, at most 63 bytes (more is cut off); empty when it is not
// set or cannot be read.
[[nodiscard]] std::string GetRepoVolPath();
[[nodiscard]] bool SetRepoVolPath(const std::string& path);

// True when the beep is switched on. A missing setting or a failure is false.
[[nodiscard]] bool GetBeep();
[[nodiscard]] bool SetBeep(bool is_on);
// Switches the beep on if there is no setting yet. False when that cannot be read or written.
[[nodiscard]] bool InitBeep();
