// The mount table of this moment.
//
// Threads: any. The kernel tells on an open /proc/self/mountinfo when the table has changed; it is
// read anew only then, so a call costs one poll.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace keld_host {

struct MountEntry {
    std::string target;
    std::string source;  // as the table has it: "/dev/sdb1", "tmpfs"
    std::string type;    // "ext4", "fuseblk"
    std::string root;    // the folder of the file system that is mounted; "/" is the whole
    dev_t device = 0;    // the table's device number; of no block device for FUSE, btrfs, tmpfs
    dev_t block = 0;     // the block device behind it, also for FUSE and btrfs; 0: none is known
    bool isReadOnly = false;
    bool isUserMount = false;  // a FUSE mount of a user, who may call its source what he likes

    [[nodiscard]] bool IsFuse() const { return type.compare(0, 4, "fuse") == 0; }
};

// Never changes once made; in the order of the kernel's table.
struct MountTable {
    std::vector<MountEntry> mounts;
    uint64_t generation = 0;  // another number for each reading

    // The file system mounted on `path` itself (the topmost one), null when there is none.
    [[nodiscard]] const MountEntry* FindAt(std::string_view path) const;
    // The file system that holds `path`, which is without links; null when there is none.
    [[nodiscard]] const MountEntry* FindHolding(std::string_view path) const;
};

// The table as of now; null when it cannot be read (logged once).
[[nodiscard]] std::shared_ptr<const MountTable> CurrentMounts();
// Forgets what was read, and looks at the mount namespace of the caller next time.
void DropMountTable();

}  // namespace keld_host
