#include "ipc/channel.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstring>
#include <ctime>

#include "utils/error-code.h"
#include "utils/log.h"

namespace {

// The clock that setting the time of day does not move.
time_t NowSeconds() {
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return now.tv_sec;
}

}  // namespace

Channel::Channel(size_t capacity)
    : m_transport(kPlainTransport),
      m_write_ring(std::make_unique_for_overwrite<uint8_t[]>(capacity)),
      m_read_ring(std::make_unique_for_overwrite<uint8_t[]>(capacity)),
      m_capacity(capacity) {}

Channel::~Channel() { Channel::Close(); }

void Channel::SetTimeout(unsigned seconds) { m_total_timeout = seconds; }

void Channel::SetAbortFlag(const std::atomic<int>* flag) { m_abort_flag = flag; }

bool Channel::IsAborted() const { return m_abort_flag != nullptr && m_abort_flag->load() != 0; }

bool Channel::IsStalled(time_t last_progress) const {
    return m_total_timeout != 0 &&
           NowSeconds() - last_progress >= static_cast<time_t>(m_total_timeout);
}

bool Channel::IsClosed() const { return m_transport.is_invalid(m_handle); }

void Channel::ResetRead() {
    r_head = 0;
    r_size = 0;
}

void Channel::ResetWrite() {
    w_head = 0;
    w_size = 0;
}

uint64_t Channel::SwapU64(uint64_t value) const { return __builtin_bswap64(value); }
uint32_t Channel::SwapU32(uint32_t value) const { return __builtin_bswap32(value); }
uint16_t Channel::SwapU16(uint16_t value) const { return __builtin_bswap16(value); }

int Channel::ReadU8(uint8_t* value) { return Read(value, sizeof(*value)); }

int Channel::ReadU16(uint16_t* value) {
    const int result = Read(value, sizeof(*value));
    if (result == 0 && std::endian::native == std::endian::little) *value = SwapU16(*value);
    return result;
}

int Channel::ReadU32(uint32_t* value) {
    const int result = Read(value, sizeof(*value));
    if (result == 0 && std::endian::native == std::endian::little) *value = SwapU32(*value);
    return result;
}

int Channel::ReadU64(uint64_t* value) {
    const int result = Read(value, sizeof(*value));
    if (result == 0 && std::endian::native == std::endian::little) *value = SwapU64(*value);
    return result;
}

int Channel::WriteU8(uint8_t value) { return Write(&value, sizeof(value)); }

int Channel::WriteU16(uint16_t value) {
    if (std::endian::native == std::endian::little) value = SwapU16(value);
    return Write(&value, sizeof(value));
}

int Channel::WriteU32(uint32_t value) {
    if (std::endian::native == std::endian::little) value = SwapU32(value);
    return Write(&value, sizeof(value));
}

int Channel::WriteU64(uint64_t value) {
    if (std::endian::native == std::endian::little) value = SwapU64(value);
    return Write(&value, sizeof(value));
}

std::string_view Channel::Buffered() const {
    if (IsClosed()) return {};
    return {reinterpret_cast<const char*>(m_read_ring.get() + r_head),
            std::min(r_size, m_capacity - r_head)};
}

void Channel::Skip(size_t length) {
    r_size -= length;
    r_head = r_size == 0 ? 0 : r_head + length;
    if (r_head >= m_capacity) r_head -= m_capacity;
}

// Moves what the ring holds, up to `length` bytes, to the caller.
size_t Channel::TakeBuffered(uint8_t* out, size_t length) {
    const size_t count = std::min(length, r_size);
    const size_t first = std::min(count, m_capacity - r_head);
    if (first != 0) std::memcpy(out, m_read_ring.get() + r_head, first);
    if (count != first) std::memcpy(out + first, m_read_ring.get(), count - first);
    Skip(count);
    return count;
}

int Channel::Read(void* buffer, size_t length) {
    size_t got = 0;
    return Read(buffer, length, &got);
}

