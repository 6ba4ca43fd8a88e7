#include "host/mount-table.h"

#include <fcntl.h>
#include <libmount.h>
#include <poll.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <cerrno>
#include <cstring>
#include <mutex>

#include "host/text.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

constexpr const char* MOUNT_INFO = "/proc/self/mountinfo";

using UniqueMountTable = std::unique_ptr<libmnt_table, FreeWith<mnt_unref_table>>;
using UniqueMountIter = std::unique_ptr<libmnt_iter, FreeWith<mnt_free_iter>>;

std::string OrEmpty(const char* text) { return text == nullptr ? "" : text; }

dev_t BlockOf(const MountEntry& entry) {
    if (major(entry.device) != 0) return entry.device;
    struct stat info {};
    if (entry.source.compare(0, 1, "/") != 0 || stat(entry.source.c_str(), &info) != 0) return 0;
    return S_ISBLK(info.st_mode) ? info.st_rdev : 0;
}

bool HasOption(const char* options, const char* name, std::string& value) {
    char* found = nullptr;
    size_t length = 0;
    if (options == nullptr || mnt_optstr_get_option(options, name, &found, &length) != 0) {
        return false;
    }
    value.assign(found == nullptr ? "" : found, found == nullptr ? 0 : length);
    return true;
}

MountEntry EntryOf(libmnt_fs* fs) {
    MountEntry entry;
    entry.target = OrEmpty(mnt_fs_get_target(fs));
    entry.source = OrEmpty(mnt_fs_get_source(fs));
    entry.type = OrEmpty(mnt_fs_get_fstype(fs));
    entry.root = OrEmpty(mnt_fs_get_root(fs));
    entry.device = mnt_fs_get_devno(fs);
    std::string value;
    entry.isReadOnly = HasOption(mnt_fs_get_vfs_options(fs), "ro", value) ||
                       HasOption(mnt_fs_get_fs_options(fs), "ro", value);
    entry.isUserMount = HasOption(mnt_fs_get_fs_options(fs), "user_id", value) && value != "0";
    entry.block = BlockOf(entry);
    return entry;
}

struct Cache {
    std::mutex mutex;
    UniqueFd watch;  // raises POLLPRI once for each change since it was asked last
    std::shared_ptr<const MountTable> table;
    uint64_t generation = 0;
    bool hasFailed = false;
};

Cache& TheCache() {
    static Cache cache;
    return cache;
}

bool HasChanged(Cache& cache) {
    if (!cache.watch.IsValid()) {
        cache.watch.Reset(open(MOUNT_INFO, O_RDONLY | O_CLOEXEC));
        return true;
    }
    pollfd event{cache.watch.Get(), POLLPRI, 0};
    const int count = poll(&event, 1, 0);
    return count < 0 || (count > 0 && (event.revents & (POLLPRI | POLLERR)) != 0);
}

std::shared_ptr<const MountTable> ReadTable(uint64_t generation) {
    const UniqueMountTable source(mnt_new_table_from_file(MOUNT_INFO));
    const UniqueMountIter iter(mnt_new_iter(MNT_ITER_FORWARD));
    if (!source || !iter) return nullptr;
    auto table = std::make_shared<MountTable>();
    table->generation = generation;
    libmnt_fs* fs = nullptr;
    while (mnt_table_next_fs(source.get(), iter.get(), &fs) == 0) {
        table->mounts.push_back(EntryOf(fs));
    }
    return table;
}

}  // namespace

const MountEntry* MountTable::FindAt(std::string_view path) const {
    for (auto entry = mounts.rbegin(); entry != mounts.rend(); ++entry) {
        if (entry->target == path) return &*entry;
    }
    return nullptr;
}

const MountEntry* MountTable::FindHolding(std::string_view path) const {
    const MountEntry* best = nullptr;
    for (const MountEntry& entry : mounts) {
        if (!IsSameOrBelow(path, entry.target)) continue;
        // Of several on one folder, the last one hides the others.
        if (best == nullptr || entry.target.size() >= best->target.size()) best = &entry;
    }
    return best;
}

std::shared_ptr<const MountTable> CurrentMounts() {
    Cache& cache = TheCache();
    const std::lock_guard lock(cache.mutex);
    // The change is taken note of before the table is read: one that comes between is seen again.
    if (!HasChanged(cache) && cache.table) return cache.table;
    cache.table = ReadTable(++cache.generation);
    if (!cache.table && !cache.hasFailed) {
        SLOG_ERR("cannot read the mount table: %s\n", strerror(errno));
    }
    cache.hasFailed = !cache.table;
    return cache.table;
}

void DropMountTable() {
    Cache& cache = TheCache();
    const std::lock_guard lock(cache.mutex);
    cache.watch.Reset();
    cache.table.reset();
}

}  // namespace keld_host
