// How the bytes of a TLS channel travel, and its end.
#include "ipc/tls-transport.h"

#include <openssl/err.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstring>
#include <string_view>

#include "ipc/channel.h"
#include "ipc/deadline.h"
#include "ipc/wait-ready.h"
#include "utils/error-code.h"
#include "utils/log.h"

namespace {

int TlsDescriptor(const void* handle) {
    return handle != nullptr ? SSL_get_fd(static_cast<const SSL*>(handle)) : -1;
}

void CloseTls(void* handle) {
    auto* ssl = static_cast<SSL*>(handle);
    SLOG_DBG("destroy ssl obj %p\n", handle);
    const int descriptor = SSL_get_fd(ssl);
    SSL_CTX* context = SSL_get_SSL_CTX(ssl);
    SSL_shutdown(ssl);  // tells the peer; its answer is not awaited
    SSL_free(ssl);
    SSL_CTX_free(context);
    ERR_clear_error();
    if (shutdown(descriptor, SHUT_RDWR) != 0) {
        SLOG_DBG("Channel: shutdown: %s\n", std::strerror(errno));
    }
    close(descriptor);
    SLOG_DBG("Channel: socket %d closed\n", descriptor);
}

// The peer has hung up: with a goodbye, without one, or before this operation, and then the library
// has no more to say about it.
bool IsEnd(int code, int error) {
    const unsigned long first = ERR_peek_error();
    return code == SSL_ERROR_ZERO_RETURN || (code == SSL_ERROR_SYSCALL && error == 0) ||
           (code == SSL_ERROR_SSL && ERR_GET_LIB(first) == ERR_LIB_SSL &&
            ERR_GET_REASON(first) == SSL_R_UNEXPECTED_EOF_WHILE_READING);
}

// The lines of a plain transport for the same trouble.
void LogFailure(bool is_write, int code, int error) {
    const bool is_end = IsEnd(code, error);
    SLOG_ERR("%s: %s\n", is_write ? "write" : "read",
             std::strerror(code == SSL_ERROR_SYSCALL ? error : 0));
    LogSslErrors();
    if (is_end) {
        SLOG_ERR(
            "Diagnose: select says the socket is %s but actually we can't %s ... connection "
            "closed?\n",
            is_write ? "writeable" : "readable", is_write ? "write" : "read");
    }
    if (!is_write) SLOG_ERR("Diagnose: SSL_read failed\n");
}

// Part of a record has come, and nothing is known yet of what it carries.
bool IsWithinRecord(const SSL* ssl) {
    return std::string_view(SSL_rstate_string(ssl)) == "RB";  // it reads the body
}

}  // namespace

void LogSslErrors() {
    for (unsigned long code = ERR_get_error(); code != 0; code = ERR_get_error()) {
        char text[256];
        ERR_error_string_n(code, text, sizeof(text));
        SLOG_ERR("ssl-errors: %s\n", text);
    }
}

constinit const Channel::Transport Channel::kTlsTransport = {
    [](void* handle, void* buffer, size_t length, const timeval& timeout) {
        return SSLReadFd(static_cast<SSL*>(handle), buffer, length, timeout);
    },
    [](void* handle, const void* buffer, size_t length, const timeval& timeout) {
        return SSLWriteFd(static_cast<SSL*>(handle), buffer, length, timeout);
    },
    TlsDescriptor,
    CloseTls,
    [](const void* handle) { return handle == nullptr; },
};

// Waits in the direction that the operation begins with, and then in the one that OpenSSL asks for
// until `move` has moved something.
template <typename Move>
int Channel::MoveThroughSSL(ssl_st* ssl, bool for_writing, const timeval& timeout,
                            const Move& move) {
    const auto* channel = static_cast<const Channel*>(SSL_get_app_data(ssl));
    const bool is_write = for_writing;
    const Deadline deadline(timeout);
    // Bytes of a record that is decrypted already make no socket readable. And when the last try
    // ended with a wish for the other direction, this operation may be the one that has it, or not:
    // the library knows.
    bool must_wait = SSL_want(ssl) != (is_write ? SSL_READING : SSL_WRITING) &&
                     (is_write || SSL_pending(ssl) == 0);
    for (;;) {
        if (must_wait) {
            const int result = WaitForSocket(SSL_get_fd(ssl), for_writing, timeout);
            if (result != 0) return result;
        }
        ERR_clear_error();
        errno = 0;
        const int count = move();
        if (count > 0) return count;
        const int error = errno;
        const int code = SSL_get_error(ssl, count);
        if (code != SSL_ERROR_WANT_READ && code != SSL_ERROR_WANT_WRITE) {
            LogFailure(is_write, code, error);
            return ERR_IO;
        }
        for_writing = code == SSL_ERROR_WANT_WRITE;
        must_wait = true;
        // A peer that lets a record trickle in, or sends records without text, keeps this loop
        // going. The latter are silence, and the caller counts it.
        if (channel->IsAborted()) return -1;
        if (!for_writing && deadline.IsOver() && !IsWithinRecord(ssl)) {
            return ERR_CONNECTION_TIMEOUT;
        }
    }
}

ssize_t Channel::SSLReadFd(ssl_st* ssl, void* buffer, size_t length, const timeval& timeout) {
    if (length == 0) {
        SLOG_ERR("SSLReadFd: request 0\n");
        return ERR_INVALID_ARGUMENT;
    }
    const int size = static_cast<int>(std::min<size_t>(length, INT_MAX));
    return MoveThroughSSL(ssl, false, timeout, [&] { return SSL_read(ssl, buffer, size); });
}

ssize_t Channel::SSLWriteFd(ssl_st* ssl, const void* buffer, size_t length,
                            const timeval& timeout) {
    const int size = static_cast<int>(std::min<size_t>(length, INT_MAX));
    return MoveThroughSSL(ssl, true, timeout, [&] { return SSL_write(ssl, buffer, size); });
}
