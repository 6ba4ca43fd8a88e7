#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <memory>
#include <new>
#include <utility>

#include "ipc/binary-transfer.h"
#include "ipc/channel.h"
#include "utils/error-code.h"
#include "utils/log.h"

namespace {

constexpr int kCannotStore = -1;
// So many names in a row that are taken are no accident.
constexpr int kNameTries = 64;
// Whatever the umask: the content is for the receiver alone.
constexpr mode_t kFileMode = 0600;

// Cuts the file off where the rest of the content goes: a transfer that broke off in the middle of
// a block may have left more than it counted, also where appending is all that is asked for. A file
// that is shorter has lost what was counted: a gap filled with zeros would pass for content.
int CutAt(const std::string& path, uint64_t offset) {
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) return -1;
    const auto size = static_cast<uint64_t>(info.st_size);
    if (size == offset) return 0;
    if (size > offset) return truncate(path.c_str(), static_cast<off_t>(offset));
    errno = EINVAL;
    return -1;
}

int OpenToWrite(const std::string& path, int flags) {
    const int file = open(path.c_str(), O_WRONLY | O_CLOEXEC | flags, kFileMode);
    if (file < 0 && errno != EEXIST) SLOG_ERR("fopen(%s) error\n", path.c_str());
    return file;
}

}  // namespace

BinaryReceiver::BinaryReceiver(Channel& channel, TmpNameGen& names, const std::string& directory,
                               BinaryProgress progress)
    : m_channel(channel), m_names(names), m_directory(directory), m_progress(std::move(progress)) {}

int BinaryReceiver::Receive(uint64_t length, PObject::binary_type& record) {
    m_done = 0;
    uint64_t start = record.offset;
    int result = 0;
    if (record.IsEmpty()) {
        start = 0;
        result = OpenNew(record.path);
    } else {
        result = OpenNamed(record);
    }
    if (result == 0) result = Store(length, record.path);
    record.offset = record.length = start + m_done;
    return result;
}

// Never a file that is there already, nor what a link of that name leads to: the folder may be open
// to others, and the names can be guessed.
int BinaryReceiver::OpenNew(std::string& path) {
    for (int i = 0; i < kNameTries; ++i) {
        const std::string name = m_names.NewPath(m_directory);
        m_file.Reset(OpenToWrite(name, O_CREAT | O_EXCL | O_NOFOLLOW));
        if (m_file.IsValid()) {
            path = name;
            return 0;
        }
        if (errno != EEXIST) return kCannotStore;
    }
    SLOG_ERR("no free name in '%s'\n", m_directory.c_str());
    return kCannotStore;
}

int BinaryReceiver::OpenNamed(const PObject::binary_type& record) {
    SLOG_DBG("store binary to %s, offset %llu\n", record.path.c_str(), Llu(record.offset));
    int flags = O_CREAT | O_TRUNC;
    if (record.offset != 0) {
        if (CutAt(record.path, record.offset) != 0) {
            SLOG_ERR("truncate: %s (%d)\n", std::strerror(errno), errno);
            return kCannotStore;
        }
        flags = O_APPEND;
    }
    m_file.Reset(OpenToWrite(record.path, flags));
    return m_file.IsValid() ? 0 : kCannotStore;
}

int BinaryReceiver::Store(uint64_t length, const std::string& path) {
    const std::unique_ptr<uint8_t[]> block(new (std::nothrow) uint8_t[kBinaryBlock]);
    if (block == nullptr) {
        SLOG_ERR("malloc error\n");
        return kCannotStore;
    }
    m_progress(length, 0);
    while (m_done < length) {
        const size_t count = static_cast<size_t>(std::min<uint64_t>(length - m_done, kBinaryBlock));
        if (const int result = m_channel.Read(block.get(), count); result != 0) {
            SLOG_WARN("Channel: %d\n", result);
            return ERR_IO;
        }
        if (const int result = WriteBlock(block.get(), count); result != 0) return result;
        m_done += count;
        m_progress(length, m_done);
        if (m_done % kBinaryLogStep == 0) {
            SLOG_INFO("receiving %s ... (%llu / %llu)\n", path.c_str(), Llu(m_done), Llu(length));
        }
    }
    if (m_file.Close() == 0) return 0;
    return errno == ENOSPC ? ERR_INVALID_ARGUMENT : kCannotStore;
}

// Without a buffer between: what has been counted is in the file.
int BinaryReceiver::WriteBlock(const uint8_t* block, size_t length) {
    for (size_t written = 0; written < length;) {
        const ssize_t count = write(m_file.Get(), block + written, length - written);
        if (count > 0) {
            written += static_cast<size_t>(count);
        } else if (count == 0 || errno != EINTR) {
            return count < 0 && errno == ENOSPC ? ERR_INVALID_ARGUMENT : kCannotStore;
        }
    }
    return 0;
}
