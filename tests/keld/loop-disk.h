// Disk images on loop devices, mounted in a mount namespace of the test program's own. Needs root.
#pragma once

#include <string>
#include <vector>

#include "support/temp-dir.h"

// Why loop devices and file systems of this kind ("ext4", "xfs", "btrfs", "exfat") cannot be had
// here; empty when they can.
std::string WhyNoLoop(const std::string& kind = "ext4");

// Puts this thread into a mount namespace of its own, once; nothing mounted later is seen outside.
void EnterMountNamespace();

// Runs a command line of the shell; true when it ends with 0. What it says is dropped.
bool Shell(const std::string& command);

// An image with a loop device for the length of a test.
class LoopDisk {
public:
    // An image of one file system without a partition table, or with `partitions` (0 to 4) of one
    // each. A failure fails the running test.
    LoopDisk(const std::string& kind, int partitions);
    // Unmounts everything that was mounted by Mount() and detaches the device.
    ~LoopDisk();
    LoopDisk(const LoopDisk&) = delete;
    LoopDisk& operator=(const LoopDisk&) = delete;

    // "loop0", "/dev/loop0", "/dev/loop0p1" (0: the disk itself).
    [[nodiscard]] const std::string& Name() const { return m_name; }
    [[nodiscard]] std::string Node(int partition = 0) const;
    // Mounts a file system on a folder, which is made; returns the folder.
    std::string Mount(const std::string& folder, int partition = 0,
                      const std::string& options = "rw");
    // Binds a folder of the disk to another place, which is made; returns that place.
    std::string Bind(const std::string& from, const std::string& to);
    // Takes the image out of its device and puts the other's image there, as a stick that is pulled
    // and followed by another. Both must be unmounted.
    void Exchange(LoopDisk& other);

private:
    void Attach();
    void Detach();
    void WritePartitionTable(int partitions) const;

    TempDir m_folder;
    std::string m_image = m_folder / "disk.img";
    std::string m_kind;
    std::string m_name;
    std::vector<std::string> m_mounted;
};
