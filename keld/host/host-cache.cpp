#include "host/host-cache.h"

#include <ctime>

#include "host/host-conf.h"
#include "host/mount-table.h"
#include "host/share-table.h"

namespace keld_host {
namespace {

// 3 s: the coarsest clocks of file systems in use (FAT) tick every 2 s.
constexpr time_t SETTLED_AFTER_S = 3;

bool IsSame(const timespec& a, const timespec& b) {
    return a.tv_sec == b.tv_sec && a.tv_nsec == b.tv_nsec;
}

}  // namespace

FileStamp FileStamp::Take(const struct stat& info) {
    FileStamp stamp;
    stamp.m_exists = true;
    stamp.m_dev = info.st_dev;
    stamp.m_ino = info.st_ino;
    stamp.m_size = info.st_size;
    stamp.m_mtime = info.st_mtim;
    stamp.m_ctime = info.st_ctim;
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    stamp.m_isSettled = now.tv_sec - info.st_ctim.tv_sec > SETTLED_AFTER_S;
    return stamp;
}

FileStamp FileStamp::Take(const std::string& path) {
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) return {};
    return Take(info);
}

bool FileStamp::HasChanged(const std::string& path) const {
    if (m_exists && !m_isSettled) return true;
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) return m_exists;
    return !m_exists || info.st_dev != m_dev || info.st_ino != m_ino || info.st_size != m_size ||
           !IsSame(info.st_mtim, m_mtime) || !IsSame(info.st_ctim, m_ctime);
}

void DropHostCaches() {
    DropHostConf();
    DropMountTable();
    DropShareTable();
}

}  // namespace keld_host
