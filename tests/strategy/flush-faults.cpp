#include "flush-faults.h"

#include <dlfcn.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <utility>

namespace {

std::function<int(const std::string&)>& Action() {
    static std::function<int(const std::string&)> action;
    return action;
}

std::string PathOf(int fd) {
    char path[PATH_MAX];
    const ssize_t length =
        readlink(("/proc/self/fd/" + std::to_string(fd)).c_str(), path, sizeof(path));
    return length < 0 ? std::string() : std::string(path, static_cast<size_t>(length));
}

int g_fd = -1;

int Flush(const char* name, const std::string& prefix, int fd) {
    if (Action()) {
        g_fd = fd;
        if (const int error = Action()(prefix + PathOf(fd)); error != 0) {
            errno = error;
            return -1;
        }
    }
    return reinterpret_cast<int (*)(int)>(dlsym(RTLD_NEXT, name))(fd);
}

}  // namespace

extern "C" {

int fsync(int fd) { return Flush("fsync", "", fd); }
int fdatasync(int fd) { return Flush("fdatasync", "", fd); }
int syncfs(int fd) noexcept { return Flush("syncfs", "fs:", fd); }

}  // extern "C"

OnFlush::OnFlush(std::function<int(const std::string& what)> action) {
    Action() = std::move(action);
}
OnFlush::~OnFlush() { Action() = nullptr; }
int OnFlush::Fd() { return g_fd; }
