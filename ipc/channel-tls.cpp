// Turning an open Channel into a TLS one.
#include <openssl/err.h>

#include <cerrno>
#include <cstring>

#include "ipc/channel.h"
#include "ipc/stall-count.h"
#include "ipc/tls-transport.h"
#include "ipc/wait-ready.h"
#include "utils/error-code.h"
#include "utils/log.h"

std::string Channel::m_cert_path = "/usr/keld/etc/ssl/ssl.crt/server.crt";
std::string Channel::m_key_path = "/usr/keld/etc/ssl/ssl.key/server.key";
std::string Channel::m_ca_path = "/certs.pem";

namespace {

// A key with a password is refused: the daemon has no terminal to ask for it, and without this the
// library would try.
int NoPassword(char* /*buffer*/, int /*size*/, int /*is_writing*/, void* /*data*/) { return -1; }

int SetUpServer(SSL* ssl, const std::string& certificate, const std::string& key) {
    if (SSL_use_certificate_file(ssl, certificate.c_str(), SSL_FILETYPE_PEM) != 1) {
        LogSslErrors();
        SLOG_ERR("Install certificate failed\n");
        SLOG_ERR("Open: init ssl certificate failed\n");
        return -1;
    }
    if (SSL_use_PrivateKey_file(ssl, key.c_str(), SSL_FILETYPE_PEM) != 1) {
        LogSslErrors();
        SLOG_ERR("Install private key failed\n");
        SLOG_ERR("Open: init ssl private key failed\n");
        return -1;
    }
    SSL_set_accept_state(ssl);
    return 0;
}

// Tried on another object first: the call fails where the library has the cipher no more, and then
// leaves none for anything before TLS 1.3, whatever the library's configuration file says.
bool OfferOldCipher(SSL* ssl, SSL_CTX* context) {
    static constexpr const char* kCipher = "RC4-MD5";
    const UniqueSsl probe(SSL_new(context));
    return probe != nullptr && SSL_set_cipher_list(probe.get(), kCipher) == 1 &&
           SSL_set_cipher_list(ssl, kCipher) == 1;
}

int SetUpClient(SSL* ssl, SSL_CTX* context, const std::string& trusted) {
    if (!OfferOldCipher(ssl, context)) {
        SLOG_WARN("can't set cipher suit to SSL3_TXT_RSA_RC4_128_MD5\n");
        ERR_clear_error();
    }
    if (SSL_CTX_load_verify_locations(context, trusted.c_str(), nullptr) != 1) {
        LogSslErrors();
        SLOG_ERR("SSL_CTX_load_verify_locations(%s) failed\n", trusted.c_str());
        SLOG_ERR("InitSSL(): set Verify store fail\n");
        return -1;
    }
    // The outcome is looked at after the handshake, if at all.
    SSL_set_verify(ssl, SSL_VERIFY_NONE, nullptr);
    SSL_set_connect_state(ssl);
    return 0;
}

}  // namespace

void Channel::SetCertificatePaths(const std::string& certificate, const std::string& key,
                                  const std::string& trusted) {
    m_cert_path = certificate;
    m_key_path = key;
    m_ca_path = trusted;
}

int Channel::InitSSL(ssl_st*& ssl, ssl_ctx_st*& context, bool server) {
    ERR_clear_error();
    UniqueSslContext new_context(
        SSL_CTX_new(server ? SSLv23_server_method() : SSLv23_client_method()));
    if (new_context == nullptr) {
        SLOG_ERR("m_ssl_ctx created failed\n");
        return -1;
    }
    SSL_CTX_set_default_passwd_cb(new_context.get(), NoPassword);
    UniqueSsl new_ssl(SSL_new(new_context.get()));
    if (new_ssl == nullptr) {
        SLOG_ERR("m_ssl created failed\n");
        return -1;
    }
    const int result = server ? SetUpServer(new_ssl.get(), m_cert_path, m_key_path)
                              : SetUpClient(new_ssl.get(), new_context.get(), m_ca_path);
    if (result != 0) return -1;
    ssl = new_ssl.release();
    context = new_context.release();
    return 0;
}

