#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>

#include "utils/confined-path.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr char kPattern[] = "/XXXXXX";
constexpr mode_t kFileMode = 0644;
constexpr mode_t kDirMode = 0777;

// A folder under a name that no link can take elsewhere: below a root by its descriptor.
class SafeFolder {
public:
    explicit SafeFolder(const std::string& path) : m_path(path) {
        const PathPlace place(path);
        m_error = place.Error();
        if (!place.IsConfined() || m_error != 0) return;
        m_fd = place.Open(O_PATH | O_DIRECTORY);
        if (!m_fd.IsValid()) m_error = errno;
        m_path = "/proc/self/fd/" + std::to_string(m_fd.Get());
    }

    // The pattern for mkstemp and mkdtemp; empty with errno when there is none.
    [[nodiscard]] std::string Pattern() const {
        errno = m_error != 0                                   ? m_error
                : m_path.size() >= PATH_MAX - sizeof(kPattern) ? ENAMETOOLONG
                                                               : 0;
        return errno == 0 ? m_path + kPattern : std::string();
    }

private:
    std::string m_path;
    UniqueFd m_fd;
    int m_error = 0;
};

std::string WithLastComponent(const std::string& dir, const std::string& made) {
    return dir + made.substr(made.rfind('/'));
}

}  // namespace

int FSMakeTempFile(const std::string& dir, std::string& out) {
    if (dir.empty()) return -1;
    const SafeFolder folder(dir);
    std::string made = folder.Pattern();
    UniqueFd fd(made.empty() ? -1 : mkostemp(made.data(), O_CLOEXEC));
    if (!fd.IsValid()) {
        SLOG_ERR("mkstemp(%s%s): %s\n", dir.c_str(), kPattern, std::strerror(errno));
        return -1;
    }
    (void)fchmod(fd.Get(), kFileMode);
    (void)fsync(fd.Get());
    out = WithLastComponent(dir, made);
    return 0;
}

int FSMakeTempDir(const std::string& dir, std::string& out, uid_t uid, gid_t gid) {
    if (dir.empty()) return -1;
    const SafeFolder folder(dir);
    std::string made = folder.Pattern();
    if (made.empty() || mkdtemp(made.data()) == nullptr) {
        SLOG_ERR("mkdtemp(%s%s): %s\n", dir.c_str(), kPattern, std::strerror(errno));
        return -1;
    }
    const UniqueFd fd(open(made.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    (void)fchmod(fd.Get(), kDirMode);
    (void)!fchown(fd.Get(), uid, gid);
    out = WithLastComponent(dir, made);
    return 0;
}
