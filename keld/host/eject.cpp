#include "host/eject.h"

#include <dirent.h>
#include <fcntl.h>
#include <keld/device.h>
#include <libmount.h>
#include <poll.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <set>

#include "host/host-error.h"
#include "host/text.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

using UniqueMountContext = std::unique_ptr<libmnt_context, FreeWith<mnt_free_context>>;

// 8 s: with the flush before it, an eject stays near what a person waits for at the front panel.
constexpr int UNUSED_LIMIT_MS = 8000;

// The device numbers of a disk and its partitions.
std::set<dev_t> NumbersOf(const BlockDevice& disk) {
    std::set<dev_t> numbers;
    std::vector<std::string> folders{disk.diskPath};
    for (const PartitionPlace& partition : PartitionsOf(disk)) {
        folders.push_back(disk.diskPath + "/" + partition.name);
    }
    for (const std::string& folder : folders) {
        unsigned majorNumber = 0;
        unsigned minorNumber = 0;
        const std::string number = ReadAttribute(folder + "/dev");
        if (sscanf(number.c_str(), "%u:%u", &majorNumber, &minorNumber) == 2) {
            numbers.insert(makedev(majorNumber, minorNumber));
        }
    }
    return numbers;
}

bool HoldsOpen(const std::string& fdFolder, const std::set<dev_t>& numbers) {
    const UniqueDir dir(opendir(fdFolder.c_str()));
    while (const dirent* entry = dir ? readdir(dir.get()) : nullptr) {
        struct stat info {};
        if (entry->d_name[0] == '.' || fstatat(dirfd(dir.get()), entry->d_name, &info, 0) != 0) {
            continue;
        }
        if (S_ISBLK(info.st_mode) && numbers.count(info.st_rdev) != 0) return true;
    }
    return false;
}

bool IsHeldByProcess(const std::set<dev_t>& numbers) {
    const UniqueDir proc(opendir("/proc"));
    while (const dirent* entry = proc ? readdir(proc.get()) : nullptr) {
        if (entry->d_name[0] < '0' || entry->d_name[0] > '9') continue;
        if (HoldsOpen("/proc/" + std::string(entry->d_name) + "/fd", numbers)) return true;
    }
    return false;
}

int WriteSysfs(const std::string& file) {
    const UniqueFd fd(open(file.c_str(), O_WRONLY | O_CLOEXEC));
    if (!fd.IsValid()) return errno;
    return write(fd.Get(), "1", 1) == 1 ? 0 : errno;
}

// The folder of the USB device that the disk hangs on, empty when it is on none.
std::string UsbFolderOf(std::string path) {
    while (path.size() > 1) {
        if (access((path + "/idVendor").c_str(), F_OK) == 0) return path;
        path = ParentOf(path);
    }
    return {};
}

// Other disks below the same USB device, such as the other slots of a card reader.
bool HasOtherDisks(const std::string& usbFolder, const std::string& diskPath) {
    std::vector<std::string> folders{usbFolder};
    while (!folders.empty()) {
        const std::string folder = std::move(folders.back());
        folders.pop_back();
        if (BaseNameOf(ParentOf(folder)) == "block") {
            if (folder != diskPath) return true;
            continue;
        }
        const UniqueDir dir(opendir(folder.c_str()));
        while (const dirent* entry = dir ? readdir(dir.get()) : nullptr) {
            if (entry->d_type == DT_DIR && entry->d_name[0] != '.') {
                folders.push_back(folder + "/" + entry->d_name);
            }
        }
    }
    return false;
}

// Opening a disk exclusively fails while a file system on it is mounted anywhere, also in another
// mount namespace, or while another layer (LVM, RAID) holds it. Returns 0, or an errno.
int FlushUnusedDisk(const BlockDevice& disk) {
    const std::string node = "/dev/" + disk.disk;
    const UniqueFd fd(open(node.c_str(), O_RDONLY | O_CLOEXEC | O_EXCL));
    if (!fd.IsValid()) return errno;
    return fsync(fd.Get()) == 0 ? 0 : errno;
}

int FailStep(const char* step, const std::string& place, int error) {
    SLOG_ERR("eject: cannot %s '%s': %s\n", step, place.c_str(), strerror(error));
    return error == EBUSY ? Fail(KELDERR_FILE_OPERATION) : FailErrno(error);
}

