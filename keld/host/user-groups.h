// Accounts of the system's user database. Threads: any.
#pragma once

#include <sys/types.h>

#include <optional>
#include <string>
#include <vector>

namespace keld_host {

struct Account {
    std::string name;
    std::string home;
    uid_t uid = 0;
    gid_t gid = 0;

    // Whether the group is one of the account's, the first one included.
    [[nodiscard]] bool IsInGroup(gid_t group) const;
};

// Empty when there is none; errno is 0 then, else it tells why the database could not answer.
[[nodiscard]] std::optional<Account> FindAccount(const std::string& name);
[[nodiscard]] std::optional<Account> FindAccount(uid_t uid);

struct Group {
    std::string name;
    gid_t gid = 0;
    std::vector<std::string> members;  // as the group lists them: without those of the first group
};

[[nodiscard]] std::optional<Group> FindGroup(const std::string& name);
[[nodiscard]] std::optional<Group> FindGroup(gid_t gid);

}  // namespace keld_host
