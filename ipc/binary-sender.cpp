#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <new>

#include "ipc/binary-transfer.h"
#include "ipc/channel.h"
#include "ipc/wire-tag.h"
#include "utils/error-code.h"
#include "utils/log.h"

namespace {

ssize_t ReadSome(int file, uint8_t* block, size_t length) {
    for (;;) {
        const ssize_t count = read(file, block, length);
        if (count >= 0 || errno != EINTR) return count;
    }
}

int OpenAt(const PObject::binary_type& record, UniqueFd& file) {
    file.Reset(open(record.path.c_str(), O_RDONLY | O_CLOEXEC));
    if (!file.IsValid()) {
        SLOG_ERR("fopen(%s) error\n", record.path.c_str());
        return kCannotSend;
    }
    if (lseek(file.Get(), static_cast<off_t>(record.offset), SEEK_SET) < 0) {
        SLOG_ERR("fseek error\n");
        return kCannotSend;
    }
    return 0;
}

}  // namespace

int SendBinary(Channel& channel, const PObject::binary_type& record,
               const BinaryProgress& progress) {
    const std::unique_ptr<uint8_t[]> block(new (std::nothrow) uint8_t[kBinaryBlock]);
    if (block == nullptr) {
        SLOG_ERR("malloc error\n");
        return kCannotSend;
    }
    UniqueFd file;
    if (const int result = OpenAt(record, file); result != 0) return result;
    uint64_t done = 0;
    progress(record.length, 0);
    while (done < record.length) {
        const size_t wanted =
            static_cast<size_t>(std::min<uint64_t>(record.length - done, kBinaryBlock));
        const ssize_t count = ReadSome(file.Get(), block.get(), wanted);
        if (count < 0) {
            SLOG_ERR("fread error\n");
            return kCannotSend;
        }
        if (count == 0) break;  // the end of the file
        const int result = channel.Write(block.get(), static_cast<size_t>(count));
        if (result != 0) {
            SLOG_WARN("Channel: %d\n", result);
            return ERR_IO;
        }
        done += static_cast<uint64_t>(count);
        progress(record.length, done);
        if (done % kBinaryLogStep == 0) {
            SLOG_INFO("sending %s ... (%llu / %llu)\n", record.path.c_str(), Llu(done),
                      Llu(record.length));
        }
    }
    if (done == record.length) return 0;
    SLOG_ERR("file length is incorrect.\n");
    return kBadWire;
}
