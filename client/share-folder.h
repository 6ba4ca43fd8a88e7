// The two sides of a task on a command line: a folder of a share, and a folder of a device.
// Threads: any. Errors: CommandError, EXIT_USAGE.
#pragma once

#include <string>

struct ShareFolder {
    std::string share;
    std::string folder;  // "/" for all of the share
};

// From "photos/inbox", "/photos/inbox" or the full path of a folder that lies in a share.
[[nodiscard]] ShareFolder ParseShareFolder(const std::string& text);
// "/DCIM" from "DCIM", "/DCIM/" and the like; "/" from "/".
[[nodiscard]] std::string ParseDeviceFolder(const std::string& text);
// Takes "/photos/inbox", as the daemon shows it, apart.
[[nodiscard]] ShareFolder SplitDisplayPath(const std::string& path);
