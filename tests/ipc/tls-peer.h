// The other end of a TLS channel: OpenSSL itself, not our code.
//
// Its records pass through memory on their way to the socket, so that a test can hold them up, cut
// them in pieces, or say something else in their place.
#pragma once

#include <openssl/ssl.h>

#include <memory>
#include <string>

#include "ipc/tls-certificates.h"
#include "utils/unique-fd.h"

class TlsPeer {
public:
    enum Side { SERVER, CLIENT };
    enum Outcome {
        DONE,     // the handshake is over
        STALLED,  // all bytes that may be sent are; the connection stays open
        ENDED,    // the other end has hung up, or said something wrong
    };

    // Takes the descriptor over. As a server it shows `identity`.
    TlsPeer(int descriptor, Side side, const TestIdentity& identity);

    [[nodiscard]] SSL* Get() const { return m_ssl.get(); }
    [[nodiscard]] int Descriptor() const { return m_descriptor.Get(); }
    void HangUp() { m_descriptor.Reset(); }

    // Goes on with the handshake until so many bytes of its side of it have been sent in all.
    Outcome Handshake(size_t may_send = SIZE_MAX);
    // The bytes that carry `text`, or a goodbye: not sent yet.
    [[nodiscard]] std::string Sealed(const std::string& text);
    [[nodiscard]] std::string SealedGoodbye();
    void SendRaw(const std::string& bytes) const;
    void Send(const std::string& text) { SendRaw(Sealed(text)); }
    // What OpenSSL has put out since, for a test that has called it itself: not sent yet.
    [[nodiscard]] std::string TakeOutgoing();
    // Hands bytes of the socket to OpenSSL; false at its end.
    [[nodiscard]] bool Feed();
    // So many bytes of text, or what came until the other end hung up or said goodbye.
    [[nodiscard]] std::string Receive(size_t length);
    // Whether the other end has said goodbye.
    [[nodiscard]] bool HasSaidGoodbye() const {
        return (SSL_get_shutdown(m_ssl.get()) & SSL_RECEIVED_SHUTDOWN) != 0;
    }
    // Bytes of the handshake sent so far.
    [[nodiscard]] size_t Sent() const { return m_sent; }

private:
    UniqueFd m_descriptor;
    std::unique_ptr<SSL_CTX, FreeWith<SSL_CTX_free>> m_context;
    std::unique_ptr<SSL, FreeWith<SSL_free>> m_ssl;
    BIO* m_in;             // owned by m_ssl
    BIO* m_out;            // owned by m_ssl
    std::string m_unsent;  // what a handshake has held back
    size_t m_sent = 0;
};
