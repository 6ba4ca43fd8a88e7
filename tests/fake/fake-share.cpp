// Shares, volumes and paths.
#include <keld/fs.h>
#include <keld/share.h>
#include <keld/volume.h>

#include <algorithm>
#include <memory>

#include "fake/fake-state.h"
#include "fake/fake-text-list.h"

namespace {

// A record with the texts that its fields point at.
struct OwnedShare : KELDShare {
    std::string name_text;
    std::string path_text;
};

struct OwnedFSInfo : KELDFSInfo {
    std::string mount_text;
    std::string device_text;
};

struct OwnedVolume : KELDMountVolInfo {
    std::string mount_text;
    std::string device_text;
};

// The share of a record, as it is now.
std::optional<FakeShare> Find(const KELDShare* share) {
    const LockedState state;
    for (const FakeShare& known : FakeAllShares(*state)) {
        if (share != nullptr && known.name == share->name) return known;
    }
    return std::nullopt;
}

int Status(const char* call, const KELDShare* share, int* status,
           const std::function<int(const FakeShare&)>& read) {
    if (FakeFails(call, {share == nullptr ? "" : share->name})) return -1;
    const std::optional<FakeShare> found = Find(share);
    if (!found) return FakeError(KELDERR_SRC_MISS);
    *status = read(*found);
    return 0;
}

KELDMountVolInfo* NewVolume(const FakeVolume& known, const std::string& device_path) {
    auto volume = std::make_unique<OwnedVolume>();
    volume->mount_text = known.mount_path;
    volume->device_text = device_path;
    volume->mount_path = volume->mount_text.c_str();
    volume->device_path = volume->device_text.c_str();
    volume->is_mounted = known.mounted ? 1 : 0;
    volume->is_writable = known.writable ? 1 : 0;
    volume->is_internal = known.internal ? 1 : 0;
    volume->next = nullptr;
    return volume.release();
}

KELDMountVolInfo* NewVolume(const FakeDevice& device) {
    return NewVolume({.mount_path = device.mount_path, .internal = false}, device.dev_path);
}

// The file system that holds a path: a device's, or the volume of a share.
int FindFS(const std::string& path, std::string& mount_path, std::string& device_path) {
    const LockedState state;
    for (const auto& [mount, device] : state->devices) {
        if (!device.mounted || !FakeIsBelow(path, mount)) continue;
        mount_path = mount;
        device_path = device.dev_path;
        return 0;
    }
    const std::optional<FakeShare> share = FakeShareOf(*state, path);
    if (!share) return -1;
    mount_path = share->volume;
    device_path = "/dev/fake-volume";
    return 0;
}

}  // namespace

