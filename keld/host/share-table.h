// The volumes and shares of this moment: folders of volumes and plugged-in devices, each with its
// settings.
//
// Threads: any. A call costs a few microseconds as long as neither host.conf nor the mount table
// nor the folders that hold the shares change: they are read anew only then.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace keld_host {

struct VolumeEntry {
    std::string path;  // without a slash at the end
    bool isInternal = true;
};

struct ShareEntry {
    std::string name;  // unique
    std::string path;  // without a slash at the end
    bool recycleBin = false;
    bool recycleBinAdminOnly = false;
    bool mountPoint = false;  // counts as locked while nothing is mounted on its path
    bool isDevice = false;    // a plugged-in device
    bool isFolder = false;    // a share only because it is a folder of a volume
    std::string devicePath;   // of a device: "/dev/sdb1"
};

// Never changes once made; shares and volumes are sorted by path.
struct ShareTable {
    std::vector<VolumeEntry> volumes;
    std::vector<ShareEntry> shares;
    std::vector<std::string> clashes;  // folders that are no shares: another volume has the name

    // The share with the longest root that is `path` or stands above it; null when there is none.
    [[nodiscard]] const ShareEntry* FindByPath(std::string_view path) const;
    [[nodiscard]] const ShareEntry* FindByName(std::string_view name) const;
    // The volume with the longest root that is `path` or stands above it; null when there is none.
    [[nodiscard]] const VolumeEntry* FindVolume(std::string_view path) const;
};

// The table as of now; never null.
[[nodiscard]] std::shared_ptr<const ShareTable> CurrentShares();
// The same for those who ask only for the share that holds `path`: other folders of the volumes are
// not looked at as long as that share is still there. It is asked for each file.
[[nodiscard]] std::shared_ptr<const ShareTable> CurrentSharesFor(std::string_view path);
// Forgets what was read.
void DropShareTable();

// The root of the share or device that holds this absolute path, itself included.
[[nodiscard]] std::optional<std::string> ShareRootOf(const std::string& path);

}  // namespace keld_host
