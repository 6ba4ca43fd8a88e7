// Makes the table of shares from host.conf, the folders on disk and the mount table.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "host/host-conf.h"
#include "host/mount-table.h"
#include "host/share-table.h"

namespace keld_host {

// `mounts` may be null: then there are no devices. `onFolder` is told of each folder whose listing
// the table rests on, before it is listed.
[[nodiscard]] std::shared_ptr<const ShareTable> BuildShareTable(
    const HostConf& conf, const MountTable* mounts,
    const std::function<void(const std::string&)>& onFolder);

}  // namespace keld_host
