// The two sides of a task on a command line: a folder of a share, and a folder of a device.
// Threads: any. Errors: CommandError, EXIT_USAGE where nothing else is said.
#pragma once

#include <string>

struct ShareFolder {
    std::string share;
    std::string folder;  // "/" for all of the share
};

// From "photos/inbox", "/photos/inbox" or the full path of a folder that lies in a share.
[[nodiscard]] ShareFolder ParseShareFolder(const std::string& text);
// "/DCIM" from "DCIM", "/DCIM/" and the like, and from the full path of a folder of the device that
// is mounted on `mount_path`, which is empty when it is not known; "/" from "/".
[[nodiscard]] std::string ParseDeviceFolder(const std::string& text, const std::string& mount_path);
// EXIT_REFUSED when there is no such folder on the device that is mounted there.
void CheckDeviceFolder(const std::string& mount_path, const std::string& folder);
// Takes "/photos/inbox", as the daemon shows it, apart.
[[nodiscard]] ShareFolder SplitDisplayPath(const std::string& path);
