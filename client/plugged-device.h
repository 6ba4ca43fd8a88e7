// The storage devices that are plugged in and mounted now, as the platform tells them. Threads:
// any.
#pragma once

#include <string>
#include <vector>

struct PluggedDevice {
    std::string mount_path;
    std::string device_path;  // "/dev/sdb1"
    std::string uuid;         // empty when it has none
};

// By mount path. EXIT_REFUSED (CommandError) when the platform cannot tell.
[[nodiscard]] std::vector<PluggedDevice> ListPluggedDevices();

// The device that is meant by a mount path or a device path; with an empty text, the only one that
// is plugged in. EXIT_USAGE (CommandError) when there is none, or more than one to choose from.
[[nodiscard]] PluggedDevice FindPluggedDevice(const std::string& path);

// Who made a device and what it calls itself, as the kernel knows; empty where it does not.
struct DeviceMake {
    std::string producer;
    std::string product;
};

[[nodiscard]] DeviceMake ReadDeviceMake(const PluggedDevice& device);
