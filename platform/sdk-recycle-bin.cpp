// Making a share's recycle bin.
#include <fcntl.h>
#include <keld/acl.h>
#include <keld/ea.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string_view>

#include "platform/sdk-file-system.h"
#include "platform/sdk-mutex.h"
#include "platform/sdk-share.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace SDK {
namespace {

// Archive bits of the folder and of the icon file, in the platform's numbers.
constexpr int BIN_ARCHIVE_BITS = 0x204;
constexpr int ICON_FILE_ARCHIVE_BITS = 0x203;

constexpr unsigned ALL_PERMISSIONS = 0x1FFF;
constexpr int INHERIT_TO_ALL = 6;
constexpr int ACL_LEVEL = 0x65;

constexpr mode_t ADMIN_ONLY_MODE = 0700;
constexpr mode_t EVERYONE_MODE = 0777;
constexpr mode_t ICON_FILE_MODE = 0666;  // whoever may enter the bin may change its icon

// What desktop clients read to show the folder as a recycle bin.
constexpr const char* ICON_FILE = "desktop.ini";
constexpr std::string_view ICON_FILE_TEXT =
    "[.ShellClassInfo]\n"
    "IconFile=%SystemRoot%\\system32\\SHELL32.dll\n"
    "IconIndex=32\n";

int SetArchiveBits(const std::string& path, int bits) {
    const ReentrantLock lock;
    if (KELDArchiveBit(path.c_str(), bits) >= 0) return 0;
    SLOG_ERR("Failed to KELDArchiveBit '%s'\n", path.c_str());
    return -1;
}

int SetBinPermission(int bin_fd, const std::string& path, bool admin_only) {
    if (IsAclSupported(path)) return SetRecycleBinPermission(path, admin_only);
    if (fchmod(bin_fd, admin_only ? ADMIN_ONLY_MODE : EVERYONE_MODE) != 0) return -1;
    return fchown(bin_fd, 0, 0);
}

int WriteIconFile(int bin_fd, const std::string& bin) {
    const std::string path = bin + "/" + ICON_FILE;
    UniqueFd fd(
        openat(bin_fd, ICON_FILE, O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0644));
    if (!fd.IsValid()) {
        SLOG_ERR("Failed to open file '%s'\n", path.c_str());
        return -1;
    }
    const ssize_t written = write(fd.Get(), ICON_FILE_TEXT.data(), ICON_FILE_TEXT.size());
    if (written != static_cast<ssize_t>(ICON_FILE_TEXT.size())) {
        SLOG_ERR("Failed to write file '%s'\n", path.c_str());
        return -1;
    }
    if (SetArchiveBits(path, ICON_FILE_ARCHIVE_BITS) < 0) return -1;
    if (fchmod(fd.Get(), ICON_FILE_MODE) != 0) {
        SLOG_WARN("chmod(%s): %s\n", path.c_str(), strerror(errno));
    }
    if (fd.Close() == 0) return 0;
    SLOG_ERR("Failed to write file '%s'\n", path.c_str());
    return -1;
}

}  // namespace

int SetRecycleBinPermission(const std::string& path, bool admin_only) {
    const AclEntry entry = {admin_only ? KELD_ACL_TAG_ADMIN : KELD_ACL_TAG_EVERYONE,
                            0,
                            ALL_PERMISSIONS,
                            INHERIT_TO_ALL,
                            true,
                            ACL_LEVEL};
    if (WriteAcl(path, {entry}) < 0) return -1;
    return lchown(path.c_str(), 0, 0);
}

int CreateRecycleBin(const std::string& path, bool admin_only) {
    struct stat info;
    if (stat(path.c_str(), &info) == 0) return 0;
    if (errno != ENOENT) {
        SLOG_ERR("Failed to stat '%s' (%d)\n", path.c_str(), errno);
        return -1;
    }
    if (mkdir(path.c_str(), 0777) != 0) {
        SLOG_ERR("Failed to mkdir '%s' (%d)\n", path.c_str(), errno);
        return -1;
    }
    if (SetArchiveBits(path, BIN_ARCHIVE_BITS) < 0) return -1;
    // A user of the share may put a link in its place meanwhile: what is written goes into this
    // folder.
    const UniqueFd bin(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!bin.IsValid() || SetBinPermission(bin.Get(), path, admin_only) < 0) {
        SLOG_ERR("Failed to SetRecycleBinPermission\n");
        return -1;
    }
    return WriteIconFile(bin.Get(), path);
}

}  // namespace SDK
