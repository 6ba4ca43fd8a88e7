#include "listing-faults.h"

#include <dirent.h>
#include <dlfcn.h>
#include <sys/types.h>

#include <atomic>
#include <cerrno>

namespace {
std::atomic<int> g_entries_until_error{-1};  // below 0: no error
std::atomic<int> g_folders_until_error{-1};
std::atomic<int> g_folder_error{0};
}  // namespace

extern "C" struct dirent* readdir(DIR* dir) {
    static const auto real = reinterpret_cast<struct dirent* (*)(DIR*)>(
        dlsym(RTLD_NEXT, sizeof(off_t) == sizeof(long) ? "readdir" : "readdir64"));
    if (g_entries_until_error.load() >= 0 && g_entries_until_error.fetch_sub(1) == 0) {
        errno = EIO;
        return nullptr;
    }
    return real(dir);
}

extern "C" DIR* fdopendir(int fd) {
    static const auto real = reinterpret_cast<DIR* (*)(int)>(dlsym(RTLD_NEXT, "fdopendir"));
    if (g_folders_until_error.load() >= 0 && g_folders_until_error.fetch_sub(1) == 0) {
        errno = g_folder_error;
        return nullptr;
    }
    return real(fd);
}

BreakListing::BreakListing(int entries) { g_entries_until_error = entries; }
BreakListing::~BreakListing() { g_entries_until_error = -1; }

CloseFolder::CloseFolder(int folders, int error) {
    g_folder_error = error;
    g_folders_until_error = folders;
}
CloseFolder::~CloseFolder() { g_folders_until_error = -1; }
