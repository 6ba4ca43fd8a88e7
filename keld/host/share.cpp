// Shares, asked by name or path.
#include <grp.h>
#include <keld/share.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <string>

#include "host/host-error.h"
#include "host/mount-table.h"
#include "host/share-table.h"
#include "host/sz-list.h"
#include "host/text.h"
#include "host/user-groups.h"

using keld_host::CurrentShares;
using keld_host::Fail;
using keld_host::ShareEntry;
using keld_host::ShareTable;

namespace {

// The record with the texts that its fields point at.
struct ShareRecord : KELDShare {
    explicit ShareRecord(const ShareEntry& entry) : nameText(entry.name), pathText(entry.path) {
        name = nameText.c_str();
        path = pathText.c_str();
    }
    std::string nameText;
    std::string pathText;
};

// The share's settings as they are now; `table` keeps them alive.
const ShareEntry* FindAgain(const ShareTable& table, const KELDShare* share) {
    if (share == nullptr) return nullptr;
    const ShareEntry* entry = table.FindByName(share->name);
    return entry != nullptr && entry->path == share->path ? entry : nullptr;
}

// Answers one yes or no of a share: `status` takes what `ask` says.
template <typename Ask>
int GetStatus(const KELDShare* share, int* status, Ask ask) {
    if (share == nullptr || status == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    const auto table = CurrentShares();
    const ShareEntry* entry = FindAgain(*table, share);
    if (entry == nullptr) return Fail(KELDERR_SRC_MISS);
    return ask(*entry);
}

}  // namespace

int KELDShareGet(const char* name, KELDShare** share) {
    if (share == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    *share = nullptr;
    if (name == nullptr || name[0] == '\0') return Fail(KELDERR_INVALID_ARGUMENT);
    const auto table = CurrentShares();
    const ShareEntry* entry = table->FindByName(name);
    if (entry == nullptr) return Fail(KELDERR_SRC_MISS);
    *share = std::make_unique<ShareRecord>(*entry).release();
    return 0;
}

void KELDShareFree(KELDShare* share) { delete static_cast<ShareRecord*>(share); }

int KELDShareNamePathGet(const char* path, char* name, size_t name_size, char* share_path,
                         size_t share_path_size) {
    if (path == nullptr || path[0] != '/') return Fail(KELDERR_INVALID_ARGUMENT);
    const auto table = keld_host::CurrentSharesFor(path);
    const ShareEntry* entry = table->FindByPath(path);
    if (entry == nullptr) return Fail(KELDERR_SRC_MISS);
    const bool isNameFilled = keld_host::FillBuffer(entry->name, name, name_size);
    const bool isPathFilled = keld_host::FillBuffer(entry->path, share_path, share_path_size);
    return isNameFilled && isPathFilled ? 0 : Fail(KELDERR_INVALID_ARGUMENT);
}

int KELDShareBinPathGet(const char* path, char* bin_path, size_t size) {
    if (path == nullptr || path[0] != '/') return Fail(KELDERR_INVALID_ARGUMENT);
    const auto table = keld_host::CurrentSharesFor(path);
    const ShareEntry* entry = table->FindByPath(path);
    if (entry == nullptr) return Fail(KELDERR_SRC_MISS);
    return keld_host::FillBuffer(entry->path + "/#recycle", bin_path, size)
               ? 0
               : Fail(KELDERR_INVALID_ARGUMENT);
}

int KLIBShareIsEncryptedGet(const KELDShare* share, int* status) {
    return GetStatus(share, status, [&](const ShareEntry& entry) {
        *status = 0;
        if (!entry.mountPoint) return 0;
        const auto mounts = keld_host::CurrentMounts();
        if (!mounts) return Fail(KELDERR_SYSTEM);
        *status = mounts->FindAt(entry.path) == nullptr ? 1 : 0;
        return 0;
    });
}

int KLIBShareIsEncryptionGet(const KELDShare* share, int* status) {
    return GetStatus(share, status, [&](const ShareEntry& entry) {
        *status = entry.mountPoint ? 0 : 1;
        return 0;
    });
}

int KLIBShareRecycleStatusGet(const KELDShare* share, int* status) {
    return GetStatus(share, status, [&](const ShareEntry& entry) {
        *status = entry.recycleBin ? 1 : 0;
        return 0;
    });
}

int KLIBShareRecycleAdminOnlyStatusGet(const KELDShare* share, int* status) {
    return GetStatus(share, status, [&](const ShareEntry& entry) {
        *status = entry.recycleBinAdminOnly ? 1 : 0;
        return 0;
    });
}

int KELDShareDBEnumTypeMatched(int types, KLIBCSzList** names) {
    if (names == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    *names = KLIBCSzListAlloc(0);
    if (*names == nullptr) return Fail(KELDERR_SYSTEM);
    const auto table = CurrentShares();
    for (const ShareEntry& entry : table->shares) {
        const int type = entry.isDevice ? KELD_SHARE_TYPE_DEVICE : KELD_SHARE_TYPE_INTERNAL;
        if ((types & type) != 0) (*names)->items.push_back(entry.name);
    }
    std::sort((*names)->items.begin(), (*names)->items.end());
    return static_cast<int>((*names)->items.size());
}

int KLIBShareUserRightGet(const KELDShare* share, const char* user, int* right) {
    if (user == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    return GetStatus(share, right, [&](const ShareEntry& entry) {
        const auto account = keld_host::FindAccount(user);
        if (!account) return Fail(KELDERR_SRC_MISS);
        struct stat info {};
        if (stat(entry.path.c_str(), &info) != 0) return keld_host::FailErrno(errno);
        unsigned bits = info.st_mode & 7;
        if (account->IsInGroup(info.st_gid)) bits = (info.st_mode >> 3) & 7;
        if (account->uid == info.st_uid) bits = (info.st_mode >> 6) & 7;
        if (account->uid == 0) bits = 7;
        *right = KELD_SHARE_RIGHT_NONE;
        // A folder is of use only to one who may also enter it.
        if ((bits & 5) == 5) *right |= KELD_SHARE_RIGHT_READ;
        if ((bits & 3) == 3) *right |= KELD_SHARE_RIGHT_WRITE;
        return 0;
    });
}

int KELDShareAttrReadOnlyIsRegBy(const char* share_name, const char* owner, const char* key) {
    if (share_name == nullptr || owner == nullptr || key == nullptr) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    // Nothing on plain Linux makes a share read-only on behalf of another service.
    return CurrentShares()->FindByName(share_name) != nullptr ? 0 : Fail(KELDERR_SRC_MISS);
}
