#include "platform/service-status.h"

#include <fcntl.h>
#include <keld/keyfile.h>
#include <sys/file.h>

#include <cerrno>
#include <cstdlib>

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

constexpr size_t VALUE_SIZE = 1024;

// 1, 0 when there is no such key, negative.
int ReadKey(const char* key, std::string& value) {
    const SDK::ReentrantLock lock;
    char buffer[VALUE_SIZE] = "";
    const int found = KLIBCFileGetKeyValue(StatusPath().c_str(), key, buffer, sizeof(buffer), 0);
    value = buffer;
    return found;
}

int ReadStatus(ServiceStatus& status) {
    std::string state;
    if (ReadKey("state", state) <= 0) {
        SLOG_ERR("Failed to get ferrix copy service state.");
        return -1;
    }
    std::string error;
    if (ReadKey("error", error) < 0) {
        SLOG_ERR("Failed to get ferrix copy service error state.");
        return -1;
    }
    status.state = static_cast<int>(strtol(state.c_str(), nullptr, 10));
    status.error = error;
    return 0;
}

// Holds the lock of the status file for the length of a block.
class StatusLock {
public:
    StatusLock()
        : m_file(open(StatusLockPath().c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0440)) {}
    // 0, or -1 (logged).
    [[nodiscard]] int Take() const {
        if (!m_file.IsValid()) {
            SLOG_ERR("Failed to open ferrix copy status lock file.");
            return -1;
        }
        if (Lock(m_file.Get())) return 0;
        SLOG_ERR("Failed to lock file.");
        return -1;
    }

private:
    UniqueFd m_file;  // closing it unlocks it
};

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
    const StatusLock lock;
    return lock.Take() < 0 ? -1 : WriteStatus(status);
}

int GetServiceStatus(ServiceStatus& status) {
    const StatusLock lock;
    return lock.Take() < 0 ? -1 : ReadStatus(status);
}