int Channel::ConvertToSSLChannel(bool server) {
    if (m_is_tls) {
        SLOG_WARN("ConvertToSSLChannel: Channel is SSL channel, no need to be converted\n");
        return 0;
    }
    const int result = BecomeTls(server);
    // It was to travel inside TLS: closing the channel would send it as it is.
    if (result != 0) ResetWrite();
    return result;
}

int Channel::BecomeTls(bool server) {
    ssl_st* ssl = nullptr;
    ssl_ctx_st* context = nullptr;
    if (InitSSL(ssl, context, server) != 0) {
        SLOG_ERR("Open: init ssl failed\n");
        return ERR_IO;
    }
    UniqueSslContext owned_context(context);
    UniqueSsl owned_ssl(ssl);
    if (const int result = StartSSL(ssl); result != 0) return result;
    delete static_cast<int*>(m_handle);
    m_handle = owned_ssl.release();
    static_cast<void>(owned_context.release());  // closing finds it by way of the handle
    SetFunctions(false);
    m_is_tls = true;
    // What came before the handshake may be anybody's: it must not count as said by the peer of it.
    ResetRead();
    return 0;
}

int Channel::StartSSL(ssl_st* ssl) {
    const int descriptor = m_transport.get_descriptor(m_handle);
    // Records are awaited here, not inside the library, also on a descriptor opened without tuning.
    if (descriptor < 0 || SetNonBlock(descriptor) != 0 || SSL_set_fd(ssl, descriptor) != 1) {
        SLOG_ERR("set fd failed\n");
        return ERR_IO;
    }
    SSL_set_app_data(ssl, this);
    // The rest of a write comes from another place of the ring, or after a look at the abort flag.
    SSL_set_mode(ssl, SSL_MODE_ENABLE_PARTIAL_WRITE | SSL_MODE_ACCEPT_MOVING_WRITE_BUFFER);
    // A record that carries no text ends a call, so that a peer that sends nothing else does not
    // keep the library from coming back.
    SSL_clear_mode(ssl, SSL_MODE_AUTO_RETRY);
    if (SSLHandshake(ssl, m_operation_timeout, m_total_timeout) != 0) {
        SLOG_ERR("Open to SSL connect to server failed\n");
        return ERR_IO;
    }
    if (!m_skip_verify && SSL_get_verify_result(ssl) != X509_V_OK) {
        SLOG_ERR("ConvertToSSLChannel: Verify Fail!\n");
        return ERR_SSL_VERIFY;
    }
    return 0;
}

int Channel::SSLHandshake(ssl_st* ssl, const timeval& timeout, unsigned total) const {
    for (StallCount stalls(total);;) {
        if (IsAborted()) return -1;
        ERR_clear_error();
        const int result = SSL_do_handshake(ssl);
        if (result == 1) return 0;
        const int code = SSL_get_error(ssl, result);
        if (code != SSL_ERROR_WANT_READ && code != SSL_ERROR_WANT_WRITE) {
            LogSslErrors();
            if (result == 0) {
                SLOG_ERR("SSLHandshake: SSL error code: %d\n", code);
            } else {
                SLOG_ERR("SSLHandshake: SSL fatel error code: %d\n", code);
            }
            return -1;
        }
        const bool for_writing = code == SSL_ERROR_WANT_WRITE;
        if (WaitForHandshake(ssl, for_writing, timeout, stalls) != 0) return -1;
    }
}

// One wait. 0 also after a timeout, while the limit is not reached.
int Channel::WaitForHandshake(ssl_st* ssl, bool for_writing, const timeval& timeout,
                              StallCount& stalls) const {
    const int ready = WaitDespiteSignals(SSL_get_fd(ssl), for_writing, timeout);
    if (ready > 0) {
        SLOG_DBG("SSLHandshake: reset timeout\n");
        stalls.Reset();
        return 0;
    }
    if (ready < 0) {
        SLOG_ERR("SSLHandshake: select: Error Code: %s (%d)\n", std::strerror(errno), errno);
        return -1;
    }
    SLOG_DBG("select: timeout\n");
    if (!stalls.CountTimeout()) return 0;
    SLOG_ERR("SSLHandshake: timed out during connect (%u seconds), abort anyway\n",
             m_total_timeout);
    return -1;
}
