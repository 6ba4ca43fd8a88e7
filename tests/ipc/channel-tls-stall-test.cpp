// TLS peers that stall, hang up, or say something wrong, at many places.
#include <sys/socket.h>

#include <atomic>
#include <thread>

#include "ipc/channel-tls-fixture.h"
#include "ipc/signal-storm.h"

namespace {

const char kTimedOut[] = "[ERR] SSLHandshake: timed out during connect (60 seconds), abort anyway";

// A handshake of this version with a peer on this side.
struct Handshake {
    int version;
    TlsPeer::Side side;
};

constexpr Handshake kHandshakes[] = {
    {TLS1_2_VERSION, TlsPeer::SERVER},
    {TLS1_2_VERSION, TlsPeer::CLIENT},
    {TLS1_3_VERSION, TlsPeer::SERVER},
    {TLS1_3_VERSION, TlsPeer::CLIENT},
};

void PrintTo(const Handshake& handshake, std::ostream* out) {
    *out << (handshake.version == TLS1_2_VERSION ? "TLS 1.2" : "TLS 1.3") << " with a "
         << (handshake.side == TlsPeer::SERVER ? "server" : "client");
}

// Bytes between the places where a handshake breaks off.
constexpr size_t kStep = 61;

class ChannelTlsStallTest : public ChannelTlsTest {
protected:
    void ConnectPeerOf(const Handshake& handshake) {
        ConnectPeer(handshake.side);
        PeerSpeaks(handshake.version);
        SSL_set_num_tickets(m_peer->Get(), 0);  // they come after it
    }
    // Bytes that the peer sends in a whole handshake.
    [[nodiscard]] size_t HandshakeBytes(const Handshake& handshake) {
        ConnectPeerOf(handshake);
        EXPECT_EQ(0, Convert(handshake.side == TlsPeer::CLIENT));
        m_channel.Close();
        return m_peer->Sent() - 8;  // signatures differ in length by some bytes
    }
    // A handshake of which the peer sends so many bytes; then it stalls, or hangs up.
    [[nodiscard]] int ConvertWithPartOf(const Handshake& handshake, size_t bytes, bool hangs_up) {
        ConnectPeerOf(handshake);
        auto peer = std::async(std::launch::async, [this, bytes, hangs_up] {
            m_outcome = m_peer->Handshake(bytes);
            if (hangs_up) shutdown(m_peer->Descriptor(), SHUT_WR);
        });
        const int result = m_channel.ConvertToSSLChannel(handshake.side == TlsPeer::CLIENT);
        m_channel.Close();
        peer.get();
        return result;
    }
};

TEST_F(ChannelTlsStallTest, APeerThatNeverAnswersIsGivenUpAfterTwentyWaits) {
    for (const bool server : {false, true}) {
        const UniqueFd silent(Connect(m_channel));
        m_channel.WaitMilliseconds(1);
        LogCapture log;
        EXPECT_EQ(ERR_IO, m_channel.ConvertToSSLChannel(server));
        EXPECT_EQ(20, log.Count("[DBG] select: timeout"));
        EXPECT_TRUE(log.Has(kTimedOut));
        EXPECT_TRUE(log.Has("[ERR] Open to SSL connect to server failed"));
        m_channel.Close();
    }
}

TEST_F(ChannelTlsStallTest, SignalsDoNotProlongTheWaitForAHandshake) {
    const UniqueFd silent(Connect(m_channel));
    m_channel.WaitMilliseconds(50);
    m_channel.SetTimeout(9);
    LogCapture log;
    const SignalStorm storm;
    EXPECT_EQ(ERR_IO, m_channel.ConvertToSSLChannel(false));
    EXPECT_FALSE(storm.HasBlownOver());
    EXPECT_TRUE(log.Has("[DBG] select: EINTR"));
    EXPECT_EQ(3, log.Count("[DBG] select: timeout"));
}

class BrokenHandshakeTest : public ChannelTlsStallTest,
                            public testing::WithParamInterface<Handshake> {};

TEST_P(BrokenHandshakeTest, APeerThatStallsAtAnyStepOf61BytesIsGivenUp) {
    const size_t whole = HandshakeBytes(GetParam());
    m_channel.WaitMilliseconds(1);
    for (size_t bytes = 0; bytes < whole; bytes += kStep) {
        LogCapture log;
        ASSERT_EQ(ERR_IO, ConvertWithPartOf(GetParam(), bytes, false)) << bytes << " of " << whole;
        EXPECT_TRUE(log.Has(kTimedOut)) << bytes;
        EXPECT_EQ(TlsPeer::STALLED, m_outcome) << bytes;
    }
}

TEST_P(BrokenHandshakeTest, APeerThatHangsUpAtAnyStepOf61BytesEndsTheHandshake) {
    const size_t whole = HandshakeBytes(GetParam());
    for (size_t bytes = 0; bytes < whole; bytes += kStep) {
        LogCapture log;
        ASSERT_EQ(ERR_IO, ConvertWithPartOf(GetParam(), bytes, true)) << bytes << " of " << whole;
        EXPECT_FALSE(log.Has(kTimedOut)) << bytes;
        EXPECT_TRUE(log.Contains("[ERR] SSLHandshake: SSL ")) << bytes;
    }
}

INSTANTIATE_TEST_SUITE_P(VersionsAndSides, BrokenHandshakeTest, testing::ValuesIn(kHandshakes));

TEST_F(ChannelTlsStallTest, ASignOfLifeBeginsTheCountAnew) {
    ConnectPeer(TlsPeer::CLIENT);
    m_channel.WaitMilliseconds(40);
    LogCapture log;
    std::atomic<bool> is_over{false};
    auto peer = std::async(std::launch::async, [&] {
        for (int byte = 1; byte <= 6; ++byte) {
            while (log.Count("[DBG] select: timeout") < byte * 5 && !is_over) {
                std::this_thread::yield();
            }
            EXPECT_EQ(TlsPeer::STALLED, m_peer->Handshake(static_cast<size_t>(byte)));
        }
        return m_peer->Handshake();
    });
    EXPECT_EQ(0, m_channel.ConvertToSSLChannel(true));
    is_over = true;
    m_channel.Close();
    EXPECT_EQ(TlsPeer::DONE, peer.get());
    EXPECT_GE(log.Count("[DBG] select: timeout"), 30);
    EXPECT_TRUE(log.Has("[DBG] SSLHandshake: reset timeout"));
}

TEST_F(ChannelTlsStallTest, APeerThatSpeaksNoTlsEndsTheHandshake) {
    for (const bool server : {false, true}) {
        const UniqueFd other(Connect(m_channel));
        const std::string bytes = "GET / HTTP/1.1\r\nHost: nobody\r\n\r\n";
        ASSERT_EQ(static_cast<ssize_t>(bytes.size()),
                  send(other.Get(), bytes.data(), bytes.size(), 0));
        LogCapture log;
        EXPECT_EQ(ERR_IO, m_channel.ConvertToSSLChannel(server));
        EXPECT_TRUE(log.Has("[ERR] SSLHandshake: SSL fatel error code: 1"));
        EXPECT_TRUE(log.Contains("[ERR] ssl-errors: error:"));
        m_channel.Close();
    }
}

TEST_F(ChannelTlsStallTest, ADescriptorThatWasNotTunedDoesNotBlock) {
    int ends[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM, 0, ends));
    const UniqueFd silent(ends[1]);
    ASSERT_EQ(0, m_channel.Open(ends[0], false));
    m_channel.WaitMilliseconds(1);
    LogCapture log;
    EXPECT_EQ(ERR_IO, m_channel.ConvertToSSLChannel(true));
    EXPECT_TRUE(log.Has(kTimedOut));
}

