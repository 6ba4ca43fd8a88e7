// A file system image that is mounted for the length of a test. Needs root.
#pragma once

#include <cstdint>
#include <string>

#include "support/temp-dir.h"

class ScratchDisk {
public:
    // Why disks of this kind ("ext4", "xfs", "btrfs", "exfat") cannot be had here; empty when they
    // can.
    static std::string WhyNot(const std::string& kind);

    // Makes and mounts a disk; fails the running test when that does not work. The mount is seen by
    // this process and its children alone.
    ScratchDisk(const std::string& kind, uint64_t size_mib);
    ~ScratchDisk();
    ScratchDisk(const ScratchDisk&) = delete;
    ScratchDisk& operator=(const ScratchDisk&) = delete;

    // Where it is mounted.
    [[nodiscard]] const std::string& Path() const { return m_path; }
    // Mounts it anew; `is_read_only` says how.
    void Remount(bool is_read_only);

private:
    void Mount(bool is_read_only);
    void Unmount();

    TempDir m_folder;
    std::string m_kind;
    std::string m_path = m_folder.MakeDir("disk");
    std::string m_device;
};

// Runs a command; false, with a failure of the test, when it fails.
bool RunCommand(const std::string& command);
