#include "platform/sdk-file-system.h"

#include <keld/acl.h>
#include <keld/error.h>
#include <keld/fs.h>
#include <sys/quota.h>

#include <cerrno>
#include <cstring>

#include "platform/sdk-mutex.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace SDK {
namespace {

constexpr uint64_t QUOTA_BLOCK_SIZE = 1024;  // limits are told in blocks, the use in bytes
constexpr int ACL_SUPPORT_FLAGS = 1;
constexpr int NO_FD = -1;

using UniqueAcl = std::unique_ptr<KELDACL, FreeWith<KELDACLFree>>;

}  // namespace

struct FileSystem::Record {
    explicit Record(KELDFSInfo* record) : info(record) {}
    ~Record() {
        const ReentrantLock lock;
        FSInfoFree(info);
    }
    Record(const Record&) = delete;
    Record& operator=(const Record&) = delete;

    KELDFSInfo* info;
};

FileSystem::FileSystem() = default;
FileSystem::~FileSystem() = default;
FileSystem::FileSystem(FileSystem&& other) noexcept = default;
FileSystem& FileSystem::operator=(FileSystem&& other) noexcept = default;

int FileSystem::Open(const std::string& path) {
    m_record.reset();
    const ReentrantLock lock;
    KELDFSInfo* info = nullptr;
    const int result = FSInfoGet(path.c_str(), &info);
    if (result < 0 || info == nullptr) {
        SLOG_ERR("FSInfoGet(%s): %d, Error code %d\n", path.c_str(), result, KLIBCErrGet());
        return -1;
    }
    m_record = std::make_unique<Record>(info);
    return 0;
}

std::string FileSystem::GetDevPath() const { return IsValid() ? m_record->info->device_path : ""; }

std::string FileSystem::GetMountPath() const { return IsValid() ? m_record->info->mount_path : ""; }

int FileSystem::GetUserQuota(uid_t uid, Quota& quota) const {
    if (!IsValid()) {
        errno = EINVAL;
        return -1;
    }
    const ReentrantLock lock;
    dqblk block = {};
    const char* device = m_record->info->device_path;
    if (quotactl(QCMD(Q_GETQUOTA, USRQUOTA), device, static_cast<int>(uid),
                 reinterpret_cast<caddr_t>(&block)) != 0) {
        SLOG_ERR("quotactl(%s): %s\n", device, strerror(errno));
        return -1;
    }
    quota.used = block.dqb_curspace;
    quota.soft_limit = block.dqb_bsoftlimit * QUOTA_BLOCK_SIZE;
    quota.hard_limit = block.dqb_bhardlimit * QUOTA_BLOCK_SIZE;
    return 0;
}

bool IsAclSupported(const std::string& path) {
    const ReentrantLock lock;
    return KELDACLIsSupport(path.c_str(), NO_FD, ACL_SUPPORT_FLAGS) > 0;
}

int ReadAcl(const std::string& path, std::vector<AclEntry>& entries) {
    entries.clear();
    const ReentrantLock lock;
    KELDACL* raw = nullptr;
    const int result = KELDACLGet(path.c_str(), NO_FD, &raw);
    const UniqueAcl acl(raw);
    if (result < 0 || !acl) {
        SLOG_ERR("KELDACLGet(%s): %d, Error code %d\n", path.c_str(), result, KLIBCErrGet());
        return -1;
    }
    for (int i = 0; i < acl->count; ++i) {
        const KELDACLEntry& entry = acl->entries[i];
        entries.push_back(
            {entry.tag, entry.id, entry.permission, entry.inherit, entry.allow != 0, entry.level});
    }
    return 0;
}

int WriteAcl(const std::string& path, const std::vector<AclEntry>& entries) {
    const ReentrantLock lock;
    const UniqueAcl acl(KELDACLAlloc(static_cast<int>(entries.size())));
    if (!acl) {
        SLOG_ERR("KELDACLAlloc: Error code %d\n", KLIBCErrGet());
        return -1;
    }
    for (size_t i = 0; i < entries.size(); ++i) {
        const AclEntry& entry = entries[i];
        acl->entries[i] = {entry.tag,           entry.id,   entry.permission, entry.inherit,
                           entry.allow ? 1 : 0, entry.level};
    }
    const int result = KELDACLSet(path.c_str(), NO_FD, acl.get());
    if (result < 0) {
        SLOG_ERR("KELDACLSet(%s): %d, Error code %d\n", path.c_str(), result, KLIBCErrGet());
        return -1;
    }
    return 0;
}

}  // namespace SDK
