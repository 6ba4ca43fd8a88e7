#include "host/share-table.h"

#include <sys/stat.h>

#include <mutex>

#include "host/host-cache.h"
#include "host/host-conf.h"
#include "host/mount-table.h"
#include "host/share-table-builder.h"
#include "host/text.h"
#include "utils/log.h"

namespace keld_host {
namespace {

struct WatchedFolder {
    std::string path;
    FileStamp stamp;
};

struct Cache {
    std::mutex mutex;
    std::shared_ptr<const HostConf> conf;
    std::shared_ptr<const MountTable> mounts;
    std::vector<WatchedFolder> folders;
    std::shared_ptr<const ShareTable> table;
    std::vector<std::string> clashes;  // told in the log already
};

Cache& TheCache() {
    static Cache cache;
    return cache;
}

void TellClashes(Cache& cache) {
    if (cache.table->clashes == cache.clashes) return;
    cache.clashes = cache.table->clashes;
    for (const std::string& path : cache.clashes) {
        SLOG_WARN("'%s' is no share: another volume has a share of that name\n", path.c_str());
    }
}

// Takes the configuration and the mounts of now; false when the table was made from others.
bool IsInForceLocked(Cache& cache) {
    auto conf = CurrentHostConf();
    auto mounts = CurrentMounts();
    if (cache.table && conf == cache.conf && mounts == cache.mounts) return true;
    cache.conf = std::move(conf);
    cache.mounts = std::move(mounts);
    return false;
}

void RebuildLocked(Cache& cache) {
    cache.folders.clear();
    cache.table = BuildShareTable(*cache.conf, cache.mounts.get(), [&](const std::string& folder) {
        cache.folders.push_back({folder, FileStamp::Take(folder)});
    });
    TellClashes(cache);
}

bool IsPlainFolder(const std::string& path) {
    struct stat info {};
    return lstat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

bool HaveFoldersChanged(const Cache& cache) {
    for (const WatchedFolder& folder : cache.folders) {
        if (folder.stamp.HasChanged(folder.path)) return true;
    }
    return false;
}

// The entry with the longest path that is `path` or stands above it.
template <typename Entry>
const Entry* FindLongest(const std::vector<Entry>& entries, std::string_view path) {
    std::string clean;
    if (path.find("//") != std::string_view::npos) {
        clean = CleanPath(path);
        path = clean;
    }
    const Entry* best = nullptr;
    for (const Entry& entry : entries) {
        if (best != nullptr && entry.path.size() <= best->path.size()) continue;
        if (IsSameOrBelow(path, entry.path)) best = &entry;
    }
    return best;
}

}  // namespace

const ShareEntry* ShareTable::FindByPath(std::string_view path) const {
    return FindLongest(shares, path);
}

const ShareEntry* ShareTable::FindByName(std::string_view name) const {
    for (const ShareEntry& share : shares) {
        if (share.name == name) return &share;
    }
    return nullptr;
}

const VolumeEntry* ShareTable::FindVolume(std::string_view path) const {
    return FindLongest(volumes, path);
}

std::shared_ptr<const ShareTable> CurrentShares() {
    Cache& cache = TheCache();
    const std::lock_guard lock(cache.mutex);
    if (!IsInForceLocked(cache) || HaveFoldersChanged(cache)) RebuildLocked(cache);
    return cache.table;
}

std::shared_ptr<const ShareTable> CurrentSharesFor(std::string_view path) {
    Cache& cache = TheCache();
    const std::lock_guard lock(cache.mutex);
    if (!IsInForceLocked(cache)) {
        RebuildLocked(cache);
        return cache.table;
    }
    // Folders of a volume are one level deep: no new one can come between this share and the path.
    const ShareEntry* share = cache.table->FindByPath(path);
    const bool isThere = share != nullptr && (!share->isFolder || IsPlainFolder(share->path));
    if (!isThere && HaveFoldersChanged(cache)) RebuildLocked(cache);
    return cache.table;
}

void DropShareTable() {
    Cache& cache = TheCache();
    const std::lock_guard lock(cache.mutex);
    cache.table.reset();
    cache.folders.clear();
    cache.clashes.clear();
}

std::optional<std::string> ShareRootOf(const std::string& path) {
    const auto table = CurrentSharesFor(path);
    const ShareEntry* share = table->FindByPath(path);
    if (share == nullptr) return std::nullopt;
    return share->path;
}

}  // namespace keld_host
