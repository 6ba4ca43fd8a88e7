// Whether the very device that was seen once is still there.
#include <fcntl.h>
#include <keld/device.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <optional>
#include <string>

#include "host/host-error.h"
#include "host/host-paths.h"
#include "host/mount-table.h"
#include "host/text.h"
#include "utils/unique-fd.h"

using keld_host::Fail;
using keld_host::FailErrno;

namespace {

// What an identity holds, written as one line of numbers. Without a block device behind the file
// system (tmpfs, overlay) the last four are 0, and the file system alone has to do.
struct Identity {
    unsigned fsMajor = 0;
    unsigned fsMinor = 0;
    unsigned blockMajor = 0;
    unsigned blockMinor = 0;
    unsigned long long sequence = 0;  // the kernel counts the disks and media that it has met
    unsigned long long node = 0;      // the device's folder in sysfs, for kernels without a count
};

bool operator==(const Identity& a, const Identity& b) {
    return a.fsMajor == b.fsMajor && a.fsMinor == b.fsMinor && a.blockMajor == b.blockMajor &&
           a.blockMinor == b.blockMinor && a.sequence == b.sequence && a.node == b.node;
}

// An attribute in sysfs; 0 when there is none.
unsigned long long ReadNumber(int folder, const char* name) {
    return strtoull(keld_host::ReadAttributeAt(folder, name).c_str(), nullptr, 10);
}

// Fills in the block device. False when it has gone, or has no medium any more.
bool AddBlock(dev_t block, Identity& identity) {
    identity.blockMajor = major(block);
    identity.blockMinor = minor(block);
    const std::string folder = keld_host::Paths().sysfs + "/dev/block/" +
                               std::to_string(identity.blockMajor) + ":" +
                               std::to_string(identity.blockMinor);
    // The way there is long and is asked before each removal: it is walked once.
    const UniqueFd dir(open(folder.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    struct stat info {};
    if (!dir.IsValid() || fstat(dir.Get(), &info) != 0) return false;
    identity.node = info.st_ino;
    if (ReadNumber(dir.Get(), "size") == 0) return false;
    identity.sequence = ReadNumber(dir.Get(), "diskseq");
    // Of a partition the number stands at its disk, one folder up.
    if (identity.sequence == 0) identity.sequence = ReadNumber(dir.Get(), "../diskseq");
    return true;
}

using UniqueText = std::unique_ptr<char, FreeWith<free>>;

// Who stands behind `path` now. Returns 0; 1 when the path does not answer or its device has gone;
// negative when that cannot be told.
int Look(const char* path, Identity& identity) {
    struct stat info {};
    if (stat(path, &info) != 0) {
        if (errno == ENOMEM) return FailErrno(errno);
        FailErrno(errno);
        return 1;
    }
    identity.fsMajor = major(info.st_dev);
    identity.fsMinor = minor(info.st_dev);
    dev_t block = info.st_dev;
    // FUSE and btrfs file systems have numbers of their own: only their source names the device.
    if (major(block) == 0) {
        const UniqueText real(realpath(path, nullptr));
        const auto mounts = keld_host::CurrentMounts();
        const auto* mount = real && mounts ? mounts->FindHolding(real.get()) : nullptr;
        if (mount == nullptr) return Fail(KELDERR_SYSTEM);
        block = mount->block;
    }
    if (block == 0 || AddBlock(block, identity)) return 0;
    Fail(KELDERR_IO);
    return 1;
}

bool ReadIdentity(const char* text, Identity& identity) {
    char rest = '\0';
    return sscanf(text, "1 fs=%u:%u block=%u:%u sequence=%llu node=%llu%c", &identity.fsMajor,
                  &identity.fsMinor, &identity.blockMajor, &identity.blockMinor, &identity.sequence,
                  &identity.node, &rest) == 6;
}

}  // namespace

int KELDDevIdentityGet(const char* mount_path, char* identity, size_t size) {
    if (mount_path == nullptr || mount_path[0] != '/') return Fail(KELDERR_INVALID_ARGUMENT);
    Identity found;
    if (Look(mount_path, found) != 0) return -1;
    char text[KELD_DEV_IDENTITY_SIZE];
    snprintf(text, sizeof(text), "1 fs=%u:%u block=%u:%u sequence=%llu node=%llu", found.fsMajor,
             found.fsMinor, found.blockMajor, found.blockMinor, found.sequence, found.node);
    return keld_host::FillBuffer(text, identity, size) ? 0 : Fail(KELDERR_INVALID_ARGUMENT);
}

int KELDDevIsPresent(const char* mount_path, const char* identity) {
    Identity wanted;
    if (mount_path == nullptr || identity == nullptr || !ReadIdentity(identity, wanted)) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    Identity found;
    const int result = Look(mount_path, found);
    if (result != 0) return result < 0 ? result : 0;
    return found == wanted ? 1 : 0;
}
