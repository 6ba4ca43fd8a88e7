// A buffered stream socket: two rings of equal capacity, a limit on each wait for the socket, and a
// limit on silence.
//
// Threads: a channel belongs to one thread; only the abort flag may be set by another.
// Ownership: an open channel owns its descriptor; the destructor flushes and closes.
// Results: 0, or a negative ErrorCode ("utils/error-code.h"): ERR_IO, ERR_SYSTEM,
// ERR_INVALID_ARGUMENT, ERR_CONNECTION_TIMEOUT; -1 when the abort flag ended the operation.
// Integers are big-endian on the wire.
#pragma once

#include <sys/time.h>
#include <sys/types.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

class Channel {
public:
    // Bytes of each ring on the daemon's socket, and so the largest single write.
    static constexpr size_t DEFAULT_CAPACITY = 81920;

    explicit Channel(size_t capacity);
    Channel(const Channel&) = delete;
    Channel& operator=(const Channel&) = delete;
    virtual ~Channel();

    // Connects to a domain socket. A connect has no timeout.
    [[nodiscard]] virtual int Open(const std::string& path);
    // Takes a connected descriptor over, only on success. `tune` sets linger to one second and
    // makes the descriptor non-blocking.
    [[nodiscard]] virtual int Open(int descriptor, bool tune);
    // Flushes what is pending, shuts the socket down and closes it. Harmless on a closed channel.
    virtual void Close();

    // Seconds without any progress after which a read or a flush fails; 0 is no limit.
    virtual void SetTimeout(unsigned seconds);
    // An operation that waits ends with -1 within a second after *flag is set. May be null.
    virtual void SetAbortFlag(const std::atomic<int>* flag);

    [[nodiscard]] virtual int ReadU8(uint8_t* value);
    [[nodiscard]] virtual int ReadU16(uint16_t* value);
    [[nodiscard]] virtual int ReadU32(uint32_t* value);
    [[nodiscard]] virtual int ReadU64(uint64_t* value);
    [[nodiscard]] virtual int WriteU8(uint8_t value);
    [[nodiscard]] virtual int WriteU16(uint16_t value);
    [[nodiscard]] virtual int WriteU32(uint32_t value);
    [[nodiscard]] virtual int WriteU64(uint64_t value);

    // All `length` bytes, or an error; *got tells how many bytes arrived in either case.
    [[nodiscard]] virtual int Read(void* buffer, size_t length);
    [[nodiscard]] virtual int Read(void* buffer, size_t length, size_t* got);
    // Puts bytes into the write ring and flushes only what does not fit. A length above the
    // capacity is refused and writes nothing.
    [[nodiscard]] virtual int Write(const void* buffer, size_t length);

    virtual void ResetRead();
    virtual void ResetWrite();
    // Sends at least so many of the pending bytes; 0 is all.
    [[nodiscard]] virtual int FlushWrite(size_t at_least);
    [[nodiscard]] virtual bool IsClosed() const;
    // Fills the read ring with at least `want` more bytes, and with what else is there.
    [[nodiscard]] virtual int ReadMore(size_t want);

    [[nodiscard]] virtual uint64_t SwapU64(uint64_t value) const;
    [[nodiscard]] virtual uint32_t SwapU32(uint32_t value) const;
    [[nodiscard]] virtual uint16_t SwapU16(uint16_t value) const;

    [[nodiscard]] virtual int SetLinger(int descriptor, int seconds) const;
    [[nodiscard]] virtual int SetNonBlock(int descriptor) const;

    // What the read ring holds in one piece, from the oldest byte on; empty when the ring is. A
    // decoder takes its small fields out of it, without a call of Read for each.
    [[nodiscard]] std::string_view Buffered() const;
    // Drops so many bytes of it; they stay where they are until the next read.
    void Skip(size_t length);

protected:
    // What carries the bytes. `handle` is what Open has put into the channel.
    struct Transport {
        // Bytes moved, or a negative code; ERR_CONNECTION_TIMEOUT when the wait timed out.
        ssize_t (*read)(void* handle, void* buffer, size_t length, const timeval& timeout);
        ssize_t (*write)(void* handle, const void* buffer, size_t length, const timeval& timeout);
        int (*get_descriptor)(const void* handle);
        // Closes and frees the handle.
        void (*close)(void* handle);
        bool (*is_invalid)(const void* handle);
    };

    // One wait and one recv or send on a socket.
    static ssize_t ReadFd(int descriptor, void* buffer, size_t length, const timeval& timeout);
    static ssize_t WriteFd(int descriptor, const void* buffer, size_t length,
                           const timeval& timeout);

    virtual void SetFunctions(const Transport& transport);
    static const Transport kPlainTransport;

    void* m_handle = nullptr;  // on the plain transport a heap int; null when closed

private:
    void Adopt(int descriptor);
    size_t TakeBuffered(uint8_t* out, size_t length);
    void CopyIntoWriteRing(const uint8_t* bytes, size_t length);
    [[nodiscard]] bool IsAborted() const;
    [[nodiscard]] bool IsStalled(time_t last_progress) const;

    Transport m_transport;
    std::unique_ptr<uint8_t[]> m_write_ring;
    size_t w_head = 0;  // the oldest pending byte
    size_t w_size = 0;
    std::unique_ptr<uint8_t[]> m_read_ring;
    size_t r_head = 0;
    size_t r_size = 0;
    size_t m_capacity;
    timeval m_operation_timeout{1, 0};  // so that the abort flag and the total are looked at
    unsigned m_total_timeout = 60;      // seconds
    const std::atomic<int>* m_abort_flag = nullptr;
};
