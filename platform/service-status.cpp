#include "platform/service-status.h"

#include <fcntl.h>
#include <keld/keyfile.h>
#include <sys/file.h>

#include <cerrno>

#include "platform/keld-sdk-wrapper.h"
#include "platform/package-paths.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

bool Lock(int fd) {
    while (flock(fd, LOCK_EX) != 0) {
        if (errno != EINTR) return false;
    }
    return true;
}

int WriteKey(const char* key, const std::string& value) {
    const SDK::ReentrantLock lock;
    return KLIBCFileSetKeyValue(StatusPath().c_str(), key, value.c_str(), KELD_KEY_VALUE_FORMAT);
}

int WriteStatus(const ServiceStatus& status) {
    if (WriteKey("state", std::to_string(status.state)) < 0) {
        SLOG_ERR("Failed to set ferrix copy service state to [%d].", status.state);
        return -1;
    }
    if (WriteKey("error", status.error) < 0) {
        SLOG_ERR("Failed to set ferrix copy service error to [%s].", status.error.c_str());
        return -1;
    }
    return 0;
}

}  // namespace

int SetServiceStatus(const ServiceStatus& status) {
    const UniqueFd lock_file(
        open(StatusLockPath().c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0440));
    if (!lock_file.IsValid()) {
        SLOG_ERR("Failed to open ferrix copy status lock file.");
        return -1;
    }
    if (!Lock(lock_file.Get())) {
        SLOG_ERR("Failed to lock file.");
        return -1;
    }
    const int result = WriteStatus(status);
    flock(lock_file.Get(), LOCK_UN);
    return result;
}
