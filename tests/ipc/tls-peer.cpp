#include "ipc/tls-peer.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/time.h>

#include <algorithm>

TlsPeer::TlsPeer(int descriptor, Side side, const TestIdentity& identity)
    : m_descriptor(descriptor),
      m_context(SSL_CTX_new(side == SERVER ? TLS_server_method() : TLS_client_method())),
      m_ssl(SSL_new(m_context.get())),
      m_in(BIO_new(BIO_s_mem())),
      m_out(BIO_new(BIO_s_mem())) {
    const timeval patience{20, 0};  // a test that has gone wrong ends
    setsockopt(descriptor, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof(patience));
    setsockopt(descriptor, SOL_SOCKET, SO_SNDTIMEO, &patience, sizeof(patience));
    SSL_set_bio(m_ssl.get(), m_in, m_out);
    BIO_set_mem_eof_return(m_in, -1);  // nothing there is no end
    if (side == CLIENT) {
        SSL_set_connect_state(m_ssl.get());
        return;
    }
    EXPECT_EQ(1, SSL_use_certificate(m_ssl.get(), identity.certificate.get()));
    EXPECT_EQ(1, SSL_use_PrivateKey(m_ssl.get(), identity.key.get()));
    SSL_set_accept_state(m_ssl.get());
}

std::string TlsPeer::TakeOutgoing() {
    std::string out(BIO_ctrl_pending(m_out), '\0');
    if (out.empty()) return out;
    EXPECT_LT(0, BIO_read(m_out, out.data(), static_cast<int>(out.size())));
    return out;
}

bool TlsPeer::Feed() {
    char bytes[4096];
    const ssize_t count = recv(m_descriptor.Get(), bytes, sizeof(bytes), 0);
    if (count <= 0) return false;
    EXPECT_EQ(count, BIO_write(m_in, bytes, static_cast<int>(count)));
    return true;
}

void TlsPeer::SendRaw(const std::string& bytes) const {
    for (size_t at = 0; at < bytes.size();) {
        const ssize_t count =
            send(m_descriptor.Get(), bytes.data() + at, bytes.size() - at, MSG_NOSIGNAL);
        if (count <= 0) return;  // the other end has gone: its test says whether that is right
        at += static_cast<size_t>(count);
    }
}

TlsPeer::Outcome TlsPeer::Handshake(size_t may_send) {
    for (;;) {
        const int result = SSL_do_handshake(m_ssl.get());
        m_unsent += TakeOutgoing();
        const size_t length = std::min(m_unsent.size(), may_send - m_sent);
        SendRaw(m_unsent.substr(0, length));
        m_unsent.erase(0, length);
        m_sent += length;
        if (!m_unsent.empty()) return STALLED;
        if (result == 1) return DONE;
        if (SSL_get_error(m_ssl.get(), result) != SSL_ERROR_WANT_READ || !Feed()) return ENDED;
    }
}

std::string TlsPeer::Sealed(const std::string& text) {
    EXPECT_EQ(static_cast<int>(text.size()),
              SSL_write(m_ssl.get(), text.data(), static_cast<int>(text.size())));
    return TakeOutgoing();
}

std::string TlsPeer::SealedGoodbye() {
    SSL_shutdown(m_ssl.get());
    return TakeOutgoing();
}

std::string TlsPeer::Receive(size_t length) {
    std::string out;
    char bytes[4096];
    while (out.size() < length) {
        const int count = SSL_read(m_ssl.get(), bytes,
                                   static_cast<int>(std::min(sizeof(bytes), length - out.size())));
        SendRaw(TakeOutgoing());  // an answer to a change of keys
        if (count > 0) {
            out.append(bytes, static_cast<size_t>(count));
        } else if (SSL_get_error(m_ssl.get(), count) != SSL_ERROR_WANT_READ || !Feed()) {
            break;
        }
    }
    return out;
}
