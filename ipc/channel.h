// A buffered stream socket: two rings of equal capacity, a limit on each wait for the socket, and a
// limit on silence. The bytes travel as they are, or through TLS.
//
// Threads: a channel belongs to one thread; only the abort flag may be set by another.
// Ownership: an open channel owns its descriptor; the destructor flushes and closes.
// Results: 0, or a negative ErrorCode ("utils/error-code.h"): ERR_IO, ERR_SYSTEM,
// ERR_INVALID_ARGUMENT, ERR_CONNECTION_TIMEOUT, ERR_SSL_VERIFY; -1 when the abort flag ended the
// operation, but ERR_IO for an Open and a conversion. Integers are big-endian on the wire.
#pragma once

#include <sys/time.h>
#include <sys/types.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

class StallCount;
struct sockaddr_un;
struct ssl_ctx_st;  // OpenSSL's SSL_CTX
struct ssl_st;      // OpenSSL's SSL

class Channel {
public:
    // Bytes of each ring on the daemon's socket, and so the largest single write.
    static constexpr size_t DEFAULT_CAPACITY = 81920;

    explicit Channel(size_t capacity);
    Channel(const Channel&) = delete;
    Channel& operator=(const Channel&) = delete;
    virtual ~Channel();

    // Connects to a domain socket, and gives up after the total timeout when its listener accepts
    // nobody. Of a longer path only the first 107 bytes count.
    [[nodiscard]] virtual int Open(const std::string& path);
    // Takes a connected descriptor over, only on success. `tune` sets linger to one second and
    // makes the descriptor non-blocking.
    [[nodiscard]] virtual int Open(int descriptor, bool tune);
    // Connects over IPv4. Without an ip or with a negative port it does nothing and returns 0.
    [[nodiscard]] virtual int Open(const char* ip, int port);
    // Flushes what is pending, shuts the socket down and closes it. Harmless on a closed channel.
    virtual void Close();

    // Seconds without any progress after which a read, a flush or the Open of a path fails; 0 is no
    // limit. Through TLS, records that carry no text are no progress.
    virtual void SetTimeout(unsigned seconds);
    // An operation that waits ends with -1 within a second after *flag is set. May be null.
    virtual void SetAbortFlag(const std::atomic<int>* flag);

    // From now on the open connection speaks TLS; `server` says which end this one is. Nothing to
    // do when it does already. Flush before: what is pending is sent inside TLS, what was received
    // before is dropped. After a failure what is pending is dropped too, and the channel is good
    // only for closing.
    // A client checks the server's certificate against the trusted ones only when verification is
    // not skipped, and never the name in it. SIGPIPE has to be ignored by the process.
    [[nodiscard]] virtual int ConvertToSSLChannel(bool server);
    // True, as at first: any certificate will do. Else one that is not trusted fails a conversion
    // with ERR_SSL_VERIFY.
    void SkipVerification(bool skip) { m_skip_verify = skip; }
    // Files in PEM form for the conversions of all channels: a server's certificate and private
    // key, and the certificates that a client trusts. Not while another thread converts.
    static void SetCertificatePaths(const std::string& certificate, const std::string& key,
                                    const std::string& trusted);

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
    // The address of the other end. A closed channel gives an empty ip and 0, with success; -1 for
    // a peer that has no IPv4 address.
    [[nodiscard]] virtual int GetPeerInfo(std::string& ip, int& port) const;
    [[nodiscard]] virtual bool IsClosed() const;
    // Fills the read ring with at least `want` more bytes, and with what else is there.
    [[nodiscard]] virtual int ReadMore(size_t want);

    [[nodiscard]] virtual uint64_t SwapU64(uint64_t value) const;
    [[nodiscard]] virtual uint32_t SwapU32(uint32_t value) const;
    [[nodiscard]] virtual uint16_t SwapU16(uint16_t value) const;

    // A TCP socket, or -1.
    [[nodiscard]] virtual int CreateSocket() const;
    [[nodiscard]] virtual int SetLinger(int descriptor, int seconds) const;
    [[nodiscard]] virtual int SetNonBlock(int descriptor) const;
    // Connects a non-blocking socket, waiting for a third of the seconds of the total timeout.
    [[nodiscard]] virtual int Connect(int descriptor, const char* ip, int port);

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

    // The same through TLS, whose records may make several waits of one operation necessary.
    static ssize_t SSLReadFd(ssl_st* ssl, void* buffer, size_t length, const timeval& timeout);
    static ssize_t SSLWriteFd(ssl_st* ssl, const void* buffer, size_t length,
                              const timeval& timeout);

    virtual void SetFunctions(const Transport& transport);
    virtual void SetFunctions(bool plain);
    static const Transport kPlainTransport;
    static const Transport kTlsTransport;

    void* m_handle = nullptr;           // null when closed; plain: a heap int, TLS: the ssl_st
    timeval m_operation_timeout{1, 0};  // so that the abort flag and the total are looked at

private:
    [[nodiscard]] bool RefuseWhenOpen() const;
    void Adopt(int descriptor);
    [[nodiscard]] int ConnectInTime(int descriptor, const sockaddr_un& address) const;
    [[nodiscard]] int WaitForConnect(int descriptor) const;
    [[nodiscard]] int BecomeTls(bool server);
    // Makes both ends of what OpenSSL needs, or neither. The caller frees them.
    [[nodiscard]] static int InitSSL(ssl_st*& ssl, ssl_ctx_st*& context, bool server);
    [[nodiscard]] int StartSSL(ssl_st* ssl);
    [[nodiscard]] int SSLHandshake(ssl_st* ssl, const timeval& timeout, unsigned total) const;
    [[nodiscard]] int WaitForHandshake(ssl_st* ssl, bool for_writing, const timeval& timeout,
                                       StallCount& stalls) const;
    template <typename Move>
    [[nodiscard]] static int MoveThroughSSL(ssl_st* ssl, bool for_writing, const timeval& timeout,
                                            const Move& move);
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
    unsigned m_total_timeout = 60;  // seconds
    const std::atomic<int>* m_abort_flag = nullptr;
    bool m_is_tls = false;
    bool m_skip_verify = true;

    static std::string m_cert_path;
    static std::string m_key_path;
    static std::string m_ca_path;
};
