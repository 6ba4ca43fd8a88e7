// Users and groups.
#include <keld/user.h>

#include <cctype>
#include <memory>

#include "fake/fake-state.h"
#include "fake/fake-text-list.h"

namespace {

struct OwnedUser : KELDUser {
    std::string name_text;
    std::string home_text;
};

struct OwnedGroup : KELDGroup {
    std::string name_text;
};

std::string Lower(std::string text) {
    for (char& c : text) c = static_cast<char>(tolower(static_cast<unsigned char>(c)));
    return text;
}

std::optional<FakeUser> FindUser(const std::function<bool(const FakeUser&)>& wanted) {
    const LockedState state;
    for (const FakeUser& user : state->users) {
        if (wanted(user)) return user;
    }
    return std::nullopt;
}

int GiveUser(const std::optional<FakeUser>& found, KELDUser** user) {
    if (!found) return FakeError(KELDERR_SRC_MISS);
    auto record = std::make_unique<OwnedUser>();
    record->name_text = found->name;
    record->home_text = found->home;
    record->name = record->name_text.c_str();
    record->home = record->home_text.c_str();
    record->uid = found->uid;
    record->gid = found->gid;
    *user = record.release();
    return 0;
}

}  // namespace

extern "C" {

int KELDUserGet(const char* name, KELDUser** user) {
    *user = nullptr;
    if (FakeFails("KELDUserGet", {FakeText(name)})) return -1;
    return GiveUser(FindUser([&](const FakeUser& known) { return known.name == name; }), user);
}

int KELDUserGetByUID(uid_t uid, KELDUser** user) {
    *user = nullptr;
    if (FakeFails("KELDUserGetByUID", {std::to_string(uid)})) return -1;
    return GiveUser(FindUser([&](const FakeUser& known) { return known.uid == uid; }), user);
}

void KELDUserFree(KELDUser* user) {
    FakeRecord("KELDUserFree");
    delete static_cast<OwnedUser*>(user);
}

int KELDUserCheckExpired(const KELDUser* user) {
    if (FakeFails("KELDUserCheckExpired", {user->name})) return -1;
    const auto found = FindUser([&](const FakeUser& known) { return known.name == user->name; });
    return found && found->expired ? 1 : 0;
}

int KELDUserLoginNameConvert(const char* login, char* name, size_t size) {
    if (FakeFails("KELDUserLoginNameConvert", {FakeText(login)})) return -1;
    const std::string wanted = Lower(FakeText(login));
    const auto found = FindUser([&](const FakeUser& known) { return Lower(known.name) == wanted; });
    if (!found || !FakeFill(found->name, name, size)) return FakeError(KELDERR_SRC_MISS);
    return 0;
}

int KELDGroupGetByGID(gid_t gid, KELDGroup** group) {
    *group = nullptr;
    if (FakeFails("KELDGroupGetByGID", {std::to_string(gid)})) return -1;
    const LockedState state;
    for (const auto& [name, known] : state->groups) {
        if (known.gid != gid) continue;
        auto record = std::make_unique<OwnedGroup>();
        record->name_text = name;
        record->name = record->name_text.c_str();
        record->gid = gid;
        *group = record.release();
        return 0;
    }
    return FakeError(KELDERR_SRC_MISS);
}

void KELDGroupFree(KELDGroup* group) {
    FakeRecord("KELDGroupFree");
    delete static_cast<OwnedGroup*>(group);
}

int KELDGroupListMember(const char* group_name, KLIBCSzList** members) {
    if (FakeFails("KELDGroupListMember", {FakeText(group_name)})) return -1;
    const LockedState state;
    const auto found = state->groups.find(FakeText(group_name));
    if (found == state->groups.end()) return FakeError(KELDERR_SRC_MISS);
    // Another list, as the interface allows.
    auto* grown = new KLIBCSzList(**members);
    delete *members;
    grown->texts.insert(grown->texts.end(), found->second.members.begin(),
                        found->second.members.end());
    *members = grown;
    return static_cast<int>(found->second.members.size());
}

int KLIBGroupIsAdminGroupMemByUid(uid_t uid) {
    if (FakeFails("KLIBGroupIsAdminGroupMemByUid", {std::to_string(uid)})) return -1;
    const auto found = FindUser([&](const FakeUser& known) { return known.uid == uid; });
    if (!found) return FakeError(KELDERR_SRC_MISS);
    return found->admin ? 1 : 0;
}

}  // extern "C"
