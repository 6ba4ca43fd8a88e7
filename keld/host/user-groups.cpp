#include "host/user-groups.h"

#include <grp.h>
#include <pwd.h>

#include <cerrno>

namespace keld_host {
namespace {

constexpr size_t FIRST_BUFFER = 4096;
constexpr size_t LAST_BUFFER = size_t{16} << 20;  // a group of hundreds of thousands of members

// Calls `ask(record, buffer, found)`, one of the get...r functions, with a buffer that is large
// enough; `read` then takes what it needs out of the record.
template <typename Record, typename Result, typename Ask, typename Read>
std::optional<Result> Lookup(Ask ask, Read read) {
    Record record{};
    Record* found = nullptr;
    for (size_t size = FIRST_BUFFER; size <= LAST_BUFFER; size *= 4) {
        std::vector<char> buffer(size);
        const int error = ask(&record, buffer, &found);
        if (error == ERANGE) continue;
        errno = error;
        if (error != 0 || found == nullptr) return std::nullopt;
        return read(record);
    }
    errno = ERANGE;
    return std::nullopt;
}

Account ReadAccount(const passwd& record) {
    return {record.pw_name, record.pw_dir, record.pw_uid, record.pw_gid};
}

Group ReadGroup(const group& record) {
    Group found{record.gr_name, record.gr_gid, {}};
    for (char** member = record.gr_mem; member != nullptr && *member != nullptr; ++member) {
        found.members.emplace_back(*member);
    }
    return found;
}

}  // namespace

bool Account::IsInGroup(gid_t group) const {
    int count = 64;
    std::vector<gid_t> groups(static_cast<size_t>(count));
    while (getgrouplist(name.c_str(), gid, groups.data(), &count) < 0) {
        if (static_cast<size_t>(count) <= groups.size()) return group == gid;
        groups.resize(static_cast<size_t>(count));
    }
    for (int i = 0; i < count; ++i) {
        if (groups[static_cast<size_t>(i)] == group) return true;
    }
    return false;
}

std::optional<Account> FindAccount(const std::string& name) {
    return Lookup<passwd, Account>(
        [&](passwd* record, std::vector<char>& buffer, passwd** found) {
            return getpwnam_r(name.c_str(), record, buffer.data(), buffer.size(), found);
        },
        ReadAccount);
}

std::optional<Account> FindAccount(uid_t uid) {
    return Lookup<passwd, Account>(
        [&](passwd* record, std::vector<char>& buffer, passwd** found) {
            return getpwuid_r(uid, record, buffer.data(), buffer.size(), found);
        },
        ReadAccount);
}

std::optional<Group> FindGroup(const std::string& name) {
    return Lookup<group, Group>(
        [&](group* record, std::vector<char>& buffer, group** found) {
            return getgrnam_r(name.c_str(), record, buffer.data(), buffer.size(), found);
        },
        ReadGroup);
}

std::optional<Group> FindGroup(gid_t gid) {
    return Lookup<group, Group>(
        [&](group* record, std::vector<char>& buffer, group** found) {
            return getgrgid_r(gid, record, buffer.data(), buffer.size(), found);
        },
        ReadGroup);
}

}  // namespace keld_host
