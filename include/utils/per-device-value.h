// The key file that lies on a device itself: "@eaDir/.KeldoranFerrix.config" below its root.
//
// Threads: any; two writers of one device need a lock of their own.
#pragma once

#include <string>

// False for an empty root, key or value, and when the file cannot be written.
[[nodiscard]] bool SetPerDeviceValue(const std::string& device_root, const std::string& key,
                                     const std::string& value);
// True when a value that is not empty came back (at most 63 bytes).
[[nodiscard]] bool GetPerDeviceValue(const std::string& device_root, const std::string& key,
                                     std::string& value);
