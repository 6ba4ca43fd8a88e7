#include "platform/sdk-user.h"

#include <keld/error.h>
#include <keld/keyfile.h>
#include <keld/service.h>
#include <keld/szlist.h>
#include <keld/user.h>

#include <climits>

#include "platform/sdk-mutex.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace SDK {
namespace {

constexpr const char* SYSTEM_CONFIG = "/etc/keldinfo.conf";
constexpr const char* HOME_RECYCLE_BIN_KEY = "enable_homeshare_recyclebin";
constexpr size_t ACCOUNT_NAME_SIZE = 1024;
constexpr int MEMBERS_AT_FIRST = 64;

// The answer of a yes-or-no call: no, and a log line, when it cannot be told.
bool IsYes(int answer, const char* call) {
    if (answer < 0) SLOG_ERR("%s: Error code %d\n", call, KLIBCErrGet());
    return answer > 0;
}

}  // namespace

struct User::Record {
    explicit Record(KELDUser* record) : user(record) {}
    ~Record() {
        const ReentrantLock lock;
        KELDUserFree(user);
    }
    Record(const Record&) = delete;
    Record& operator=(const Record&) = delete;

    KELDUser* user;
};

User::User() = default;
User::~User() = default;
User::User(User&& other) noexcept = default;
User& User::operator=(User&& other) noexcept = default;

int User::Open(const std::string& name) {
    m_record.reset();
    const ReentrantLock lock;
    KELDUser* user = nullptr;
    const int result = KELDUserGet(name.c_str(), &user);
    if (result < 0 || user == nullptr) {
        SLOG_ERR("KELDUserGet(%s): %d, Error code %d\n", name.c_str(), result, KLIBCErrGet());
        return -1;
    }
    m_record = std::make_unique<Record>(user);
    return 0;
}

int User::OpenByUID(uid_t uid) {
    m_record.reset();
    const ReentrantLock lock;
    KELDUser* user = nullptr;
    const int result = KELDUserGetByUID(uid, &user);
    if (result < 0 || user == nullptr) {
        SLOG_ERR("KELDUserGetByUID(%u): %d, Error code %d\n", uid, result, KLIBCErrGet());
        return -1;
    }
    m_record = std::make_unique<Record>(user);
    return 0;
}

std::string User::GetName() const { return IsValid() ? m_record->user->name : ""; }

std::string User::GetHomePath() const {
    return IsValid() && m_record->user->home != nullptr ? m_record->user->home : "";
}

uid_t User::GetUID() const { return IsValid() ? m_record->user->uid : static_cast<uid_t>(-1); }

gid_t User::GetGID() const { return IsValid() ? m_record->user->gid : static_cast<gid_t>(-1); }

bool User::IsExpired() const {
    if (!IsValid()) return true;
    const ReentrantLock lock;
    const int expired = KELDUserCheckExpired(m_record->user);
    if (expired < 0) {
        SLOG_ERR("KELDUserCheckExpired(%s): Error code %d\n", m_record->user->name, KLIBCErrGet());
    }
    return expired != 0;
}

int ConvertLoginName(const std::string& login_name, std::string& account_name) {
    const ReentrantLock lock;
    char name[ACCOUNT_NAME_SIZE] = "";
    if (KELDUserLoginNameConvert(login_name.c_str(), name, sizeof(name)) < 0) {
        SLOG_ERR("KELDUserLoginNameConvert(%s): Error code %d\n", login_name.c_str(),
                 KLIBCErrGet());
        return -1;
    }
    account_name = name;
    return 0;
}

std::string GetHomePath(const std::string& user_name) {
    User user;
    return user.Open(user_name) == 0 ? user.GetHomePath() : "";
}

bool IsHomeRecycleBinEnabled() {
    const ReentrantLock lock;
    return IsYes(KLIBCFileCheckKeyValue(SYSTEM_CONFIG, HOME_RECYCLE_BIN_KEY, "yes"),
                 "KLIBCFileCheckKeyValue");
}

std::string GetGroupName(gid_t gid) {
    const ReentrantLock lock;
    KELDGroup* raw = nullptr;
    const int result = KELDGroupGetByGID(gid, &raw);
    const std::unique_ptr<KELDGroup, FreeWith<KELDGroupFree>> group(raw);
    if (result < 0 || !group) {
        SLOG_ERR("KELDGroupGetByGID(%u): %d, Error code %d\n", gid, result, KLIBCErrGet());
        return "";
    }
    return group->name;
}

int ListGroupMembers(const std::string& group_name, std::vector<std::string>& members) {
    members.clear();
    const ReentrantLock lock;
    KLIBCSzList* raw = KLIBCSzListAlloc(MEMBERS_AT_FIRST);
    if (raw == nullptr) {
        SLOG_ERR("KLIBCSzListAlloc: Error code %d\n", KLIBCErrGet());
        return -1;
    }
    const int count = KELDGroupListMember(group_name.c_str(), &raw);
    const std::unique_ptr<KLIBCSzList, FreeWith<KLIBCSzListFree>> list(raw);
    if (count < 0) {
        SLOG_ERR("KELDGroupListMember(%s): Error code %d\n", group_name.c_str(), KLIBCErrGet());
        return -1;
    }
    for (int i = 0; i < count; ++i) {
        const char* name = KLIBCSzListGet(list.get(), i);
        if (name != nullptr) members.emplace_back(name);
    }
    return 0;
}

bool IsAdmin(uid_t uid) {
    const ReentrantLock lock;
    return IsYes(KLIBGroupIsAdminGroupMemByUid(uid), "KLIBGroupIsAdminGroupMemByUid");
}

bool IsServiceEnabled(const std::string& service) {
    const ReentrantLock lock;
    return IsYes(KLIBServiceIsEnabled(service.c_str()), "KLIBServiceIsEnabled");
}

bool IsLDAPBound() {
    const ReentrantLock lock;
    return IsYes(KELDLDAPIsBinded(), "KELDLDAPIsBinded");
}

bool IsWindowsDomainJoined() {
    const ReentrantLock lock;
    return IsYes(KELDWinsIsJoined(), "KELDWinsIsJoined");
}

bool IsUserHomeEnabled() {
    const ReentrantLock lock;
    return IsYes(KELDServiceUserHomeIsEnabled(), "KELDServiceUserHomeIsEnabled");
}

}  // namespace SDK