TEST_F(ChannelTlsStallTest, AbortEndsAHandshake) {
    const UniqueFd silent(Connect(m_channel));
    m_channel.WaitMilliseconds(1);
    m_channel.SetTimeout(0);
    std::atomic<int> flag{0};
    m_channel.SetAbortFlag(&flag);
    LogCapture log;
    std::thread other([&] {
        while (log.Count("[DBG] select: timeout") < 25) std::this_thread::yield();
        flag = 1;
    });
    EXPECT_EQ(ERR_IO, m_channel.ConvertToSSLChannel(true));
    other.join();
    EXPECT_FALSE(log.Contains("timed out during connect"));
    m_channel.SetAbortFlag(nullptr);
}

// --- Once the handshake is over

TEST_F(ChannelTlsStallTest, LargeAmountsPassBothWaysThroughSmallRings) {
    QuickChannel small(100);
    m_peer.emplace(Connect(small), TlsPeer::SERVER, Certificates().server);
    auto peer = std::async(std::launch::async, [this] {
        EXPECT_EQ(TlsPeer::DONE, m_peer->Handshake());
        m_peer->Send(std::string(50000, 's'));  // records far larger than the ring
        return m_peer->Receive(50000);
    });
    ASSERT_EQ(0, small.ConvertToSSLChannel(false));
    LogCapture log;
    std::string got(50000, '\0');
    ASSERT_EQ(0, small.Read(got.data(), got.size()));
    EXPECT_TRUE(std::string(50000, 's') == got);
    // What lies decrypted in the library is taken without a wait for the socket.
    EXPECT_FALSE(log.Has("[DBG] select: timeout"));
    for (int i = 0; i < 500; ++i) {
        ASSERT_EQ(0, small.Write(std::string(100, 'c').data(), 100));
    }
    ASSERT_EQ(0, small.FlushWrite(0));
    EXPECT_TRUE(std::string(50000, 'c') == peer.get());
}