int TakeOut(const BlockDevice& disk, const MountTable& table) {
    const std::vector<MountEntry> mounts = MountsOf(disk, table);
    for (const MountEntry& mount : mounts) {
        const int error = FlushFileSystem(mount.target);
        if (error != 0) return FailStep("flush", mount.target, error);
    }
    bool isFuse = false;
    for (const MountEntry& mount : mounts) {
        const int error = UnmountFileSystem(mount.target);
        if (error != 0) return FailStep("unmount", mount.target, error);
        isFuse = isFuse || mount.IsFuse();
    }
    if (isFuse && !WaitUntilUnused(disk, UNUSED_LIMIT_MS)) {
        return FailStep("release", disk.disk, EBUSY);
    }
    const int error = FlushUnusedDisk(disk);
    if (error != 0) return FailStep("flush", disk.disk, error);
    // Everything is written and unmounted: that is what the caller may rely on. A disk that keeps
    // its power is safe to unplug.
    const int powerError = PowerOff(disk.diskPath);
    if (powerError != 0) {
        SLOG_WARN("eject: cannot power off '%s': %s\n", disk.disk.c_str(), strerror(powerError));
    }
    return 0;
}

}  // namespace

std::vector<MountEntry> MountsOf(const BlockDevice& disk, const MountTable& mounts) {
    const std::set<dev_t> numbers = NumbersOf(disk);
    std::vector<MountEntry> found;
    for (const MountEntry& mount : mounts.mounts) {
        if (mount.block != 0 && numbers.count(mount.block) != 0) found.push_back(mount);
    }
    // Of several on one folder, the last one is on top.
    std::reverse(found.begin(), found.end());
    std::stable_sort(found.begin(), found.end(), [](const MountEntry& a, const MountEntry& b) {
        return std::count(a.target.begin(), a.target.end(), '/') >
               std::count(b.target.begin(), b.target.end(), '/');
    });
    return found;
}

int FlushFileSystem(const std::string& target) {
    const UniqueFd fd(open(target.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!fd.IsValid()) return errno;
    return syncfs(fd.Get()) == 0 ? 0 : errno;
}

int UnmountFileSystem(const std::string& target) {
    const UniqueMountContext context(mnt_new_context());
    if (!context) return ENOMEM;
    // The mount is removed by the kernel; the helper programs would only look up who may do it.
    mnt_context_disable_helpers(context.get(), 1);
    if (mnt_context_set_target(context.get(), target.c_str()) != 0) return ENOMEM;
    const int result = mnt_context_umount(context.get());
    if (result == 0 && mnt_context_get_status(context.get()) == 1) return 0;
    const int error = mnt_context_get_syscall_errno(context.get());
    if (error != 0) return error;
    return result < 0 ? -result : EINVAL;
}

bool WaitUntilUnused(const BlockDevice& disk, int limitMs) {
    const std::set<dev_t> numbers = NumbersOf(disk);
    const auto end = std::chrono::steady_clock::now() + std::chrono::milliseconds(limitMs);
    while (IsHeldByProcess(numbers)) {
        if (std::chrono::steady_clock::now() >= end) return false;
        poll(nullptr, 0, 20);
    }
    return true;
}

int PowerOff(const std::string& diskPath) {
    const std::string usbFolder = UsbFolderOf(diskPath);
    // Before the disk's own folder goes away with the disk.
    const bool isAlone = !usbFolder.empty() && !HasOtherDisks(usbFolder, diskPath);
    const std::string scsiDelete = diskPath + "/device/delete";
    if (access(scsiDelete.c_str(), F_OK) == 0) {
        const int error = WriteSysfs(scsiDelete);
        if (error != 0) return error;
    }
    const std::string usbRemove = usbFolder + "/remove";
    if (!isAlone || access(usbRemove.c_str(), F_OK) != 0) return 0;
    return WriteSysfs(usbRemove);
}

}  // namespace keld_host

int KELDExtStgPullOut(const char* name, int flags) {
    static_cast<void>(flags);
    using namespace keld_host;
    const auto disk = BlockDeviceOf(std::string(name == nullptr ? "" : name));
    if (!disk || disk->isPartition) return Fail(KELDERR_SRC_MISS);
    const auto mounts = CurrentMounts();
    if (!mounts) return Fail(KELDERR_SYSTEM);
    if (!IsPluggedIn(*disk, *CurrentHostConf(), SystemDisks(*mounts))) {
        SLOG_ERR("eject: '%s' is no plugged-in device\n", disk->disk.c_str());
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    return TakeOut(*disk, *mounts);
}
