// The fixed places of this platform, in one record, so that a test can stand elsewhere.
#pragma once

#include <string>

namespace keld_host {

struct HostPaths {
    std::string hostConf = "/etc/keld/host.conf";
    std::string notifyFolder = "/etc/keld/notify.d";  // unless host.conf names another
    std::string indexFolder = "/etc/keld/index.d";    // unless host.conf names another
    std::string keldInfo = "/etc.defaults/keldinfo.conf";
    std::string keldSettings = "/etc/keldinfo.conf";  // what the owner of the box has set
    std::string volumeRoot = "/";  // where default volumes are looked for; ends with a slash
    std::string nsswitch = "/etc/nsswitch.conf";
    std::string systemdFolder = "/etc/systemd/system";
    std::string sysfs = "/sys";  // where presence of a device is asked
    std::string schedFolder = "/var/lib/keld/sched";
    std::string cronFile = "/etc/cron.d/keld-sched";
};

[[nodiscard]] const HostPaths& Paths();
// For tests, before any other thread runs.
void SetPaths(const HostPaths& paths);

}  // namespace keld_host
