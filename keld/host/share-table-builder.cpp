#include "host/share-table-builder.h"

#include <dirent.h>
#include <sys/stat.h>

#include <algorithm>
#include <cstdlib>
#include <set>

#include "host/block-device.h"
#include "host/host-paths.h"
#include "host/text.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

constexpr std::string_view VOLUME_PREFIX = "volume";

bool IsFolder(const std::string& path, bool follow) {
    struct stat info {};
    const int result = follow ? stat(path.c_str(), &info) : lstat(path.c_str(), &info);
    return result == 0 && S_ISDIR(info.st_mode);
}

std::vector<std::string> NamesIn(const std::string& folder) {
    std::vector<std::string> names;
    const UniqueDir dir(opendir(folder.c_str()));
    while (const dirent* entry = dir ? readdir(dir.get()) : nullptr)
        names.emplace_back(entry->d_name);
    std::sort(names.begin(), names.end());
    return names;
}

bool IsVolumeName(std::string_view name) {
    if (name.substr(0, VOLUME_PREFIX.size()) != VOLUME_PREFIX) return false;
    name.remove_prefix(VOLUME_PREFIX.size());
    return !name.empty() && name.find_first_not_of("0123456789") == std::string_view::npos;
}

class TableBuilder {
public:
    TableBuilder(const HostConf& conf, const MountTable* mounts,
                 const std::function<void(const std::string&)>& onFolder)
        : m_conf(conf), m_mounts(mounts), m_onFolder(onFolder) {}

    std::shared_ptr<const ShareTable> Build() {
        AddVolumes();
        for (const ShareConf& share : m_conf.shares) AddConfigured(share);
        FindDevices();
        if (m_conf.shares.empty()) AddFolders();
        AddDevices();
        auto byPath = [](const auto& a, const auto& b) { return a.path < b.path; };
        std::sort(m_table->shares.begin(), m_table->shares.end(), byPath);
        std::sort(m_table->volumes.begin(), m_table->volumes.end(), byPath);
        return m_table;
    }

private:
    void AddVolumes() {
        for (const auto& [path, volume] : m_conf.volumes) {
            m_table->volumes.push_back({path, volume.internal});
        }
        if (!m_conf.volumes.empty()) return;
        const std::string& root = Paths().volumeRoot;
        m_onFolder(root);
        for (const std::string& name : NamesIn(root)) {
            if (IsVolumeName(name) && IsFolder(root + name, true)) {
                m_table->volumes.push_back({root + name, true});
            }
        }
        // "volume10" comes after "volume9", not after "volume1".
        auto byNumber = [](const VolumeEntry& a, const VolumeEntry& b) {
            return a.path.size() != b.path.size() ? a.path.size() < b.path.size() : a.path < b.path;
        };
        std::sort(m_table->volumes.begin(), m_table->volumes.end(), byNumber);
    }

    void AddConfigured(const ShareConf& conf) {
        ShareEntry share;
        share.name = BaseNameOf(conf.path);
        share.path = conf.path;
        share.recycleBin = conf.recycleBin;
        share.recycleBinAdminOnly = conf.recycleBinAdminOnly;
        share.mountPoint = conf.mountPoint;
        m_names.insert(share.name);
        m_taken.insert(share.path);
        m_table->shares.push_back(std::move(share));
    }

    // A mount point that is a share of its own by configuration, or that the box itself lives on,
    // is no plugged-in device, whatever it is made of.
    bool IsOurOwn(const std::string& target) const {
        if (m_taken.count(target) != 0 || IsSystemFolder(target)) return true;
        return std::any_of(
            m_table->volumes.begin(), m_table->volumes.end(),
            [&](const VolumeEntry& volume) { return IsSameOrBelow(volume.path, target); });
    }

    void FindDevices() {
        if (m_mounts == nullptr) return;
        const std::set<std::string> systemDisks = SystemDisks(*m_mounts);
        for (const MountEntry& mount : m_mounts->mounts) {
            // Part of a file system that is bound to another place is no device of its own; for
            // btrfs it is the usual way.
            const bool isPart = mount.root != "/" && mount.type != "btrfs";
            if (mount.block == 0 || isPart || mount.isUserMount || IsOurOwn(mount.target) ||
                m_mounts->FindAt(mount.target) != &mount) {
                continue;
            }
            const auto device = BlockDeviceOf(mount.block);
            if (!device || !IsPluggedIn(*device, m_conf, systemDisks)) continue;
            ShareEntry share;
            share.path = mount.target;
            share.isDevice = true;
            share.devicePath = device->node;
            m_taken.insert(share.path);
            m_devices.push_back(std::move(share));
        }
    }

    void AddFolders() {
        for (const VolumeEntry& volume : m_table->volumes) {
            m_onFolder(volume.path);
            for (const std::string& name : NamesIn(volume.path)) {
                if (name[0] == '@' || name[0] == '#' || name[0] == '.') continue;
                const std::string path = volume.path + "/" + name;
                if (m_taken.count(path) != 0 || !IsFolder(path, false)) continue;
                AddFolder(name, path);
            }
        }
    }

    // A task finds its share's folder as volume, "/" and name, so the name cannot be changed here.
    void AddFolder(const std::string& name, const std::string& path) {
        if (!m_names.insert(name).second) {
            m_table->clashes.push_back(path);
            return;
        }
        ShareEntry share;
        share.name = name;
        share.path = path;
        share.isFolder = true;
        m_table->shares.push_back(std::move(share));
    }

    void AddDevices() {
        for (ShareEntry& device : m_devices) {
            const std::string base(BaseNameOf(device.path));
            device.name = base;
            for (int number = 2; !m_names.insert(device.name).second; ++number) {
                device.name = base + "_" + std::to_string(number);
            }
            m_table->shares.push_back(std::move(device));
        }
    }

    const HostConf& m_conf;
    const MountTable* m_mounts;
    const std::function<void(const std::string&)>& m_onFolder;
    std::shared_ptr<ShareTable> m_table = std::make_shared<ShareTable>();
    std::vector<ShareEntry> m_devices;
    std::set<std::string> m_names;
    std::set<std::string> m_taken;  // paths that are shares or devices
};

}  // namespace

std::shared_ptr<const ShareTable> BuildShareTable(
    const HostConf& conf, const MountTable* mounts,
    const std::function<void(const std::string&)>& onFolder) {
    return TableBuilder(conf, mounts, onFolder).Build();
}

}  // namespace keld_host
