#include "service/service-lock.h"

#include <fcntl.h>
#include <sys/file.h>

#include <cerrno>
#include <cstring>

#include "platform/package-paths.h"
#include "utils/log.h"

namespace {

bool Lock(int fd) {
    while (flock(fd, LOCK_EX) != 0) {
        if (errno != EINTR) return false;
    }
    return true;
}

}  // namespace

ServiceLock::ServiceLock()
    : m_file(open(PackagePath("/etc/service.lock").c_str(),
                  O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600)) {
    if (m_file.IsValid() && Lock(m_file.Get())) return;
    SLOG_WARN("The service cannot be locked: %s (%d)\n", std::strerror(errno), errno);
}
