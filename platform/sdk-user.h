// Users, groups and the directory services that they come from.
//
// Threads: any; each operation holds the lock of the layer for its platform call. An object is used
// by one thread at a time. Failures are logged with the platform's error where they happen.
#pragma once

#include <sys/types.h>

#include <memory>
#include <string>
#include <vector>

namespace SDK {

// Owns the platform's record of one user; closed until one of the Open...() has succeeded.
class User {
public:
    User();
    ~User();
    User(User&& other) noexcept;
    User& operator=(User&& other) noexcept;
    User(const User&) = delete;
    User& operator=(const User&) = delete;

    // Frees an earlier record and reads the user. 0, or -1 and the object is closed.
    [[nodiscard]] int Open(const std::string& name);
    [[nodiscard]] int OpenByUID(uid_t uid);
    [[nodiscard]] bool IsValid() const { return m_record != nullptr; }

    // Empty, and -1 as an id, when closed.
    [[nodiscard]] std::string GetName() const;
    [[nodiscard]] std::string GetHomePath() const;
    [[nodiscard]] uid_t GetUID() const;
    [[nodiscard]] gid_t GetGID() const;
    // True when the account has expired; also when closed and on failure: such a user gets nothing.
    [[nodiscard]] bool IsExpired() const;

private:
    struct Record;
    std::unique_ptr<Record> m_record;
};

// The full account name of a name as typed at login. 0, or -1 with the out unchanged.
[[nodiscard]] int ConvertLoginName(const std::string& login_name, std::string& account_name);

// The home folder of a user; empty on failure.
[[nodiscard]] std::string GetHomePath(const std::string& user_name);
// True when home folders have a recycle bin.
[[nodiscard]] bool IsHomeRecycleBinEnabled();

// The name of a group; empty on failure.
[[nodiscard]] std::string GetGroupName(gid_t gid);
// The names of a group's members. 0, or -1 and an empty list.
[[nodiscard]] int ListGroupMembers(const std::string& group_name,
                                   std::vector<std::string>& members);
// True for a member of the administrators; false on failure.
[[nodiscard]] bool IsAdmin(uid_t uid);

// What the appliance is joined to, or offers.
[[nodiscard]] bool IsServiceEnabled(const std::string& service);
[[nodiscard]] bool IsLDAPBound();
[[nodiscard]] bool IsWindowsDomainJoined();
[[nodiscard]] bool IsUserHomeEnabled();

}  // namespace SDK
