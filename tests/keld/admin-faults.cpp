#include "admin-faults.h"

#include <dlfcn.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

namespace {

struct Faults {
    bool isOn = false;
    FailNth::Call call = FailNth::FLUSH;
    int first = 0;
    int last = 0;
    int error = 0;
    int count = 0;
    bool hasFailed = false;
};

Faults& State() {
    static Faults faults;
    return faults;
}

bool Fails(FailNth::Call call) {
    Faults& faults = State();
    if (!faults.isOn || faults.call != call) return false;
    ++faults.count;
    if (faults.count < faults.first || faults.count > faults.last) return false;
    faults.hasFailed = true;
    errno = faults.error;
    return true;
}

template <typename Function>
Function RealOne(const char* name) {
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

}  // namespace

extern "C" {

int renameat2(int oldDir, const char* oldName, int newDir, const char* newName,
              unsigned flags) noexcept {
    static const auto real =
        RealOne<int (*)(int, const char*, int, const char*, unsigned)>("renameat2");
    if (flags != 0 && Fails(FailNth::RENAME_WITH_FLAGS)) return -1;
    return real(oldDir, oldName, newDir, newName, flags);
}

int fsync(int fd) {
    static const auto real = RealOne<int (*)(int)>("fsync");
    return Fails(FailNth::FLUSH) ? -1 : real(fd);
}

}  // extern "C"

FailNth::FailNth(Call call, int nth, int last, int error) {
    State() = {true, call, nth, last, error, 0, false};
}
FailNth::~FailNth() { State().isOn = false; }

bool FailNth::HasFailed() { return State().hasFailed; }
