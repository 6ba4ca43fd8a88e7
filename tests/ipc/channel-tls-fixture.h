// A channel on one end of a TCP connection over the loopback interface, OpenSSL on the other.
#pragma once

#include <gtest/gtest.h>
#include <signal.h>

#include <future>
#include <optional>
#include <string>

#include "ipc/channel.h"
#include "ipc/simple-ipc.h"
#include "ipc/tls-peer.h"
#include "support/log-capture.h"
#include "utils/error-code.h"

// A channel whose waits for the socket are as short as a test wants them.
class QuickChannel : public Channel {
public:
    explicit QuickChannel(size_t capacity = DEFAULT_CAPACITY) : Channel(capacity) {}
    ~QuickChannel() override { Channel::Close(); }
    void WaitMilliseconds(int milliseconds) {
        m_operation_timeout = {milliseconds / 1000, milliseconds % 1000 * 1000};
    }
    // Once it speaks TLS.
    [[nodiscard]] SSL* Ssl() const { return static_cast<SSL*>(m_handle); }
};

class ChannelTlsTest : public testing::Test {
protected:
    static TestCertificates& Certificates() {
        static TestCertificates certificates;
        return certificates;
    }

    void SetUp() override {
        signal(SIGPIPE, SIG_IGN);  // as the daemon does
        Channel::SetCertificatePaths(Certificates().ServerFile(), Certificates().ServerKeyFile(),
                                     Certificates().AuthorityFile());
    }

    // Connects `channel`; returns the bare descriptor of the other end.
    [[nodiscard]] static int Connect(Channel& channel) {
        IPCListener listener;
        const int port = listener.ListenOnPort(0);
        EXPECT_EQ(0, channel.Open("127.0.0.1", port));
        return listener.Accept();
    }
    // Connects m_channel with m_peer; the peer plays `side`. No TLS yet.
    void ConnectPeer(TlsPeer::Side side, const TestIdentity& identity = Certificates().server) {
        m_peer.emplace(Connect(m_channel), side, identity);
    }
    // From now on the peer speaks this version only.
    void PeerSpeaks(int version) {
        ASSERT_EQ(1, SSL_set_min_proto_version(m_peer->Get(), version));
        ASSERT_EQ(1, SSL_set_max_proto_version(m_peer->Get(), version));
    }
    // Both ends make the handshake, the peer in a thread of its own. Returns the channel's result.
    [[nodiscard]] int Convert(bool server) {
        auto peer = std::async(std::launch::async, [this] { return m_peer->Handshake(); });
        const int result = m_channel.ConvertToSSLChannel(server);
        if (result != 0) m_channel.Close();
        m_outcome = peer.get();
        return result;
    }
    // The same, once connected; it has to succeed.
    void Establish(TlsPeer::Side peer_side) {
        ConnectPeer(peer_side);
        ASSERT_EQ(0, Convert(peer_side == TlsPeer::CLIENT));
        ASSERT_EQ(TlsPeer::DONE, m_outcome);
    }
    void ChannelSends(const std::string& text) {
        ASSERT_EQ(0, m_channel.Write(text.data(), text.size()));
        ASSERT_EQ(0, m_channel.FlushWrite(0));
    }
    [[nodiscard]] std::string ChannelReceives(size_t length) {
        std::string out(length, '\0');
        size_t got = 0;
        m_result = m_channel.Read(out.data(), length, &got);
        out.resize(got);
        return out;
    }

    QuickChannel m_channel;
    std::optional<TlsPeer> m_peer;
    TlsPeer::Outcome m_outcome = TlsPeer::ENDED;
    int m_result = -100;
};
