#include "spelling-faults.h"

#include <dirent.h>
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <sys/types.h>
#include <unistd.h>

#include <climits>
#include <cstring>
#include <string_view>
#include <utility>

namespace {

struct Spelling {
    std::string root;
    std::string found;
    std::string listed;
};

Spelling& Present() {
    static Spelling present;
    return present;
}

bool IsBelowRoot(DIR* dir) {
    char path[PATH_MAX];
    const std::string link = "/proc/self/fd/" + std::to_string(dirfd(dir));
    const ssize_t length = readlink(link.c_str(), path, sizeof(path));
    return length > 0 &&
           std::string_view(path, static_cast<size_t>(length)).starts_with(Present().root);
}

}  // namespace

extern "C" struct dirent* readdir(DIR* dir) {
    static const auto real = reinterpret_cast<struct dirent* (*)(DIR*)>(
        dlsym(RTLD_NEXT, sizeof(off_t) == sizeof(long) ? "readdir" : "readdir64"));
    struct dirent* const entry = real(dir);
    if (entry != nullptr && Present().found == entry->d_name && IsBelowRoot(dir)) {
        std::memcpy(entry->d_name, Present().listed.data(), Present().listed.size());
    }
    return entry;
}

OtherSpelling::OtherSpelling(std::string root, std::string found, std::string listed) {
    EXPECT_EQ(found.size(), listed.size());
    Present() = {std::move(root), std::move(found), std::move(listed)};
}
OtherSpelling::~OtherSpelling() { Present() = {}; }
