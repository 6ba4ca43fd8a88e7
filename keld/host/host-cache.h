// What the caches of this platform have in common: noticing cheaply that a file or folder changed.
#pragma once

#include <sys/stat.h>

#include <string>

namespace keld_host {

// Forgets everything that was read from files, folders and the mount table. For tests.
void DropHostCaches();

// What a file or folder looked like when it was read.
//
// A time stamp alone does not tell two changes in one tick of the file system's clock apart, so a
// stamp that was taken soon after the last change counts as changed until it has aged.
class FileStamp {
public:
    // The stamp of `path` now, links followed.
    static FileStamp Take(const std::string& path);
    static FileStamp Take(const struct stat& info);

    [[nodiscard]] bool Exists() const { return m_exists; }
    // True when `path` may differ from what it was when this stamp was taken.
    [[nodiscard]] bool HasChanged(const std::string& path) const;

private:
    bool m_exists = false;
    bool m_isSettled = true;
    dev_t m_dev = 0;
    ino_t m_ino = 0;
    off_t m_size = 0;
    timespec m_mtime{};
    timespec m_ctime{};
};

}  // namespace keld_host
