#include "fault-injection.h"

#include <dirent.h>
#include <dlfcn.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>

namespace {

std::atomic<int> g_readdir_error{0};
std::atomic<int> g_readdir_after{0};
std::atomic<int> g_fsync_error{0};
std::atomic<bool> g_hide_types{false};
std::atomic<void (*)(const char*)> g_on_readdir{nullptr};

template <typename Function>
Function RealOne(const char* name) {
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

}  // namespace

extern "C" {

dirent* readdir(DIR* stream) {
    static const auto real = RealOne<dirent* (*)(DIR*)>("readdir");
    const int error = g_readdir_error;
    if (error != 0 && g_readdir_after-- <= 0) {
        errno = error;
        return nullptr;
    }
    dirent* entry = real(stream);
    if (entry != nullptr && g_hide_types) entry->d_type = DT_UNKNOWN;
    if (entry != nullptr && g_on_readdir != nullptr) g_on_readdir.load()(entry->d_name);
    return entry;
}

int fsync(int fd) {
    static const auto real = RealOne<int (*)(int)>("fsync");
    if (g_fsync_error == 0) return real(fd);
    errno = g_fsync_error;
    return -1;
}

}  // extern "C"

FailReadDir::FailReadDir(int after, int error) {
    g_readdir_after = after;
    g_readdir_error = error;
}
FailReadDir::~FailReadDir() { g_readdir_error = 0; }

FailFsync::FailFsync(int error) { g_fsync_error = error; }
FailFsync::~FailFsync() { g_fsync_error = 0; }

HideDirTypes::HideDirTypes() { g_hide_types = true; }
HideDirTypes::~HideDirTypes() { g_hide_types = false; }

OnReadDir::OnReadDir(void (*action)(const char*)) { g_on_readdir = action; }
OnReadDir::~OnReadDir() { g_on_readdir = nullptr; }
