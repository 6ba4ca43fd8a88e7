#include "scratch-disk.h"

#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <memory>

#include "utils/unique-fd.h"

namespace {

bool HasProgram(const std::string& name) {
    return system(("command -v " + name + " >/dev/null 2>&1").c_str()) == 0;
}

// What it wrote, without the newline at the end.
std::string OutputOf(const std::string& command) {
    const std::unique_ptr<FILE, FreeWith<pclose>> pipe(popen(command.c_str(), "re"));
    std::string output;
    std::array<char, 256> buffer;
    while (pipe && fgets(buffer.data(), buffer.size(), pipe.get()) != nullptr) {
        output += buffer.data();
    }
    while (output.ends_with('\n')) output.pop_back();
    return output;
}

// Once for the process: what the tests mount is not seen by the rest of the machine.
bool HavePrivateMounts() {
    static const bool is_private =
        unshare(CLONE_NEWNS) == 0 && mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0;
    return is_private;
}

}  // namespace

bool RunCommand(const std::string& command) {
    const int status = system((command + " >/dev/null 2>&1").c_str());
    EXPECT_EQ(0, status) << command;
    return status == 0;
}

std::string ScratchDisk::WhyNot(const std::string& kind) {
    if (geteuid() != 0) return "mounting needs root";
    if (access("/dev/loop-control", F_OK) != 0) return "no loop devices";
    if (!HavePrivateMounts()) return "no private mount namespace";
    for (const std::string& program :
         {std::string("losetup"), "mkfs." + kind,
          kind == "exfat" ? std::string("mount.exfat-fuse") : std::string("mount")}) {
        if (!HasProgram(program)) return "no program " + program;
    }
    return {};
}

ScratchDisk::ScratchDisk(const std::string& kind, uint64_t size_mib) : m_kind(kind) {
    EXPECT_EQ("", WhyNot(kind));
    const std::string image = m_folder / "image";
    RunCommand("truncate -s " + std::to_string(size_mib) + "M " + image);
    RunCommand("mkfs." + kind + " " + image);
    m_device = OutputOf("losetup --show -f " + image);
    EXPECT_NE("", m_device);
    Mount(false);
}

ScratchDisk::~ScratchDisk() {
    Unmount();
    // Waits for nothing: a device in use is detached when it is given back.
    if (!m_device.empty()) RunCommand("losetup -d " + m_device);
}

void ScratchDisk::Remount(bool is_read_only) {
    Unmount();
    Mount(is_read_only);
}

void ScratchDisk::Mount(bool is_read_only) {
    const std::string program = m_kind == "exfat" ? "mount.exfat-fuse" : "mount";
    const std::string options = is_read_only ? " -o ro " : " ";
    RunCommand(program + options + m_device + " " + m_path);
}

void ScratchDisk::Unmount() { RunCommand("umount " + m_path); }
