// File systems behind paths: their quota, and access control lists.
//
// Threads: any; each operation holds the lock of the layer for its platform call. Failures are
// logged with the platform's error where they happen.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace SDK {

// Bytes; a limit of 0 is no limit.
struct Quota {
    uint64_t used = 0;
    uint64_t soft_limit = 0;
    uint64_t hard_limit = 0;
};

// Owns the platform's record of one file system; closed until Open() has succeeded.
class FileSystem {
public:
    FileSystem();
    ~FileSystem();
    FileSystem(FileSystem&& other) noexcept;
    FileSystem& operator=(FileSystem&& other) noexcept;
    FileSystem(const FileSystem&) = delete;
    FileSystem& operator=(const FileSystem&) = delete;

    // Frees an earlier record and reads the file system that holds `path`. 0, or -1 and closed.
    [[nodiscard]] int Open(const std::string& path);
    [[nodiscard]] bool IsValid() const { return m_record != nullptr; }
    // Block device and mount path; empty when closed.
    [[nodiscard]] std::string GetDevPath() const;
    [[nodiscard]] std::string GetMountPath() const;
    // A user's quota. 0, or -1 with errno (ESRCH: quotas are off there) and the out unchanged.
    [[nodiscard]] int GetUserQuota(uid_t uid, Quota& quota) const;

private:
    struct Record;
    std::unique_ptr<Record> m_record;
};

// One entry of an access control list, in the platform's numbers.
struct AclEntry {
    int tag = 0;
    uint32_t id = 0;
    uint32_t permission = 0;
    int inherit = 0;
    bool allow = false;
    int level = 0;
};

[[nodiscard]] bool IsAclSupported(const std::string& path);
// 0 or -1; the list is emptied first.
[[nodiscard]] int ReadAcl(const std::string& path, std::vector<AclEntry>& entries);
[[nodiscard]] int WriteAcl(const std::string& path, const std::vector<AclEntry>& entries);

}  // namespace SDK
