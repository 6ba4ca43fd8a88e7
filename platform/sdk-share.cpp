#include "platform/sdk-share.h"

#include <keld/error.h>
#include <keld/share.h>
#include <keld/volume.h>

#include <climits>
#include <vector>

#include "platform/sdk-mutex.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace SDK {
namespace {

constexpr size_t BIN_PATH_SIZE = 256;
constexpr size_t NAME_PATH_SIZE = 4095;

// What KELDShareAttrReadOnlyIsRegBy is asked for a share that a replica has made read-only.
constexpr const char* REPLICA_OWNER = "dhub";
constexpr const char* REPLICA_KEY = "share_replica_demote";

constexpr const char* USB_VOLUME = "/volumeUSB";

using StatusCall = int (*)(const KELDShare*, int*);

// Asks for a status of an open share; -1 after a failure, which is logged.
int ReadStatus(const KELDShare* share, StatusCall call, const char* failure) {
    const ReentrantLock lock;
    int status = 0;
    if (call(share, &status) >= 0) return status;
    SLOG_ERR("%s", failure);
    return -1;
}

}  // namespace

struct Share::Record {
    explicit Record(KELDShare* record) : share(record) {}
    ~Record() {
        const ReentrantLock lock;
        KELDShareFree(share);
    }
    Record(const Record&) = delete;
    Record& operator=(const Record&) = delete;

    KELDShare* share;
};

Share::Share() = default;
Share::~Share() = default;
Share::Share(Share&& other) noexcept = default;
Share& Share::operator=(Share&& other) noexcept = default;

int Share::Open(const std::string& name) {
    m_record.reset();
    const ReentrantLock lock;
    KELDShare* share = nullptr;
    const int result = KELDShareGet(name.c_str(), &share);
    if (result < 0 || share == nullptr) {
        SLOG_ERR("KELDShareGet(%s): %d, Error code %d\n", name.c_str(), result, KLIBCErrGet());
        return -1;
    }
    m_record = std::make_unique<Record>(share);
    return 0;
}

std::string Share::GetPath() const { return IsValid() ? m_record->share->path : ""; }

std::string Share::GetVolumePath() const {
    if (!IsValid()) return "";
    const ReentrantLock lock;
    char volume[PATH_MAX] = "";
    const char* path = m_record->share->path;
    if (VolumePathParseEx(path, volume, sizeof(volume)) < 0) {
        SLOG_ERR("VolumePathParseEx(%s): Error code %d\n", path, KLIBCErrGet());
        return "";
    }
    return volume;
}

bool Share::IsRecycleBinEnabled() const {
    return IsValid() && ReadStatus(m_record->share, KLIBShareRecycleStatusGet,
                                   "Failed to get share recycle bin status\n") == 1;
}

bool Share::IsRecycleBinAdminOnly() const {
    return IsValid() && ReadStatus(m_record->share, KLIBShareRecycleAdminOnlyStatusGet,
                                   "Failed to get share recycle bin admin only status\n") == 1;
}

bool Share::IsMounted() const {
    return !IsValid() || ReadStatus(m_record->share, KLIBShareIsEncryptedGet,
                                    "Failed to get share mount status\n") == 0;
}

bool Share::IsEncrypted() const {
    return IsValid() && ReadStatus(m_record->share, KLIBShareIsEncryptionGet,
                                   "Failed to get share encryption status\n") == 0;
}

bool Share::IsOnUSBVolume() const { return GetVolumePath().starts_with(USB_VOLUME); }

bool Share::IsReadOnlyReplica() const {
    if (!IsValid()) return false;
    const ReentrantLock lock;
    const char* name = m_record->share->name;
    const int result = KELDShareAttrReadOnlyIsRegBy(name, REPLICA_OWNER, REPLICA_KEY);
    if (result < 0) {
        SLOG_ERR("KELDShareAttrReadOnlyIsRegBy(%s): Error code %d\n", name, KLIBCErrGet());
    }
    return result > 0;
}

int Share::GetUserRight(const std::string& user) const {
    if (!IsValid()) return -1;
    const ReentrantLock lock;
    int right = KELD_SHARE_RIGHT_NONE;
    if (KLIBShareUserRightGet(m_record->share, user.c_str(), &right) < 0) {
        SLOG_ERR("KLIBShareUserRightGet(%s, %s): Error code %d\n", m_record->share->name,
                 user.c_str(), KLIBCErrGet());
        return -1;
    }
    return right;
}

std::string GetShareBinPath(const std::string& path) {
    const ReentrantLock lock;
    char bin[BIN_PATH_SIZE] = "";
    if (KELDShareBinPathGet(path.c_str(), bin, sizeof(bin)) < 0) {
        SLOG_ERR("KELDShareBinPathGet(%s): Error code %d\n", path.c_str(), KLIBCErrGet());
        return "";
    }
    return bin;
}

int GetShareNameByPath(const std::string& path, std::string& share_name, std::string& share_path) {
    const ReentrantLock lock;
    char name[NAME_PATH_SIZE] = "";
    char root[NAME_PATH_SIZE] = "";
    if (KELDShareNamePathGet(path.c_str(), name, sizeof(name), root, sizeof(root)) < 0) {
        SLOG_ERR("KELDShareNamePathGet failed '%s'\n", path.c_str());
        return -1;
    }
    share_name = name;
    share_path = root;
    return 0;
}

int ListShares(int types, std::vector<std::string>& names) {
    names.clear();
    const ReentrantLock lock;
    KLIBCSzList* raw = nullptr;
    const int count = KELDShareDBEnumTypeMatched(types, &raw);
    const std::unique_ptr<KLIBCSzList, FreeWith<KLIBCSzListFree>> list(raw);
    if (count < 0) {
        SLOG_ERR("KELDShareDBEnumTypeMatched(%d): Error code %d\n", types, KLIBCErrGet());
        return -1;
    }
    for (int i = 0; i < count; ++i) {
        const char* name = KLIBCSzListGet(list.get(), i);
        if (name != nullptr) names.emplace_back(name);
    }
    return 0;
}

}  // namespace SDK
