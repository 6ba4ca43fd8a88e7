#include "host/copy-new-file.h"

#include <fcntl.h>
#include <keld/error.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

#include "host/copy-error.h"
#include "host/copy-temp-name.h"

namespace keld_host {
namespace {

constexpr mode_t PRIVATE_MODE = 0600;

// "This file system has no unnamed files": EISDIR comes from kernels that know no O_TMPFILE.
bool MeansNoUnnamedFiles(int error) {
    return error == EOPNOTSUPP || error == EISDIR || error == ENOSYS || error == EINVAL;
}

// What a name that the file system does not take answers when a file is to get it.
bool MeansBadName(int error) { return error == EINVAL || error == EILSEQ; }

}  // namespace

int LookAtDestination(int dir_fd, const char* name) {
    struct stat found {};
    if (fstatat(dir_fd, name, &found, AT_SYMLINK_NOFOLLOW) == 0) {
        return S_ISREG(found.st_mode) ? KELDERR_DST_EXISTS : KELDERR_DST_TYPE_CONFLICT;
    }
    if (errno == ENOENT) return KELDERR_SUCCESS;
    if (MeansBadName(errno)) return KELDERR_NAME_NOT_SUPPORTED;
    return CopyDestinationError(errno);
}

NewFile::~NewFile() {
    if (m_temp_name.empty()) return;
    // Not even ENOENT is believed: a device that was pulled out lists as an empty folder.
    const bool is_file_left = unlinkat(m_dir_fd, m_temp_name.c_str(), 0) != 0;
    GiveBackCopyTempName(m_temp_name, is_file_left);
}

int NewFile::Create(mode_t mode) {
    m_file.Reset(openat(m_dir_fd, ".", O_TMPFILE | O_WRONLY | O_CLOEXEC, mode));
    if (m_file.IsValid()) return KELDERR_SUCCESS;
    if (!MeansNoUnnamedFiles(errno)) return CopyDestinationError(errno);
    return CreateNamed();
}

int NewFile::CreateNamed() {
    SweepCopyLeftovers(m_dir_fd);
    std::string name = TakeCopyTempName();
    m_file.Reset(openat(m_dir_fd, name.c_str(),
                        O_CREAT | O_EXCL | O_WRONLY | O_NOFOLLOW | O_CLOEXEC, PRIVATE_MODE));
    if (!m_file.IsValid()) {
        const int code = CopyDestinationError(errno);
        GiveBackCopyTempName(name, false);
        return code;
    }
    m_temp_name = std::move(name);
    return KELDERR_SUCCESS;
}

int NewFile::Place(const char* name, bool may_replace) {
    return m_temp_name.empty() ? PlaceUnnamed(name, may_replace) : PlaceNamed(name, may_replace);
}

// Returns 0 or an errno.
int NewFile::Link(const char* name) const {
    if (linkat(m_file.Get(), "", m_dir_fd, name, AT_EMPTY_PATH) == 0) return 0;
    if (errno != ENOENT && errno != EPERM) return errno;
    // The short way is for root; who is not goes by /proc.
    char path[32];
    (void)snprintf(path, sizeof(path), "/proc/self/fd/%d", m_file.Get());
    return linkat(AT_FDCWD, path, m_dir_fd, name, AT_SYMLINK_FOLLOW) == 0 ? 0 : errno;
}

int NewFile::PlaceUnnamed(const char* name, bool may_replace) {
    int error = Link(name);
    if (error == EEXIST) {
        const int found = LookAtDestination(m_dir_fd, name);
        if (found != KELDERR_DST_EXISTS && found != KELDERR_SUCCESS) return found;
        if (!may_replace) return KELDERR_DST_EXISTS;
        // A link cannot replace: it gets a temporary name, and a rename does it.
        error = LinkTemporarily();
        if (error == 0) return PlaceNamed(name, may_replace);
    }
    if (MeansBadName(error)) return KELDERR_NAME_NOT_SUPPORTED;
    if (error != 0) return CopyDestinationError(error);
    if (m_file.Close() == 0) return KELDERR_SUCCESS;
    // What was written has not arrived. The name was free before, and is so again.
    const int code = CopyDestinationError(errno);
    unlinkat(m_dir_fd, name, 0);
    return code;
}

// Returns 0 or an errno.
int NewFile::LinkTemporarily() {
    SweepCopyLeftovers(m_dir_fd);
    std::string name = TakeCopyTempName();
    if (const int error = Link(name.c_str()); error != 0) {
        GiveBackCopyTempName(name, false);
        return error;
    }
    m_temp_name = std::move(name);
    return 0;
}

int NewFile::PlaceNamed(const char* name, bool may_replace) {
    // Closed first: some file systems tell only here that the data did not arrive.
    if (m_file.Close() != 0) return CopyDestinationError(errno);
    const char* temp_name = m_temp_name.c_str();
    int result = -1;
    if (!may_replace) {
        result = renameat2(m_dir_fd, temp_name, m_dir_fd, name, RENAME_NOREPLACE);
    }
    if (may_replace || (result != 0 && (errno == EINVAL || errno == ENOSYS))) {
        // Without the flag a look has to do. Not an empty file as a placeholder: a crash would
        // leave it under the final name.
        const int found = LookAtDestination(m_dir_fd, name);
        if (found == KELDERR_DST_EXISTS && !may_replace) return found;
        if (found != KELDERR_DST_EXISTS && found != KELDERR_SUCCESS) return found;
        result = renameat(m_dir_fd, temp_name, m_dir_fd, name);
    }
    if (result != 0) return RenameError(errno);
    GiveBackCopyTempName(m_temp_name, false);
    m_temp_name.clear();
    return KELDERR_SUCCESS;
}

int NewFile::RenameError(int error) const {
    if (error == EEXIST) return KELDERR_DST_EXISTS;
    if (MeansBadName(error)) return KELDERR_NAME_NOT_SUPPORTED;
    struct stat found {};
    // exFAT answers ENOENT for a name with a character that it has not.
    if (error == ENOENT &&
        fstatat(m_dir_fd, m_temp_name.c_str(), &found, AT_SYMLINK_NOFOLLOW) == 0) {
        return KELDERR_NAME_NOT_SUPPORTED;
    }
    return CopyDestinationError(error);
}

}  // namespace keld_host
