// The records of a TLS channel: their end, the ones that carry no text, and what they wait for.
#include <sys/socket.h>

#include <atomic>
#include <chrono>
#include <memory>
#include <thread>

#include "ipc/channel-tls-fixture.h"

namespace {

const char kNothingToRead[] =
    "[ERR] Diagnose: select says the socket is readable but actually we can't read ... connection "
    "closed?";

class Bare : public Channel {
public:
    using Channel::SSLReadFd;
};

class ChannelTlsRecordTest : public ChannelTlsTest {
protected:
    // A record that the channel's library takes without telling the channel.
    [[nodiscard]] std::string KeyUpdate() {
        EXPECT_EQ(1, SSL_key_update(m_peer->Get(), SSL_KEY_UPDATE_NOT_REQUESTED));
        EXPECT_EQ(1, SSL_do_handshake(m_peer->Get()));
        return m_peer->TakeOutgoing();
    }
};

// --- The end

TEST_F(ChannelTlsRecordTest, APeerThatHangsUpIsAnInputError) {
    Establish(TlsPeer::SERVER);
    const std::string record = m_peer->Sealed("abcd");
    m_peer->SendRaw(record + record.substr(0, 3));
    m_peer->HangUp();
    LogCapture log;
    EXPECT_EQ("abcd", ChannelReceives(10));
    EXPECT_EQ(ERR_IO, m_result);
    EXPECT_TRUE(log.Contains("[ERR] read: "));
    EXPECT_TRUE(log.Has(kNothingToRead));
    EXPECT_TRUE(log.Has("[ERR] Diagnose: SSL_read failed"));
    const std::string block(Channel::DEFAULT_CAPACITY, 'b');
    int result = 0;
    for (int i = 0; i < 300 && result == 0; ++i)
        result = m_channel.Write(block.data(), block.size());
    EXPECT_EQ(ERR_IO, result);
    EXPECT_TRUE(log.Contains("[ERR] write: "));
    EXPECT_TRUE(
        log.Has("[ERR] Diagnose: select says the socket is writeable but actually we can't "
                "write ... connection closed?"));
    m_channel.Close();
    EXPECT_TRUE(m_channel.IsClosed());
}

TEST_F(ChannelTlsRecordTest, AHangUpWithoutAGoodbyeIsAtAnEndToo) {
    for (const int version : {TLS1_2_VERSION, TLS1_3_VERSION}) {
        ConnectPeer(TlsPeer::SERVER);
        PeerSpeaks(version);
        ASSERT_EQ(0, Convert(false));
        m_peer->Send("last");
        m_peer->HangUp();
        LogCapture log;
        EXPECT_EQ("last", ChannelReceives(5));
        EXPECT_EQ(ERR_IO, m_result);
        EXPECT_TRUE(log.Has(kNothingToRead)) << version;
        EXPECT_TRUE(log.Has("[ERR] Diagnose: SSL_read failed"));
        m_channel.Close();
    }
}

TEST_F(ChannelTlsRecordTest, APeerThatSaysGoodbyeIsAtAnEnd) {
    Establish(TlsPeer::SERVER);
    m_peer->Send("last");
    m_peer->SendRaw(m_peer->SealedGoodbye());
    LogCapture log;
    EXPECT_EQ("last", ChannelReceives(5));
    EXPECT_EQ(ERR_IO, m_result);
    EXPECT_TRUE(log.Has(kNothingToRead));
    EXPECT_TRUE(log.Has("[ERR] Diagnose: SSL_read failed"));
}

TEST_F(ChannelTlsRecordTest, BytesThatAreNoRecordAreAnInputError) {
    Establish(TlsPeer::SERVER);
    std::string record = m_peer->Sealed("forged");
    record.back() = static_cast<char>(record.back() ^ 1);
    m_peer->SendRaw(record);
    LogCapture log;
    EXPECT_EQ("", ChannelReceives(6));
    EXPECT_EQ(ERR_IO, m_result);
    EXPECT_TRUE(log.Contains("[ERR] ssl-errors: error:"));
    EXPECT_FALSE(log.Has(kNothingToRead));
    EXPECT_TRUE(log.Has("[ERR] Diagnose: SSL_read failed"));
}

TEST_F(ChannelTlsRecordTest, AReadOfNothingIsRefused) {
    Establish(TlsPeer::SERVER);
    LogCapture log;
    EXPECT_EQ(ERR_INVALID_ARGUMENT, Bare::SSLReadFd(nullptr, nullptr, 0, {0, 0}));
    EXPECT_TRUE(log.Has("[ERR] SSLReadFd: request 0"));
}

TEST_F(ChannelTlsRecordTest, AWaitThatFailsIsNoFailedRead) {
    const std::unique_ptr<SSL_CTX, FreeWith<SSL_CTX_free>> context(
        SSL_CTX_new(TLS_client_method()));
    const std::unique_ptr<SSL, FreeWith<SSL_free>> ssl(
        SSL_new(context.get()));  // without a descriptor
    LogCapture log;
    char byte = 0;
    EXPECT_EQ(ERR_IO, Bare::SSLReadFd(ssl.get(), &byte, 1, {0, 0}));
    EXPECT_TRUE(log.Has("[ERR] select: [9] Bad file descriptor"));
    EXPECT_FALSE(log.Contains("SSL_read"));
}

// --- Without text

TEST_F(ChannelTlsRecordTest, AChangeOfKeysIsNotNoticed) {
    Establish(TlsPeer::SERVER);
    ASSERT_EQ(1, SSL_key_update(m_peer->Get(), SSL_KEY_UPDATE_REQUESTED));
    m_peer->Send("new keys");
    EXPECT_EQ("new keys", ChannelReceives(8));
    ChannelSends("mine too");
    EXPECT_EQ("mine too", m_peer->Receive(8));
}

TEST_F(ChannelTlsRecordTest, AbortIsSeenBetweenRecordsWithoutText) {
    Establish(TlsPeer::SERVER);
    std::string updates;
    for (int i = 0; i < 20; ++i) updates += KeyUpdate();
    m_peer->SendRaw(updates);
    static std::atomic<int> flag;
    static int messages;
    flag = 0;
    messages = 0;
    SSL_set_msg_callback(m_channel.Ssl(), [](int is_write, int /*version*/, int type, const void*,
                                             size_t, SSL*, void*) {
        if (is_write != 0 || type != SSL3_RT_HANDSHAKE) return;
        ++messages;
        flag = 1;
    });
    m_channel.SetAbortFlag(&flag);
    EXPECT_EQ("", ChannelReceives(1));
    EXPECT_EQ(-1, m_result);
    EXPECT_EQ(1, messages);
    m_channel.SetAbortFlag(nullptr);
}

TEST_F(ChannelTlsRecordTest, RecordsWithoutTextAreSilence) {
    Establish(TlsPeer::SERVER);
    m_channel.WaitMilliseconds(200);
    m_channel.SetTimeout(1);
    std::atomic<bool> is_done{false};
    // Whether it still went on when the channel gave up.
    auto flood = std::async(std::launch::async, [&] {
        for (int i = 0; i < 5000; ++i) {
            if (is_done) return true;
            m_peer->SendRaw(KeyUpdate());
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        return false;
    });
    EXPECT_EQ("", ChannelReceives(1));
    EXPECT_EQ(ERR_CONNECTION_TIMEOUT, m_result);
    is_done = true;
    EXPECT_TRUE(flood.get());
    m_channel.SetTimeout(60);
    m_peer->Send("text at last");
    EXPECT_EQ("text at last", ChannelReceives(12));
}

TEST_F(ChannelTlsRecordTest, ARecordThatTricklesInIsNoSilence) {
    Establish(TlsPeer::SERVER);
    m_channel.WaitMilliseconds(100);
    m_channel.SetTimeout(1);
    const std::string record = m_peer->Sealed(std::string(100, 'x'));
    std::thread other([&] {
        m_peer->SendRaw(record.substr(0, 5));  // its header
        for (size_t at = 5; at < record.size(); ++at) {
            std::this_thread::sleep_for(std::chrono::milliseconds(13));
            m_peer->SendRaw(record.substr(at, 1));
        }
    });
    EXPECT_EQ(std::string(100, 'x'), ChannelReceives(100));
    EXPECT_EQ(0, m_result);
    other.join();
}

// --- Directions

// Sends bytes of no meaning until there is no room for one more; returns how many.
size_t FillUp(int descriptor) {
    const std::string junk(4096, 'j');
    size_t total = 0;
    for (size_t length = junk.size(); length > 0;) {
        const ssize_t count = send(descriptor, junk.data(), length, MSG_DONTWAIT);
        if (count > 0) {
            total += static_cast<size_t>(count);
        } else {
            length /= 2;
        }
    }
    return total;
}

void TakeAway(int descriptor, size_t length) {
    std::string bytes(length, '\0');
    EXPECT_EQ(static_cast<ssize_t>(length),
              recv(descriptor, bytes.data(), bytes.size(), MSG_WAITALL));
}

TEST_F(ChannelTlsRecordTest, AReadThatHadToWriteGoesOnWhenThereIsRoom) {
    int ends[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM, 0, ends));
    ASSERT_EQ(0, m_channel.Open(ends[0], true));
    m_peer.emplace(ends[1], TlsPeer::SERVER, Certificates().server);
    PeerSpeaks(TLS1_2_VERSION);
    ASSERT_EQ(0, Convert(false));
    m_channel.WaitMilliseconds(20);
    m_channel.SetTimeout(5);
    // A new handshake: the channel's part in it is said while it reads, and finds no room.
    ASSERT_EQ(1, SSL_renegotiate(m_peer->Get()));
    ASSERT_EQ(1, SSL_do_handshake(m_peer->Get()));
    m_peer->SendRaw(m_peer->TakeOutgoing());
    const size_t junk = FillUp(ends[0]);
    LogCapture log;
    std::atomic<bool> is_over{false};
    auto peer = std::async(std::launch::async, [&] {
        while (log.Count("[DBG] select: timeout") < 3 && !is_over) std::this_thread::yield();
        TakeAway(ends[1], junk);
        char byte = 0;
        while (SSL_renegotiate_pending(m_peer->Get()) != 0) {
            EXPECT_GE(0, SSL_read(m_peer->Get(), &byte, 1));
            m_peer->SendRaw(m_peer->TakeOutgoing());
            if (SSL_renegotiate_pending(m_peer->Get()) != 0 && !m_peer->Feed()) return;
        }
        m_peer->Send("told");
    });
    EXPECT_EQ("told", ChannelReceives(4));
    EXPECT_EQ(0, m_result);
    is_over = true;
    m_channel.Close();
    peer.get();
}

// What a read last waited for is no matter of a write.
TEST_F(ChannelTlsRecordTest, AWriteAfterAReadThatTimedOutDoesNotWaitForThePeer) {
    Establish(TlsPeer::SERVER);
    m_channel.WaitMilliseconds(1);
    m_channel.SetTimeout(1);
    const std::string record = m_peer->Sealed("half");
    m_peer->SendRaw(record.substr(0, 7));
    EXPECT_EQ("", ChannelReceives(4));
    EXPECT_EQ(ERR_CONNECTION_TIMEOUT, m_result);
    ASSERT_TRUE(SSL_want_read(m_channel.Ssl()));
    LogCapture log;
    ChannelSends("meanwhile");
    EXPECT_FALSE(log.Has("[DBG] select: timeout"));
    EXPECT_EQ("meanwhile", m_peer->Receive(9));
}

}  // namespace
