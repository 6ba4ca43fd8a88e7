// File systems and display paths.
#include <keld/fs.h>

#include <cerrno>
#include <cstdlib>
#include <memory>
#include <string>

#include "host/host-error.h"
#include "host/mount-table.h"
#include "host/share-table.h"
#include "host/text.h"
#include "utils/unique-fd.h"

using keld_host::Fail;
using keld_host::FailErrno;

namespace {

struct FileSystemRecord : KELDFSInfo {
    explicit FileSystemRecord(const keld_host::MountEntry& mount)
        : targetText(mount.target), sourceText(mount.source), typeText(mount.type) {
        mount_path = targetText.c_str();
        device_path = sourceText.c_str();
        type = typeText.c_str();
    }
    std::string targetText;
    std::string sourceText;
    std::string typeText;
};

using UniqueText = std::unique_ptr<char, FreeWith<free>>;

}  // namespace

int FSInfoGet(const char* path, KELDFSInfo** info) {
    if (info == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    *info = nullptr;
    if (path == nullptr || path[0] == '\0') return Fail(KELDERR_INVALID_ARGUMENT);
    const UniqueText real(realpath(path, nullptr));
    if (!real) return FailErrno(errno);
    const auto mounts = keld_host::CurrentMounts();
    const keld_host::MountEntry* mount = mounts ? mounts->FindHolding(real.get()) : nullptr;
    if (mount == nullptr) return Fail(KELDERR_SYSTEM);
    *info = std::make_unique<FileSystemRecord>(*mount).release();
    return 0;
}

void FSInfoFree(KELDFSInfo* info) { delete static_cast<FileSystemRecord*>(info); }

int KELDFSHasMountPoint(const char* path) {
    if (path == nullptr || path[0] != '/') return Fail(KELDERR_INVALID_ARGUMENT);
    const auto mounts = keld_host::CurrentMounts();
    if (!mounts) return Fail(KELDERR_SYSTEM);
    return mounts->FindAt(keld_host::CleanPath(path)) != nullptr ? 1 : 0;
}

int KELDPathResolve(const char* display_path, char* full_path, size_t size) {
    if (display_path == nullptr || display_path[0] != '/') return Fail(KELDERR_INVALID_ARGUMENT);
    const std::string clean = keld_host::CleanPath(display_path);
    const size_t end = clean.find('/', 1);
    const std::string name = clean.substr(1, end == std::string::npos ? end : end - 1);
    const std::string rest = end == std::string::npos ? "" : clean.substr(end);
    const auto table = keld_host::CurrentShares();
    const keld_host::ShareEntry* share = table->FindByName(name);
    if (share == nullptr) return Fail(KELDERR_SRC_MISS);
    return keld_host::FillBuffer(share->path + rest, full_path, size)
               ? 0
               : Fail(KELDERR_INVALID_ARGUMENT);
}
