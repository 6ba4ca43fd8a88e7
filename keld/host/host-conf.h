// host.conf: the one optional file that tells this platform what the box looks like.
//
// Threads: any. The file is read anew when it has changed; a broken one is reported in the log with
// its line, and the last good state stays in force. A missing file is the state of all defaults.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace keld_host {

struct VolumeConf {
    bool internal = true;

    bool operator==(const VolumeConf&) const = default;
};

struct ShareConf {
    std::string path;
    bool recycleBin = false;
    bool recycleBinAdminOnly = false;
    bool mountPoint = false;

    bool operator==(const ShareConf&) const = default;
};

struct HostConf {
    std::map<std::string, VolumeConf> volumes;  // by root path
    std::vector<ShareConf> shares;              // in the order of the file
    std::vector<std::string> removableDevices;  // globs over "/dev/..."
    std::vector<std::string> frontUsb;          // globs over kernel names and USB ports
    std::vector<std::string> sdSlot;            // globs over kernel names
    std::string led;                            // empty: none
    std::string speaker;                        // empty: none
    std::string notifyFolder;
    std::string indexFolder;

    bool operator==(const HostConf&) const = default;
};

// Where a text breaks the format, and why.
struct HostConfError {
    int line = 0;  // 0: no single line is to blame
    std::string reason;
};

// Reads a whole text. Returns true and the state, or false and the first error by line, with `conf`
// unspecified.
[[nodiscard]] bool ParseHostConf(std::string_view text, HostConf& conf, HostConfError& error);

// The state in force; never null. The same pointer as long as nothing has changed.
[[nodiscard]] std::shared_ptr<const HostConf> CurrentHostConf();
// Forgets what was read.
void DropHostConf();

}  // namespace keld_host
