// Users and groups of the system.
#include <keld/user.h>
#include <pwd.h>
#include <shadow.h>
#include <strings.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <ctime>
#include <memory>
#include <mutex>
#include <string>

#include "host/host-error.h"
#include "host/sz-list.h"
#include "host/text.h"
#include "host/user-groups.h"

using keld_host::Account;
using keld_host::Fail;
using keld_host::FailErrno;
using keld_host::FindAccount;
using keld_host::FindGroup;

namespace {

// Groups whose members may administer the machine, by the custom of the distributions.
constexpr const char* kAdminGroups[] = {"sudo", "wheel", "administrators"};

constexpr time_t SECONDS_A_DAY = 86400;

struct UserRecord : KELDUser {
    explicit UserRecord(const Account& account) : nameText(account.name), homeText(account.home) {
        name = nameText.c_str();
        home = homeText.c_str();
        uid = account.uid;
        gid = account.gid;
    }
    std::string nameText;
    std::string homeText;
};

struct GroupRecord : KELDGroup {
    explicit GroupRecord(const keld_host::Group& group) : nameText(group.name) {
        name = nameText.c_str();
        gid = group.gid;
    }
    std::string nameText;
};

int FailLookup() { return errno == 0 ? Fail(KELDERR_SRC_MISS) : FailErrno(errno); }

int GiveUser(const std::optional<Account>& account, KELDUser** user) {
    if (!account) return FailLookup();
    *user = std::make_unique<UserRecord>(*account).release();
    return 0;
}

// getpwent keeps one place in the database for the whole process.
std::mutex g_enumeration;

void AddFirstGroupMembers(gid_t gid, std::vector<std::string>& names) {
    const std::lock_guard lock(g_enumeration);
    setpwent();
    while (const passwd* record = getpwent()) {
        if (record->pw_gid == gid) names.emplace_back(record->pw_name);
    }
    endpwent();
}

}  // namespace

int KELDUserGet(const char* name, KELDUser** user) {
    if (user == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    *user = nullptr;
    if (name == nullptr || name[0] == '\0') return Fail(KELDERR_INVALID_ARGUMENT);
    return GiveUser(FindAccount(std::string(name)), user);
}

int KELDUserGetByUID(uid_t uid, KELDUser** user) {
    if (user == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    *user = nullptr;
    return GiveUser(FindAccount(uid), user);
}

void KELDUserFree(KELDUser* user) { delete static_cast<UserRecord*>(user); }

int KELDUserCheckExpired(const KELDUser* user) {
    if (user == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    spwd record{};
    spwd* found = nullptr;
    std::vector<char> buffer(16384);
    const int error = getspnam_r(user->name, &record, buffer.data(), buffer.size(), &found);
    if (error != 0 && error != ENOENT) return FailErrno(error);
    // An account without an entry of its own has no date at which it runs out.
    if (found == nullptr || record.sp_expire < 0) return 0;
    return time(nullptr) / SECONDS_A_DAY >= record.sp_expire ? 1 : 0;
}

int KELDUserLoginNameConvert(const char* login, char* name, size_t size) {
    if (login == nullptr || login[0] == '\0') return Fail(KELDERR_INVALID_ARGUMENT);
    const std::string full = login;
    std::string plain = full.substr(full.rfind('\\') + 1);  // DOMAIN\user
    plain = plain.substr(0, plain.find('@'));               // user@domain
    std::string lower = plain;
    std::transform(lower.begin(), lower.end(), lower.begin(),
                   [](unsigned char c) { return static_cast<char>(tolower(c)); });
    for (const std::string& candidate : {full, plain, lower}) {
        const auto account = FindAccount(candidate);
        if (!account) continue;
        return keld_host::FillBuffer(account->name, name, size) ? 0
                                                                : Fail(KELDERR_INVALID_ARGUMENT);
    }
    return FailLookup();
}

int KELDGroupGetByGID(gid_t gid, KELDGroup** group) {
    if (group == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    *group = nullptr;
    const auto found = FindGroup(gid);
    if (!found) return FailLookup();
    *group = std::make_unique<GroupRecord>(*found).release();
    return 0;
}

void KELDGroupFree(KELDGroup* group) { delete static_cast<GroupRecord*>(group); }

int KELDGroupListMember(const char* group_name, KLIBCSzList** members) {
    if (group_name == nullptr || members == nullptr || *members == nullptr) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    auto group = FindGroup(std::string(group_name));
    if (!group) return FailLookup();
    std::vector<std::string> names = std::move(group->members);
    AddFirstGroupMembers(group->gid, names);
    std::sort(names.begin(), names.end());
    names.erase(std::unique(names.begin(), names.end()), names.end());
    auto& items = (*members)->items;
    items.insert(items.end(), names.begin(), names.end());
    return static_cast<int>(names.size());
}

int KLIBGroupIsAdminGroupMemByUid(uid_t uid) {
    const auto account = FindAccount(uid);
    if (!account) return FailLookup();
    if (uid == 0) return 1;
    for (const char* name : kAdminGroups) {
        const auto group = FindGroup(std::string(name));
        if (group && account->IsInGroup(group->gid)) return 1;
    }
    return 0;
}
