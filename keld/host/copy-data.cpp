#include "host/copy-data.h"

#include <keld/error.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/sendfile.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <new>

#include "host/copy-error.h"

namespace keld_host {
namespace {

// Files below this are moved with one call, and are not worth a clone.
constexpr off_t SMALL_SIZE = off_t{64} * 1024;
// How much the kernel moves before the caller is asked whether to stop: inside one file system, and
// between two, of which one may be slow.
constexpr off_t RANGE_STEP = off_t{4} * 1024 * 1024;
constexpr off_t SEND_STEP = off_t{1} * 1024 * 1024;
// Larger buffers were measured slower, they fall out of the cache.
constexpr size_t BUFFER_SIZE = 256 * 1024;
// st_blocks counts these, whatever the file system's block size is.
constexpr off_t STAT_BLOCK = 512;

int WriteAll(int to, const char* data, size_t size, off_t at) {
    while (size > 0) {
        const ssize_t written = pwrite(to, data, size, at);
        if (written < 0 && errno == EINTR) continue;
        if (written < 0) return CopyDestinationError(errno);
        if (written == 0) return KELDERR_IO;
        data += written;
        size -= static_cast<size_t>(written);
        at += written;
    }
    return KELDERR_SUCCESS;
}

ssize_t ReadAt(int from, char* data, size_t size, off_t at) {
    ssize_t got;
    do {
        got = pread(from, data, size, at);
    } while (got < 0 && errno == EINTR);
    return got;
}

// Moves a small file with one call. More is asked for than there should be, so that a file that has
// grown shows itself. The result is what was moved, or negative; less than all can still be moved
// the long way.
ssize_t MoveInOneGo(int from, int to, off_t size) {
    off_t at = 0;
    return sendfile(to, from, &at, static_cast<size_t>(size) + 1);
}

char* Buffer() {
    thread_local std::unique_ptr<char[]> buffer;
    if (!buffer) buffer.reset(new (std::nothrow) char[BUFFER_SIZE]);
    return buffer.get();
}

// Moves the pieces of one file, in the best way that works for this pair of file systems.
class PieceMover {
public:
    PieceMover(int from, int to, const CopyCancel& cancel)
        : m_from(from), m_to(to), m_cancel(cancel) {}

    // Moves the bytes from `at` up to `end`. A source that ends before is a failure.
    [[nodiscard]] int Move(off_t at, off_t end) {
        while (at < end) {
            if (m_cancel.IsAsked()) return KELDERR_CANCELLED;
            if (m_way == Way::BUFFER) {
                if (const int code = MoveByBuffer(at, end); code != KELDERR_SUCCESS) return code;
                continue;
            }
            const ssize_t moved =
                m_way == Way::RANGE ? MoveByRange(at, end - at) : MoveBySending(at, end - at);
            if (moved > 0) {
                at += moved;
            } else if (moved == 0 || errno != EINTR) {
                // Not between these two file systems, or an error whose side cannot be told. Also
                // 0, which some file systems answer in the middle of a file. The next way tells.
                m_way = m_way == Way::RANGE ? Way::SENDING : Way::BUFFER;
            }
        }
        return KELDERR_SUCCESS;
    }

private:
    enum class Way { RANGE, SENDING, BUFFER };

    [[nodiscard]] ssize_t MoveByRange(off_t at, off_t size) const {
        off_t in = at;
        off_t out = at;
        return copy_file_range(m_from, &in, m_to, &out,
                               static_cast<size_t>(std::min(RANGE_STEP, size)), 0);
    }

    // Half the processor time of reading and writing: the data is copied once, not twice.
    [[nodiscard]] ssize_t MoveBySending(off_t at, off_t size) {
        if (m_position != at && lseek(m_to, at, SEEK_SET) < 0) return -1;
        off_t in = at;
        const ssize_t sent =
            sendfile(m_to, m_from, &in, static_cast<size_t>(std::min(SEND_STEP, size)));
        m_position = sent < 0 ? -1 : at + sent;
        return sent;
    }

    int MoveByBuffer(off_t& at, off_t end) {
        char* buffer = Buffer();
        if (buffer == nullptr) return KELDERR_SYSTEM;
        const auto step = static_cast<size_t>(std::min<off_t>(BUFFER_SIZE, end - at));
        const ssize_t got = ReadAt(m_from, buffer, step, at);
        if (got < 0) return CopySourceError(errno);
        if (got == 0) return KELDERR_FILE_OPERATION;
        const int code = WriteAll(m_to, buffer, static_cast<size_t>(got), at);
        at += got;
        return code;
    }

    const int m_from;
    const int m_to;
    const CopyCancel& m_cancel;
    Way m_way = Way::RANGE;
    off_t m_position = -1;  // of m_to, when it is known
};

// Moves what is data and leaves out what is hole.
int MoveAroundHoles(PieceMover& mover, int from, int to, off_t size) {
    off_t at = 0;
    off_t written = 0;
    while (at < size) {
        off_t data = lseek(from, at, SEEK_DATA);
        if (data < 0 && errno == ENXIO) break;  // nothing but a hole from here on
        off_t hole = data < 0 ? -1 : lseek(from, data, SEEK_HOLE);
        if (data < 0 || hole < 0) {
            // A file system that cannot tell: all is data.
            data = at;
            hole = size;
        }
        data = std::min(data, size);
        hole = std::min(hole, size);
        if (const int code = mover.Move(data, hole); code != KELDERR_SUCCESS) return code;
        written = hole;
        at = hole;
    }
    if (written < size && ftruncate(to, size) != 0) return CopyDestinationError(errno);
    return KELDERR_SUCCESS;
}

// KELDERR_SUCCESS if the source is what it was before it was read.
int CheckUnchanged(int from, const struct stat& before) {
    struct stat now {};
    if (fstat(from, &now) != 0) return CopySourceError(errno);
    const bool is_same = now.st_size == before.st_size &&
                         now.st_mtim.tv_sec == before.st_mtim.tv_sec &&
                         now.st_mtim.tv_nsec == before.st_mtim.tv_nsec;
    return is_same ? KELDERR_SUCCESS : KELDERR_FILE_OPERATION;
}

}  // namespace

int CopyData(int from, int to, const struct stat& source, const CopyCancel& cancel) {
    const off_t size = source.st_size;
    const bool has_holes = source.st_blocks * STAT_BLOCK < size;
    const bool is_small = size < SMALL_SIZE && !has_holes;
    if (is_small) {
        const ssize_t moved = MoveInOneGo(from, to, size);
        if (moved == size) return CheckUnchanged(from, source);
        if (moved > size) return KELDERR_FILE_OPERATION;
    }
    if (is_small || ioctl(to, FICLONE, from) != 0) {
        PieceMover mover(from, to, cancel);
        const int code = has_holes ? MoveAroundHoles(mover, from, to, size) : mover.Move(0, size);
        if (code != KELDERR_SUCCESS) return code;
    }
    return CheckUnchanged(from, source);
}

}  // namespace keld_host
