// What may be done to the shares of this box, and what it would come to; nothing is changed here.
// Outcomes: see share-admin.h. `DONE` comes with the plan.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "host/host-conf-file.h"
#include "host/host-conf.h"
#include "host/mount-table.h"
#include "host/share-admin.h"
#include "host/share-table.h"

namespace keld_host {

// Why this name cannot be that of a share ("it holds a slash"); empty when it can.
[[nodiscard]] std::string ShareNameFault(std::string_view name);
// The errno as words, and what helps against it where we know it.
[[nodiscard]] std::string Because(int error);

// The box as host.conf and the disks have it; with `forChange` no other program changes host.conf
// until the object goes.
class ShareBox {
public:
    [[nodiscard]] ShareOutcome Open(bool forChange);

    [[nodiscard]] HostConfFile& File() { return m_file; }
    [[nodiscard]] const HostConfFile& File() const { return m_file; }
    [[nodiscard]] const HostConf& Conf() const { return m_conf; }
    [[nodiscard]] const ShareTable& Table() const { return *m_table; }
    // Whether shares are sections of host.conf, not folders of volumes.
    [[nodiscard]] bool HasSections() const { return !m_conf.shares.empty(); }
    [[nodiscard]] bool IsMounted(const std::string& path) const;

private:
    HostConfFile m_file;
    HostConf m_conf;
    std::shared_ptr<const MountTable> m_mounts;
    std::shared_ptr<const ShareTable> m_table;
};

struct SharePlan {
    std::string path;                 // of the share: the new one, or that of now
    std::string newPath;              // of a rename
    std::optional<std::string> text;  // of host.conf afterwards; none when that is not changed
};

[[nodiscard]] ShareOutcome PlanAdd(const ShareBox& box, const std::string& nameOrPath,
                                   SharePlan& plan);
[[nodiscard]] ShareOutcome PlanRemoval(const ShareBox& box, const std::string& name,
                                       SharePlan& plan);
[[nodiscard]] ShareOutcome PlanRename(const ShareBox& box, const std::string& name,
                                      const std::string& newName, SharePlan& plan);

}  // namespace keld_host
