#include "updater/rename-faults.h"

#include <dlfcn.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <utility>

namespace {

struct Faults {
    std::string refused;  // empty: none
    int error = 0;
    FailRename::Which which = FailRename::ANY;
    std::string kept;          // empty: none
    std::string last_flushed;  // empty: all are
    bool is_flush_refused = false;
};

Faults& State() {
    static Faults faults;
    return faults;
}

template <typename Function>
Function RealOne(const char* name) {
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

bool IsNamed(const std::string& path, const std::string& end) {
    return !end.empty() && path.ends_with(end);
}

int Rename(int old_dir, const char* old_name, int new_dir, const char* new_name, unsigned flags) {
    static const auto real =
        RealOne<int (*)(int, const char*, int, const char*, unsigned)>("renameat2");
    Faults& faults = State();
    if (IsNamed(new_name, faults.refused) && (flags != 0 || faults.which == FailRename::ANY)) {
        errno = faults.error;
        return -1;
    }
    const int result = real(old_dir, old_name, new_dir, new_name, flags);
    if (result == 0 && IsNamed(new_name, faults.last_flushed)) faults.is_flush_refused = true;
    return result;
}

}  // namespace

extern "C" {

int renameat(int old_dir, const char* old_name, int new_dir, const char* new_name) noexcept {
    return Rename(old_dir, old_name, new_dir, new_name, 0);
}

int renameat2(int old_dir, const char* old_name, int new_dir, const char* new_name,
              unsigned flags) noexcept {
    return Rename(old_dir, old_name, new_dir, new_name, flags);
}

int unlink(const char* name) noexcept {
    static const auto real = RealOne<int (*)(const char*)>("unlink");
    if (!IsNamed(name, State().kept)) return real(name);
    errno = EPERM;
    return -1;
}

int fsync(int fd) {
    static const auto real = RealOne<int (*)(int)>("fsync");
    if (!State().is_flush_refused) return real(fd);
    errno = EIO;
    return -1;
}

}  // extern "C"

FailRename::FailRename(std::string new_name, int error, Which which) {
    State().refused = std::move(new_name);
    State().error = error;
    State().which = which;
}
FailRename::~FailRename() { State().refused.clear(); }

FailUnlink::FailUnlink(std::string name) { State().kept = std::move(name); }
FailUnlink::~FailUnlink() { State().kept.clear(); }

FailFlushAfterRename::FailFlushAfterRename(std::string new_name) {
    State().last_flushed = std::move(new_name);
}
FailFlushAfterRename::~FailFlushAfterRename() {
    State().last_flushed.clear();
    State().is_flush_refused = false;
}
