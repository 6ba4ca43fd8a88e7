// Shared folders of the appliance, as the platform knows them.
//
// Threads: any; each operation holds the lock of the layer for its platform call. An object is used
// by one thread at a time. Failures are logged with the platform's error where they happen.
#pragma once

#include <memory>
#include <string>
#include <vector>

namespace SDK {

// Owns the platform's record of one share; closed until Open() has succeeded.
class Share {
public:
    Share();
    ~Share();
    Share(Share&& other) noexcept;
    Share& operator=(Share&& other) noexcept;
    Share(const Share&) = delete;
    Share& operator=(const Share&) = delete;

    // Frees an earlier record and reads the share of this name. 0, or -1 and the object is closed.
    [[nodiscard]] int Open(const std::string& name);
    [[nodiscard]] bool IsValid() const { return m_record != nullptr; }
    // The folder of the share; empty when closed.
    [[nodiscard]] std::string GetPath() const;
    // The volume that holds the share; empty when closed and on failure.
    [[nodiscard]] std::string GetVolumePath() const;

    // False when closed and on failure.
    [[nodiscard]] bool IsRecycleBinEnabled() const;
    [[nodiscard]] bool IsRecycleBinAdminOnly() const;
    // False for an encrypted share that is locked, and on failure; true when closed.
    [[nodiscard]] bool IsMounted() const;
    // True for a share of the kind that can be locked; false when closed and on failure.
    [[nodiscard]] bool IsEncrypted() const;
    // True when the share lies on a plugged-in volume (below "/volumeUSB").
    [[nodiscard]] bool IsOnUSBVolume() const;
    // True when the share is read-only because it is the demoted side of a replica.
    [[nodiscard]] bool IsReadOnlyReplica() const;
    // The right of a user on this share: 0 none, 1 read, 2 write; -1 when closed and on failure.
    [[nodiscard]] int GetUserRight(const std::string& user) const;

private:
    struct Record;
    std::unique_ptr<Record> m_record;
};

// The recycle bin of the share that holds `path`; empty on failure.
[[nodiscard]] std::string GetShareBinPath(const std::string& path);

// The share that holds `path`, its name and its folder. 0, or -1 with the outs unchanged.
[[nodiscard]] int GetShareNameByPath(const std::string& path, std::string& share_name,
                                     std::string& share_path);

// The names of the shares of these kinds (1 of the box, 2 plugged-in devices, 3 both), sorted.
// 0, or -1 and an empty list.
[[nodiscard]] int ListShares(int types, std::vector<std::string>& names);

// Makes the folder of a recycle bin at `path`, with its rights, its archive bits and the icon file
// that desktop clients read; nothing is done when the path exists. 0, or -1: what was made stays.
[[nodiscard]] int CreateRecycleBin(const std::string& path, bool admin_only);
// Gives everyone, or administrators alone, all rights on `path` by one access control entry, and
// the folder to root. 0 or -1.
[[nodiscard]] int SetRecycleBinPermission(const std::string& path, bool admin_only);

}  // namespace SDK