int Channel::Read(void* buffer, size_t length, size_t* got) {
    *got = 0;
    if (IsClosed()) return ERR_IO;
    auto* out = static_cast<uint8_t*>(buffer);
    if (m_capacity == 0 && length != 0) return ERR_INVALID_ARGUMENT;  // as a write is
    size_t total = TakeBuffered(out, length);
    while (total < length) {  // the ring is empty here
        const size_t chunk = std::min(length - total, m_capacity);
        SLOG_DBG("want = %zd, len = %zd, total = %zd, capacity = %zd\n",
                 static_cast<ssize_t>(chunk), static_cast<ssize_t>(length),
                 static_cast<ssize_t>(total), static_cast<ssize_t>(m_capacity));
        const int result = ReadMore(chunk);
        total += TakeBuffered(out + total, result == 0 ? chunk : length - total);
        *got = total;
        if (result != 0) return result;
    }
    *got = total;
    SLOG_DBG("Read: read %zd bytes, head = %zd, size = %zd\n", static_cast<ssize_t>(total),
             static_cast<ssize_t>(r_head), static_cast<ssize_t>(r_size));
    return 0;
}

int Channel::ReadMore(size_t want) {
    if (want == 0) return 0;
    time_t last_progress = NowSeconds();
    size_t total = 0;
    for (;;) {
        if (IsAborted()) return -1;
        const size_t end = r_head + r_size;
        const bool is_wrapped = end >= m_capacity;
        const size_t start = is_wrapped ? end - m_capacity : end;
        const size_t length = is_wrapped ? m_capacity - r_size : m_capacity - end;
        SLOG_DBG("ReadMore: want = %zu, total = %zu, len = %zu, r_head = %zu, r_size = %zu\n", want,
                 total, length, r_head, r_size);
        const ssize_t count =
            m_transport.read(m_handle, m_read_ring.get() + start, length, m_operation_timeout);
        if (count == ERR_CONNECTION_TIMEOUT) {
            if (!IsStalled(last_progress)) continue;
            SLOG_DBG("ReadMore: Channel timeout for %u seconed\n", m_total_timeout);
            return ERR_CONNECTION_TIMEOUT;
        }
        if (count < 0) return static_cast<int>(count);
        r_size += static_cast<size_t>(count);
        total += static_cast<size_t>(count);
        last_progress = NowSeconds();
        if (total >= want) {
            SLOG_DBG("ReadMore: read at least %zu bytes\n", want);
            return 0;
        }
    }
}

void Channel::CopyIntoWriteRing(const uint8_t* bytes, size_t length) {
    size_t start = w_head + w_size;
    if (start >= m_capacity) start -= m_capacity;
    const size_t first = std::min(length, m_capacity - start);
    if (first != 0) std::memcpy(m_write_ring.get() + start, bytes, first);
    if (length != first) std::memcpy(m_write_ring.get(), bytes + first, length - first);
    w_size += length;
}

int Channel::Write(const void* buffer, size_t length) {
    if (IsClosed()) return ERR_IO;
    if (length > m_capacity) {
        SLOG_ERR("Write: Exceed maximum data block size\n");
        return ERR_INVALID_ARGUMENT;
    }
    if (w_size + length > m_capacity) {
        if (const int result = FlushWrite(w_size + length - m_capacity); result < 0) {
            SLOG_ERR("Write: FlushWrite failed\n");
            return result;
        }
    }
    CopyIntoWriteRing(static_cast<const uint8_t*>(buffer), length);
    SLOG_DBG("Write: write %zd bytes\n", static_cast<ssize_t>(length));
    return 0;
}

int Channel::FlushWrite(size_t at_least) {
    const size_t wanted = at_least == 0 ? w_size : at_least;
    size_t flushed = 0;
    time_t last_progress = NowSeconds();
    while (flushed < wanted) {
        if (IsAborted()) return -1;
        const size_t chunk = std::min(w_size, m_capacity - w_head);
        SLOG_DBG("WriteFd: from %zd, len %zd\n", static_cast<ssize_t>(w_head),
                 static_cast<ssize_t>(chunk));
        const ssize_t count =
            m_transport.write(m_handle, m_write_ring.get() + w_head, chunk, m_operation_timeout);
        if (count == ERR_CONNECTION_TIMEOUT) {
            if (!IsStalled(last_progress)) continue;
            SLOG_WARN("FlushWrite: Channel timeout for %u seconds\n", m_total_timeout);
            return ERR_CONNECTION_TIMEOUT;
        }
        if (count < 0) return static_cast<int>(count);
        flushed += static_cast<size_t>(count);
        last_progress = NowSeconds();
        w_head += static_cast<size_t>(count);
        w_size -= static_cast<size_t>(count);
        if (w_size == 0 || w_head == m_capacity) w_head = 0;
    }
    SLOG_DBG("FlushWrite: flush at least %zu bytes\n", at_least);
    return 0;
}
