// The appliance itself: indicators, capabilities, the media index, programs, the last error.
//
// Threads: any; each operation holds the lock of the layer for its platform call.
#pragma once

#include <cstdint>
#include <string>

namespace SDK {

// Where and why the last platform call of this thread failed.
struct PlatformError {
    int code = 0;
    std::string file;
    int line = 0;
};
[[nodiscard]] PlatformError GetLastError();

// Asks the media indexer to take `path` in. Always 0: the indexer's answer is not looked at.
int AddToIndex(const std::string& path);

// Sets the pattern of the front LED. 0 or above, or negative on failure.
[[nodiscard]] int NotifyLed(int code);
// Issues a hardware control command (the beeper's tones); its result says nothing.
void HardwareControl(int command);

// True when this model has a feature.
[[nodiscard]] bool HasCapability(const std::string& key);

// Runs a program with two arguments and waits for its end. Its exit status, negative on failure.
[[nodiscard]] int RunProgram(const std::string& path, const std::string& arg1,
                             const std::string& arg2);

// True when a file system is mounted at `path` itself; false on failure.
[[nodiscard]] bool HasMountPoint(const std::string& path);
// The full path of a path as users see it ("/photos/2024"). What lies below "/homes" is there only
// while home folders are enabled: their folder outlives the service. 0, or -1 with the out
// unchanged.
[[nodiscard]] int ResolvePath(const std::string& display_path, std::string& full_path);

// Removes a stored entry of the task scheduler. 0 or above, or negative on failure: there is no
// such entry, or the id is none.
[[nodiscard]] int RemoveSchedEntry(int64_t id);

// A new random uuid, in lower case.
[[nodiscard]] std::string NewUUID();

}  // namespace SDK