extern "C" {

int KELDShareGet(const char* name, KELDShare** share) {
    *share = nullptr;
    if (FakeFails("KELDShareGet", {FakeText(name)})) return -1;
    const LockedState state;
    for (const FakeShare& known : FakeAllShares(*state)) {
        if (known.name != name) continue;
        auto record = std::make_unique<OwnedShare>();
        record->name_text = known.name;
        record->path_text = known.path;
        record->name = record->name_text.c_str();
        record->path = record->path_text.c_str();
        *share = record.release();
        return 0;
    }
    return FakeError(KELDERR_SRC_MISS);
}

void KELDShareFree(KELDShare* share) {
    FakeRecord("KELDShareFree");
    delete static_cast<OwnedShare*>(share);
}

int KELDShareNamePathGet(const char* path, char* name, size_t name_size, char* share_path,
                         size_t share_path_size) {
    if (FakeFails("KELDShareNamePathGet", {FakeText(path)})) return -1;
    const LockedState state;
    const std::optional<FakeShare> share = FakeShareOf(*state, FakeText(path));
    if (!share) return FakeError(KELDERR_SRC_MISS);
    if (!FakeFill(share->name, name, name_size) ||
        !FakeFill(share->path, share_path, share_path_size)) {
        return FakeError(KELDERR_INVALID_ARGUMENT);
    }
    return 0;
}

int KELDShareBinPathGet(const char* path, char* bin_path, size_t size) {
    if (FakeFails("KELDShareBinPathGet", {FakeText(path)})) return -1;
    const LockedState state;
    const std::optional<FakeShare> share = FakeShareOf(*state, FakeText(path));
    if (!share) return FakeError(KELDERR_SRC_MISS);
    return FakeFill(share->path + "/#recycle", bin_path, size)
               ? 0
               : FakeError(KELDERR_INVALID_ARGUMENT);
}

int KLIBShareIsEncryptedGet(const KELDShare* share, int* status) {
    return Status("KLIBShareIsEncryptedGet", share, status,
                  [](const FakeShare& found) { return found.locked ? 1 : 0; });
}

int KLIBShareIsEncryptionGet(const KELDShare* share, int* status) {
    return Status("KLIBShareIsEncryptionGet", share, status,
                  [](const FakeShare& found) { return found.lockable ? 0 : 1; });
}

int KLIBShareRecycleStatusGet(const KELDShare* share, int* status) {
    return Status("KLIBShareRecycleStatusGet", share, status,
                  [](const FakeShare& found) { return found.recycle_bin ? 1 : 0; });
}

int KLIBShareRecycleAdminOnlyStatusGet(const KELDShare* share, int* status) {
    return Status("KLIBShareRecycleAdminOnlyStatusGet", share, status,
                  [](const FakeShare& found) { return found.recycle_bin_admin_only ? 1 : 0; });
}

int KELDShareDBEnumTypeMatched(int types, KLIBCSzList** names) {
    *names = nullptr;
    if (FakeFails("KELDShareDBEnumTypeMatched", {std::to_string(types)})) return -1;
    auto list = std::make_unique<KLIBCSzList>();
    const LockedState state;
    if ((types & KELD_SHARE_TYPE_INTERNAL) != 0) {
        for (const auto& [name, share] : state->shares) list->texts.push_back(name);
    }
    if ((types & KELD_SHARE_TYPE_DEVICE) != 0) {
        for (const auto& [path, device] : state->devices) {
            if (device.mounted) list->texts.push_back(device.share_name);
        }
    }
    std::sort(list->texts.begin(), list->texts.end());
    *names = list.release();
    return static_cast<int>((*names)->texts.size());
}

int KLIBShareUserRightGet(const KELDShare* share, const char* user, int* right) {
    if (FakeFails("KLIBShareUserRightGet", {share->name, FakeText(user)})) return -1;
    const std::optional<FakeShare> found = Find(share);
    if (!found || !found->rights.contains(user)) return FakeError(KELDERR_SRC_MISS);
    *right = found->rights.at(user);
    return 0;
}

int KELDShareAttrReadOnlyIsRegBy(const char* share_name, const char* owner, const char* key) {
    if (FakeFails("KELDShareAttrReadOnlyIsRegBy", {share_name, owner, key})) return -1;
    const KELDShare record = {share_name, ""};
    const std::optional<FakeShare> found = Find(&record);
    if (!found) return FakeError(KELDERR_SRC_MISS);
    return found->read_only_by_replica ? 1 : 0;
}

KELDMountVolInfo* KELDMountVolAllEnum(int reserved, int kinds) {
    FakeClearError();
    if (FakeFails("KELDMountVolAllEnum", {std::to_string(reserved), std::to_string(kinds)})) {
        return nullptr;
    }
    if (kinds == 0) kinds = KELD_MOUNT_VOL_INTERNAL | KELD_MOUNT_VOL_REMOVABLE;
    KELDMountVolInfo* first = nullptr;
    KELDMountVolInfo** end = &first;
    const auto append = [&](KELDMountVolInfo* volume) {
        *end = volume;
        end = &volume->next;
    };
    const LockedState state;
    for (const FakeVolume& volume : state->volumes) {
        const int kind = volume.internal ? KELD_MOUNT_VOL_INTERNAL : KELD_MOUNT_VOL_REMOVABLE;
        if ((kinds & kind) != 0) append(NewVolume(volume, "/dev/fake-volume"));
    }
    for (const auto& [path, device] : state->devices) {
        const bool is_asked = (kinds & KELD_MOUNT_VOL_REMOVABLE) != 0;
        if (is_asked && device.mounted) append(NewVolume(device));
    }
    return first;
}

KELDMountVolInfo* KELDMountVolInfoGet(const char* path) {
    if (FakeFails("KELDMountVolInfoGet", {FakeText(path)})) return nullptr;
    const LockedState state;
    for (const FakeVolume& volume : state->volumes) {
        if (volume.mount_path == FakeText(path)) return NewVolume(volume, "/dev/fake-volume");
    }
    const auto found = state->devices.find(FakeText(path));
    if (found == state->devices.end() || !found->second.mounted) return nullptr;
    return NewVolume(found->second);
}

void KELDMountVolInfoFree(KELDMountVolInfo* list) {
    FakeRecord("KELDMountVolInfoFree");
    while (list != nullptr) {
        KELDMountVolInfo* next = list->next;
        delete static_cast<OwnedVolume*>(list);
        list = next;
    }
}

int VolumePathParseEx(const char* path, char* volume_path, size_t size) {
    if (FakeFails("VolumePathParseEx", {FakeText(path)})) return -1;
    const LockedState state;
    const std::optional<FakeShare> share = FakeShareOf(*state, FakeText(path));
    if (!share) return FakeError(KELDERR_SRC_MISS);
    return FakeFill(share->volume, volume_path, size) ? 0 : FakeError(KELDERR_INVALID_ARGUMENT);
}

int KELDVolPathToDevPath(const char* volume_path, char* device_path, size_t size) {
    if (FakeFails("KELDVolPathToDevPath", {FakeText(volume_path)})) return -1;
    const LockedState state;
    const auto found = state->devices.find(FakeText(volume_path));
    if (found == state->devices.end() || !found->second.mounted) return FakeError(KELDERR_SRC_MISS);
    return FakeFill(found->second.dev_path, device_path, size)
               ? 0
               : FakeError(KELDERR_INVALID_ARGUMENT);
}

int FSInfoGet(const char* path, KELDFSInfo** info) {
    *info = nullptr;
    if (FakeFails("FSInfoGet", {FakeText(path)})) return -1;
    auto record = std::make_unique<OwnedFSInfo>();
    if (FindFS(FakeText(path), record->mount_text, record->device_text) < 0) {
        return FakeError(KELDERR_SRC_MISS_PATH);
    }
    record->mount_path = record->mount_text.c_str();
    record->device_path = record->device_text.c_str();
    record->type = "ext4";
    *info = record.release();
    return 0;
}

void FSInfoFree(KELDFSInfo* info) {
    FakeRecord("FSInfoFree");
    delete static_cast<OwnedFSInfo*>(info);
}

int KELDFSHasMountPoint(const char* path) {
    if (FakeFails("KELDFSHasMountPoint", {FakeText(path)})) return -1;
    const LockedState state;
    const auto found = state->devices.find(FakeText(path));
    return found != state->devices.end() && found->second.mounted ? 1 : 0;
}

int KELDPathResolve(const char* display_path, char* full_path, size_t size) {
    if (FakeFails("KELDPathResolve", {FakeText(display_path)})) return -1;
    const std::string text = FakeText(display_path);
    const size_t end = text.find('/', 1);
    const std::string name = text.substr(1, end == std::string::npos ? end : end - 1);
    const LockedState state;
    for (const FakeShare& share : FakeAllShares(*state)) {
        if (share.name != name) continue;
        const std::string rest = end == std::string::npos ? "" : text.substr(end);
        if (FakeFill(share.path + rest, full_path, size)) return 0;
        return FakeError(KELDERR_INVALID_ARGUMENT);
    }
    return FakeError(KELDERR_SRC_MISS);
}

}  // extern "C"
