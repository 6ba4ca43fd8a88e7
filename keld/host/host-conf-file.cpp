#include "host/host-conf-file.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "host/host-paths.h"
#include "host/replace-file.h"
#include "host/text.h"
#include "utils/log.h"

namespace keld_host {
namespace {

// 16 MiB: the file is a few lines.
constexpr size_t MAX_CONF_SIZE = size_t{16} << 20;
constexpr mode_t MODE_BITS = 07777;
// A file of its own, since host.conf is another file after each change; closed to others, who could
// hold the lock for ever.
constexpr const char* LOCK_NAME = "/.host.conf.lock";
constexpr mode_t LOCK_MODE = 0600;

using UniqueText = std::unique_ptr<char, FreeWith<free>>;

}  // namespace

int HostConfFile::Open(bool forChange) {
    const std::string& path = Paths().hostConf;
    // A new file in the place of a link would leave the file that people know without the change.
    const UniqueText real(realpath(path.c_str(), nullptr));
    m_path = real ? real.get() : path;
    if (!real && errno != ENOENT && errno != ENOTDIR) return errno;
    if (!real) return 0;
    if (const int error = forChange ? Lock() : 0; error != 0) return error;
    if (stat(m_path.c_str(), &m_info) != 0) return errno;
    return ReadFile(m_path, MAX_CONF_SIZE, m_text);
}

int HostConfFile::Lock() {
    const std::string path = ParentOf(m_path) + LOCK_NAME;
    m_lock.Reset(open(path.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, LOCK_MODE));
    if (!m_lock.IsValid()) return errno;
    while (flock(m_lock.Get(), LOCK_EX) != 0) {
        if (errno != EINTR) return errno;
    }
    return 0;
}

int HostConfFile::CanReplace() const {
    const std::string folder = ParentOf(m_path);
    return faccessat(AT_FDCWD, folder.c_str(), W_OK | X_OK, AT_EACCESS) == 0 ? 0 : errno;
}

int HostConfFile::Put(const std::string& text) const {
    const int error = ReplaceFile(m_path, text, m_info.st_mode & MODE_BITS);
    if (error != 0) return error;
    const bool isOurs = m_info.st_uid == geteuid() && m_info.st_gid == getegid();
    if (!isOurs && lchown(m_path.c_str(), m_info.st_uid, m_info.st_gid) != 0) {
        SLOG_WARN("'%s' has another owner now: %s\n", m_path.c_str(), strerror(errno));
    }
    return 0;
}

int HostConfFile::Replace(const std::string& text) {
    const int error = Put(text);
    if (error == 0) {
        m_text = text;
        return 0;
    }
    // The new file can be in its place and not known to be on the disk: that is no change that
    // could be claimed.
    std::string found;
    if (ReadFile(m_path, MAX_CONF_SIZE, found) == 0 && found == text && found != m_text) {
        static_cast<void>(Put(m_text));
    }
    return error;
}

}  // namespace keld_host