TEST_F(ChannelTlsStallTest, APeerThatStallsWithinARecordTimesOut) {
    Establish(TlsPeer::SERVER);
    m_channel.WaitMilliseconds(20);
    m_channel.SetTimeout(1);
    const std::string record = m_peer->Sealed("a record");
    m_peer->SendRaw(record.substr(0, record.size() / 2));
    EXPECT_EQ("", ChannelReceives(8));
    EXPECT_EQ(ERR_CONNECTION_TIMEOUT, m_result);
    m_peer->SendRaw(record.substr(record.size() / 2));  // and can go on
    EXPECT_EQ("a record", ChannelReceives(8));
    EXPECT_EQ(0, m_result);
}

TEST_F(ChannelTlsStallTest, AbortEndsAReadOfARecordThatTricklesIn) {
    Establish(TlsPeer::SERVER);
    std::atomic<int> flag{0};
    m_channel.SetAbortFlag(&flag);
    const std::string record = m_peer->Sealed(std::string(16000, 'x'));
    std::atomic<bool> is_done{false};
    std::thread other([&] {
        for (size_t at = 0; at + 1 < record.size() && !is_done; ++at) {
            if (at == 8000) flag = 1;
            m_peer->SendRaw(record.substr(at, 1));
        }
    });
    LogCapture log;
    EXPECT_EQ("", ChannelReceives(1));
    EXPECT_EQ(-1, m_result);
    EXPECT_FALSE(log.Has("[DBG] select: timeout"));  // at once, not when the trickle has ended
    is_done = true;
    other.join();
    m_channel.SetAbortFlag(nullptr);
}

TEST_F(ChannelTlsStallTest, APeerThatNeverReadsTimesOut) {
    Establish(TlsPeer::CLIENT);
    m_channel.WaitMilliseconds(20);
    m_channel.SetTimeout(1);
    const std::string block(Channel::DEFAULT_CAPACITY, 'b');
    LogCapture log;
    int result = 0;
    for (int i = 0; i < 300 && result == 0; ++i)
        result = m_channel.Write(block.data(), block.size());
    EXPECT_EQ(ERR_CONNECTION_TIMEOUT, result);
    EXPECT_TRUE(log.Has("[WARN] FlushWrite: Channel timeout for 1 seconds"));
}

TEST_F(ChannelTlsStallTest, APeerThatReadsLateGetsEveryByte) {
    Establish(TlsPeer::CLIENT);
    m_channel.WaitMilliseconds(1);
    constexpr size_t kBlocks = 600;
    constexpr size_t kBlock = 50000;
    LogCapture log;
    std::atomic<bool> is_over{false};
    auto peer = std::async(std::launch::async, [&] {
        // Only once a write has had to wait, so that it is taken up again in the middle.
        while (!log.Has("[DBG] select: timeout") && !is_over) std::this_thread::yield();
        return m_peer->Receive(kBlocks * kBlock);
    });
    std::string sent;
    int result = 0;
    for (size_t i = 0; i < kBlocks && result == 0; ++i) {
        const std::string block(kBlock, static_cast<char>(i));
        result = m_channel.Write(block.data(), block.size());
        sent += block;
    }
    if (result == 0) result = m_channel.FlushWrite(0);
    EXPECT_EQ(0, result);
    EXPECT_TRUE(log.Has("[DBG] select: timeout"));
    is_over = true;
    if (result != 0) m_channel.Close();
    EXPECT_TRUE(sent == peer.get());
}

}  // namespace
