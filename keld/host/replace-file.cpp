#include "host/replace-file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>

#include "host/text.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

// Removes a temporary file, unless it has been put in place.
class TempFile {
public:
    TempFile(int folder, std::string name) : m_folder(folder), m_name(std::move(name)) {}
    ~TempFile() {
        if (!m_name.empty()) unlinkat(m_folder, m_name.c_str(), 0);
    }
    TempFile(const TempFile&) = delete;
    TempFile& operator=(const TempFile&) = delete;
    int PutInPlace(const std::string& name) {
        if (renameat(m_folder, m_name.c_str(), m_folder, name.c_str()) != 0) return errno;
        m_name.clear();
        return 0;
    }

private:
    int m_folder;
    std::string m_name;
};

// Not made from the file's own name, which may be as long as a name can be. One name for each
// process and call; what a killed process left is overwritten by the next process of its number.
std::string TempName() {
    static std::atomic<unsigned> counter{0};
    return ".keld-new." + std::to_string(getpid()) + "." + std::to_string(counter++);
}

int WriteAll(int fd, std::string_view content) {
    while (!content.empty()) {
        const ssize_t length = write(fd, content.data(), content.size());
        if (length < 0 && errno == EINTR) continue;
        if (length < 0) return errno;
        content.remove_prefix(static_cast<size_t>(length));
    }
    return 0;
}

// A file system without mode bits (FAT) refuses the change; its mounter has decided then.
int SetMode(int fd, unsigned mode) {
    if (fchmod(fd, mode) == 0 || errno == EPERM || errno == EOPNOTSUPP || errno == ENOSYS) return 0;
    return errno;
}

}  // namespace

int ReadFile(const std::string& path, size_t limit, std::string& content) {
    struct stat info {};
    return ReadFile(path, limit, content, info);
}

int ReadFile(const std::string& path, size_t limit, std::string& content, struct stat& info) {
    content.clear();
    // O_NONBLOCK: a FIFO under this name must not hold us up.
    const UniqueFd fd(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!fd.IsValid()) return errno;
    if (fstat(fd.Get(), &info) != 0) return errno;
    if (!S_ISREG(info.st_mode)) return EINVAL;
    if (info.st_size > 0 && static_cast<uint64_t>(info.st_size) > limit) return EFBIG;
    char buffer[16384];
    for (;;) {
        const ssize_t length = read(fd.Get(), buffer, sizeof(buffer));
        if (length < 0 && errno == EINTR) continue;
        if (length < 0) return errno;
        if (length == 0) return 0;
        content.append(buffer, static_cast<size_t>(length));
        if (content.size() > limit) return EFBIG;
    }
}

int ReplaceFile(const std::string& path, std::string_view content, unsigned mode) {
    const std::string folderPath = ParentOf(path);
    const std::string name(BaseNameOf(path));
    if (name.empty() || name == "." || name == "..") return EINVAL;
    const UniqueFd folder(open(folderPath.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!folder.IsValid()) return errno;
    const std::string tempName = TempName();
    if (unlinkat(folder.Get(), tempName.c_str(), 0) != 0 && errno != ENOENT) return errno;
    UniqueFd fd(openat(folder.Get(), tempName.c_str(),
                       O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, mode & 0600));
    if (!fd.IsValid()) return errno;
    TempFile temp(folder.Get(), tempName);
    int error = WriteAll(fd.Get(), content);
    if (error == 0) error = SetMode(fd.Get(), mode);
    if (error == 0 && fsync(fd.Get()) != 0) error = errno;
    if (fd.Close() != 0 && error == 0) error = errno;
    if (error == 0) error = temp.PutInPlace(name);
    // The new name is on the disk only with its folder. Some file systems have no flush for
    // folders.
    if (error == 0 && fsync(folder.Get()) != 0 && errno != EINVAL) error = errno;
    return error;
}

}  // namespace keld_host
