// TLS peers that stall, hang up, or say something wrong, at every step.
#include <sys/socket.h>

#include <atomic>
#include <thread>

#include "ipc/channel-tls-fixture.h"

namespace {

const char kTimedOut[] = "[ERR] SSLHandshake: timed out during connect (60 seconds), abort anyway";

class ChannelTlsStallTest : public ChannelTlsTest {
protected:
    // Bytes that the peer sends in a whole handshake.
    [[nodiscard]] size_t HandshakeBytes(TlsPeer::Side side) {
        ConnectPeer(side);
        SSL_set_num_tickets(m_peer->Get(), 0);  // they come after it
        EXPECT_EQ(0, Convert(side == TlsPeer::CLIENT));
        m_channel.Close();
        return m_peer->Sent() - 8;  // signatures differ in length by some bytes
    }
    // A handshake of which the peer sends so many bytes; then it stalls, or hangs up.
    [[nodiscard]] int ConvertWithPartOf(TlsPeer::Side side, size_t bytes, bool hangs_up) {
        ConnectPeer(side);
        SSL_set_num_tickets(m_peer->Get(), 0);
        auto peer = std::async(std::launch::async, [this, bytes, hangs_up] {
            m_outcome = m_peer->Handshake(bytes);
            if (hangs_up) shutdown(m_peer->Descriptor(), SHUT_WR);
        });
        const int result = m_channel.ConvertToSSLChannel(side == TlsPeer::CLIENT);
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

TEST_F(ChannelTlsStallTest, APeerThatStallsAfterAnyByteIsGivenUp) {
    for (const TlsPeer::Side side : {TlsPeer::SERVER, TlsPeer::CLIENT}) {
        const size_t whole = HandshakeBytes(side);
        m_channel.WaitMilliseconds(1);
        for (size_t bytes = 0; bytes < whole; bytes += 61) {
            LogCapture log;
            ASSERT_EQ(ERR_IO, ConvertWithPartOf(side, bytes, false)) << bytes << " of " << whole;
            EXPECT_TRUE(log.Has(kTimedOut)) << bytes;
            EXPECT_EQ(TlsPeer::STALLED, m_outcome) << bytes;
        }
        m_channel.WaitMilliseconds(1000);
    }
}

TEST_F(ChannelTlsStallTest, APeerThatHangsUpAfterAnyByteEndsTheHandshake) {
    for (const TlsPeer::Side side : {TlsPeer::SERVER, TlsPeer::CLIENT}) {
        const size_t whole = HandshakeBytes(side);
        for (size_t bytes = 0; bytes < whole; bytes += 61) {
            LogCapture log;
            ASSERT_EQ(ERR_IO, ConvertWithPartOf(side, bytes, true)) << bytes << " of " << whole;
            EXPECT_FALSE(log.Has(kTimedOut)) << bytes;
            EXPECT_TRUE(log.Contains("[ERR] SSLHandshake: SSL ")) << bytes;
        }
    }
}

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

TEST_F(ChannelTlsStallTest, APeerThatHangsUpIsAnInputError) {
    Establish(TlsPeer::SERVER);
    const std::string record = m_peer->Sealed("abcd");
    m_peer->SendRaw(record + record.substr(0, 3));
    m_peer->HangUp();
    LogCapture log;
    EXPECT_EQ("abcd", ChannelReceives(10));
    EXPECT_EQ(ERR_IO, m_result);
    EXPECT_TRUE(log.Contains("[ERR] read: "));
    EXPECT_TRUE(log.Has("[ERR] Diagnose: SSL_read failed"));
    const std::string block(Channel::DEFAULT_CAPACITY, 'b');
    int result = 0;
    for (int i = 0; i < 300 && result == 0; ++i)
        result = m_channel.Write(block.data(), block.size());
    EXPECT_EQ(ERR_IO, result);
    EXPECT_TRUE(log.Contains("[ERR] write: "));
    m_channel.Close();
    EXPECT_TRUE(m_channel.IsClosed());
}

TEST_F(ChannelTlsStallTest, APeerThatSaysGoodbyeIsAtAnEnd) {
    Establish(TlsPeer::SERVER);
    m_peer->Send("last");
    m_peer->SendRaw(m_peer->SealedGoodbye());
    LogCapture log;
    EXPECT_EQ("last", ChannelReceives(5));
    EXPECT_EQ(ERR_IO, m_result);
    EXPECT_TRUE(
        log.Has("[ERR] Diagnose: select says the socket is readable but actually we can't "
                "read ... connection closed?"));
    EXPECT_TRUE(log.Has("[ERR] Diagnose: SSL_read failed"));
}

TEST_F(ChannelTlsStallTest, BytesThatAreNoRecordAreAnInputError) {
    Establish(TlsPeer::SERVER);
    std::string record = m_peer->Sealed("forged");
    record.back() = static_cast<char>(record.back() ^ 1);
    m_peer->SendRaw(record);
    LogCapture log;
    EXPECT_EQ("", ChannelReceives(6));
    EXPECT_EQ(ERR_IO, m_result);
    EXPECT_TRUE(log.Contains("[ERR] ssl-errors: error:"));
}

TEST_F(ChannelTlsStallTest, AChangeOfKeysIsNotNoticed) {
    Establish(TlsPeer::SERVER);
    ASSERT_EQ(1, SSL_key_update(m_peer->Get(), SSL_KEY_UPDATE_REQUESTED));
    m_peer->Send("new keys");
    EXPECT_EQ("new keys", ChannelReceives(8));
    ChannelSends("mine too");
    EXPECT_EQ("mine too", m_peer->Receive(8));
}

TEST_F(ChannelTlsStallTest, AReadOfNothingIsRefused) {
    class Bare : public Channel {
    public:
        using Channel::SSLReadFd;
    };
    Establish(TlsPeer::SERVER);
    LogCapture log;
    EXPECT_EQ(ERR_INVALID_ARGUMENT, Bare::SSLReadFd(nullptr, nullptr, 0, {0, 0}));
    EXPECT_TRUE(log.Has("[ERR] SSLReadFd: request 0"));
}

}  // namespace
