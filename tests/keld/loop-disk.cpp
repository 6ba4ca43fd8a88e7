#include "loop-disk.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <fstream>
#include <utility>

#include "utils/unique-fd.h"

namespace {

constexpr uint32_t SECTOR = 512;
// The least that every kind of file system takes is that of xfs.
constexpr uint32_t PART_SECTORS = 320u * 1024 * 1024 / SECTOR;
constexpr uint32_t FIRST_SECTOR = 2048;

std::string MkfsCommand(const std::string& kind, const std::string& node) {
    if (kind == "ext4") return "mkfs.ext4 -qF " + node;
    if (kind == "xfs") return "mkfs.xfs -qf " + node;
    if (kind == "btrfs") return "mkfs.btrfs -qf " + node;
    return "mkfs.exfat " + node;
}

}  // namespace

bool Shell(const std::string& command) {
    return system(("{ " + command + "; } >/dev/null 2>&1").c_str()) == 0;
}

std::string WhyNoLoop(const std::string& kind) {
    if (geteuid() != 0) return "needs root";
    if (access("/dev/loop-control", F_OK) != 0) return "there are no loop devices";
    if (!Shell("PATH=$PATH:/sbin:/usr/sbin command -v mkfs." + kind)) return "no mkfs." + kind;
    if (kind == "exfat") {
        if (access("/dev/fuse", F_OK) != 0) return "there is no FUSE";
        return Shell("command -v mount.exfat-fuse") ? "" : "no mount.exfat-fuse";
    }
    std::ifstream known("/proc/filesystems");
    for (std::string word; known >> word;) {
        if (word == kind) return "";
    }
    return "the kernel has no " + kind;
}

void EnterMountNamespace() {
    static const bool done = [] {
        EXPECT_EQ(0, unshare(CLONE_NEWNS)) << strerror(errno);
        EXPECT_EQ(0, mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr)) << strerror(errno);
        return true;
    }();
    static_cast<void>(done);
}

LoopDisk::LoopDisk(const std::string& kind, int partitions) : m_kind(kind) {
    const UniqueFd fd(open(m_image.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
    const off_t size = off_t{SECTOR} * (FIRST_SECTOR + off_t{PART_SECTORS} * (partitions + 1));
    EXPECT_EQ(0, ftruncate(fd.Get(), size));
    if (partitions > 0) WritePartitionTable(partitions);
    Attach();
    // A kernel that does not read partition tables itself is told of them.
    if (partitions > 0 && access(Node(partitions).c_str(), F_OK) != 0) {
        EXPECT_TRUE(Shell("partx -a " + Node()));
    }
    for (int i = partitions > 0 ? 1 : 0; i <= partitions; ++i) {
        EXPECT_TRUE(Shell(MkfsCommand(kind, Node(i)))) << kind << " on " << Node(i);
    }
}

LoopDisk::~LoopDisk() {
    for (auto mounted = m_mounted.rbegin(); mounted != m_mounted.rend(); ++mounted) {
        umount2(mounted->c_str(), MNT_DETACH);
    }
    Detach();
}

std::string LoopDisk::Node(int partition) const {
    return "/dev/" + m_name + (partition == 0 ? "" : "p" + std::to_string(partition));
}

std::string LoopDisk::Mount(const std::string& folder, int partition, const std::string& options) {
    EXPECT_TRUE(Shell("mkdir -p '" + folder + "'"));
    const std::string tool =
        m_kind == "exfat" ? "mount.exfat-fuse -o " + options + " " : "mount -o " + options + " ";
    EXPECT_TRUE(Shell(tool + Node(partition) + " '" + folder + "'")) << tool << folder;
    m_mounted.push_back(folder);
    return folder;
}

std::string LoopDisk::Bind(const std::string& from, const std::string& to) {
    EXPECT_TRUE(Shell("mkdir -p '" + to + "'"));
    EXPECT_EQ(0, mount(from.c_str(), to.c_str(), nullptr, MS_BIND, nullptr)) << to;
    m_mounted.push_back(to);
    return to;
}

void LoopDisk::Exchange(LoopDisk& other) {
    const std::string name = m_name;
    Detach();
    other.Detach();
    std::swap(m_image, other.m_image);
    EXPECT_TRUE(Shell("losetup -P /dev/" + name + " '" + m_image + "'"));
    m_name = name;
}

void LoopDisk::Attach() {
    const std::string out = m_folder / "name";
    EXPECT_EQ(0, system(("losetup -fP --show '" + m_image + "' > '" + out + "'").c_str()));
    std::ifstream(out) >> m_name;
    m_name = m_name.substr(m_name.rfind('/') + 1);
    EXPECT_FALSE(m_name.empty());
}

void LoopDisk::Detach() {
    if (m_name.empty()) return;
    Shell("partx -d /dev/" + m_name);
    Shell("losetup -d /dev/" + m_name);
    m_name.clear();
}

void LoopDisk::WritePartitionTable(int partitions) const {
    unsigned char sector[SECTOR] = {};
    const auto put = [](unsigned char* at, uint32_t value) {
        for (int i = 0; i < 4; ++i) at[i] = static_cast<unsigned char>(value >> (8 * i));
    };
    for (int i = 0; i < partitions; ++i) {
        unsigned char* entry = sector + 446 + 16 * i;
        entry[4] = 0x83;
        put(entry + 8, FIRST_SECTOR + PART_SECTORS * static_cast<uint32_t>(i));
        put(entry + 12, PART_SECTORS);
    }
    sector[510] = 0x55;
    sector[511] = 0xAA;
    const UniqueFd fd(open(m_image.c_str(), O_WRONLY | O_CLOEXEC));
    EXPECT_EQ(ssize_t{SECTOR}, pwrite(fd.Get(), sector, SECTOR, 0));
}
