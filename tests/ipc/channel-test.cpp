#include "ipc/channel.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <string>
#include <thread>

#include "ipc/memory-channel.h"
#include "ipc/signal-storm.h"
#include "support/log-capture.h"
#include "utils/error-code.h"
#include "utils/unique-fd.h"

namespace {

// A channel on one end of a connection, the bare descriptor on the other.
class ChannelTest : public testing::Test {
protected:
    void SetUp() override {
        signal(SIGPIPE, SIG_IGN);  // as the daemon does
        int ends[2];
        ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM, 0, ends));
        m_descriptor = ends[0];
        m_peer.Reset(ends[1]);
    }
    void OpenTuned() { ASSERT_EQ(0, m_channel.Open(m_descriptor, true)); }
    void PeerSends(const std::string& bytes) const {
        ASSERT_EQ(static_cast<ssize_t>(bytes.size()),
                  send(m_peer.Get(), bytes.data(), bytes.size(), 0));
    }
    // What has arrived at the peer by now.
    [[nodiscard]] std::string PeerTakes() const {
        std::string out(1 << 20, '\0');
        const ssize_t count = recv(m_peer.Get(), out.data(), out.size(), MSG_DONTWAIT);
        out.resize(count > 0 ? static_cast<size_t>(count) : 0);
        return out;
    }

    int m_descriptor = -1;
    UniqueFd m_peer;
    Channel m_channel{Channel::DEFAULT_CAPACITY};
};

TEST_F(ChannelTest, AClosedChannelRefusesReadsAndWrites) {
    UniqueFd unused(m_descriptor);
    char byte = 0;
    size_t got = 7;
    EXPECT_TRUE(m_channel.IsClosed());
    EXPECT_EQ(ERR_IO, m_channel.Read(&byte, 1, &got));
    EXPECT_EQ(0U, got);
    EXPECT_EQ(ERR_IO, m_channel.Write(&byte, 1));
    EXPECT_EQ(0, m_channel.FlushWrite(0));
    m_channel.Close();
    EXPECT_TRUE(m_channel.IsClosed());
}

TEST_F(ChannelTest, OpenTunesTheDescriptor) {
    OpenTuned();
    EXPECT_FALSE(m_channel.IsClosed());
    EXPECT_NE(0, fcntl(m_descriptor, F_GETFL) & O_NONBLOCK);
    linger value{};
    socklen_t size = sizeof(value);
    ASSERT_EQ(0, getsockopt(m_descriptor, SOL_SOCKET, SO_LINGER, &value, &size));
    EXPECT_EQ(1, value.l_onoff);
    EXPECT_EQ(1, value.l_linger);
}

TEST_F(ChannelTest, OpenWithoutTuningLeavesTheDescriptorAsItIs) {
    ASSERT_EQ(0, m_channel.Open(m_descriptor, false));
    EXPECT_EQ(0, fcntl(m_descriptor, F_GETFL) & O_NONBLOCK);
}

TEST_F(ChannelTest, OpenOnAnOpenChannelIsRefusedAndLeavesItOpen) {
    OpenTuned();
    LogCapture log;
    EXPECT_EQ(ERR_INVALID_ARGUMENT, m_channel.Open(m_peer.Get(), true));
    EXPECT_TRUE(
        log.Has("[ERR] Open: Channel already opened [" + std::to_string(m_descriptor) + "]"));
    EXPECT_TRUE(log.Has("[ERR] Open: Invalid argument"));
    PeerSends("x");
    uint8_t byte = 0;
    EXPECT_EQ(0, m_channel.ReadU8(&byte));
    EXPECT_EQ('x', byte);
}

TEST_F(ChannelTest, OpenOfNoDescriptorIsRefused) {
    UniqueFd unused(m_descriptor);
    LogCapture log;
    EXPECT_EQ(ERR_INVALID_ARGUMENT, m_channel.Open(-1, false));
    EXPECT_EQ(ERR_SYSTEM, m_channel.Open(-1, true));
    EXPECT_TRUE(log.Has("[ERR] setsockopt: Bad file descriptor"));
    EXPECT_TRUE(log.Has("[ERR] Open: SetLinger to socket [-1] failed, Bad file descriptor"));
    EXPECT_EQ(-1, m_channel.SetNonBlock(-1));
    EXPECT_TRUE(m_channel.IsClosed());
}

TEST_F(ChannelTest, IntegersAreBigEndianOnTheWire) {
    OpenTuned();
    ASSERT_EQ(0, m_channel.WriteU8(0x01));
    ASSERT_EQ(0, m_channel.WriteU16(0x0203));
    ASSERT_EQ(0, m_channel.WriteU32(0x04050607));
    ASSERT_EQ(0, m_channel.WriteU64(0x08090a0b0c0d0e0fULL));
    ASSERT_EQ(0, m_channel.FlushWrite(0));
    const std::string expected("\x01\x02\x03\x04\x05\x06\x07\x08\x09\x0a\x0b\x0c\x0d\x0e\x0f");
    EXPECT_EQ(expected, PeerTakes());
    PeerSends(expected);
    uint8_t u8 = 0;
    uint16_t u16 = 0;
    uint32_t u32 = 0;
    uint64_t u64 = 0;
    ASSERT_EQ(0, m_channel.ReadU8(&u8));
    ASSERT_EQ(0, m_channel.ReadU16(&u16));
    ASSERT_EQ(0, m_channel.ReadU32(&u32));
    ASSERT_EQ(0, m_channel.ReadU64(&u64));
    EXPECT_EQ(0x01U, u8);
    EXPECT_EQ(0x0203U, u16);
    EXPECT_EQ(0x04050607U, u32);
    EXPECT_EQ(0x08090a0b0c0d0e0fULL, u64);
    EXPECT_EQ(0x0201U, m_channel.SwapU16(0x0102));
    EXPECT_EQ(0x04030201U, m_channel.SwapU32(0x01020304));
    EXPECT_EQ(0x0807060504030201ULL, m_channel.SwapU64(0x0102030405060708ULL));
}

TEST_F(ChannelTest, NothingIsSentBeforeAFlush) {
    OpenTuned();
    ASSERT_EQ(0, m_channel.Write("abc", 3));
    EXPECT_EQ("", PeerTakes());
    ASSERT_EQ(0, m_channel.FlushWrite(0));
    EXPECT_EQ("abc", PeerTakes());
}

TEST_F(ChannelTest, CloseFlushesWhatIsPending) {
    OpenTuned();
    ASSERT_EQ(0, m_channel.Write("abc", 3));
    LogCapture log;
    m_channel.Close();
    EXPECT_EQ("abc", PeerTakes());
    EXPECT_TRUE(log.Has("[DBG] Channel: socket " + std::to_string(m_descriptor) + " closed"));
    EXPECT_EQ(-1, fcntl(m_descriptor, F_GETFD));
}

TEST_F(ChannelTest, CloseWithAPeerThatIsGoneTellsTheOutcome) {
    OpenTuned();
    ASSERT_EQ(0, m_channel.Write("abc", 3));
    m_peer.Reset();
    LogCapture log;
    m_channel.Close();
    EXPECT_TRUE(log.Has("[ERR] write: Broken pipe"));
    EXPECT_TRUE(log.Has("[ERR] FlushWrite: I/O error"));
    EXPECT_TRUE(m_channel.IsClosed());
}

TEST_F(ChannelTest, AClosedChannelCanBeOpenedAgainWithEmptyRings) {
    OpenTuned();
    PeerSends("leftover");
    char byte = 0;
    ASSERT_EQ(0, m_channel.Read(&byte, 1));
    m_channel.Close();
    int ends[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM, 0, ends));
    m_peer.Reset(ends[1]);
    ASSERT_EQ(0, m_channel.Open(ends[0], true));
    PeerSends("n");
    ASSERT_EQ(0, m_channel.Read(&byte, 1));
    EXPECT_EQ('n', byte);
}

TEST_F(ChannelTest, AReadFromAPeerThatClosesEarlyGivesWhatCame) {
    OpenTuned();
    PeerSends("abcd");
    m_peer.Reset();
    LogCapture log;
    char buffer[10] = {};
    size_t got = 0;
    EXPECT_EQ(ERR_IO, m_channel.Read(buffer, sizeof(buffer), &got));
    EXPECT_EQ(4U, got);
    EXPECT_EQ("abcd", std::string(buffer, 4));
    EXPECT_TRUE(log.Contains("[ERR] read: "));
    EXPECT_TRUE(
        log.Has("[ERR] Diagnose: select says the socket is readable but actually we can't "
                "read ... connection closed?"));
}

TEST_F(ChannelTest, TheDebugLinesTellWhatARead) {
    OpenTuned();
    PeerSends("abcdef");
    LogCapture log;
    char buffer[4];
    ASSERT_EQ(0, m_channel.Read(buffer, sizeof(buffer)));
    EXPECT_THAT(log.Lines(),
                testing::ElementsAre(
                    "[DBG] want = 4, len = 4, total = 0, capacity = 81920",
                    "[DBG] ReadMore: want = 4, total = 0, len = 81920, r_head = 0, r_size = 0",
                    "[DBG] ReadMore: read at least 4 bytes",
                    "[DBG] Read: read 4 bytes, head = 4, size = 2"));
    log.Clear();
    ASSERT_EQ(0, m_channel.Write(buffer, 4));
    ASSERT_EQ(0, m_channel.FlushWrite(0));
    EXPECT_THAT(log.Lines(),
                testing::ElementsAre("[DBG] Write: write 4 bytes", "[DBG] WriteFd: from 0, len 4",
                                     "[DBG] FlushWrite: flush at least 0 bytes"));
}

TEST_F(ChannelTest, AWriteOfTheCapacityIsHeldAndOneByteMoreIsRefused) {
    OpenTuned();
    const std::string block(Channel::DEFAULT_CAPACITY + 1, 'b');
    LogCapture log;
    EXPECT_EQ(ERR_INVALID_ARGUMENT, m_channel.Write(block.data(), block.size()));
    EXPECT_TRUE(log.Has("[ERR] Write: Exceed maximum data block size"));
    EXPECT_EQ("", PeerTakes());
    EXPECT_EQ(0, m_channel.Write(block.data(), block.size() - 1));
    EXPECT_FALSE(log.Contains("WriteFd"));
    EXPECT_EQ("", PeerTakes());
}

TEST_F(ChannelTest, AbortEndsAReadWithoutWaitingForTheTimeout) {
    OpenTuned();
    const std::atomic<int> flag{1};
    m_channel.SetAbortFlag(&flag);
    char byte = 0;
    EXPECT_EQ(-1, m_channel.Read(&byte, 1));
    ASSERT_EQ(0, m_channel.Write("x", 1));
    EXPECT_EQ(-1, m_channel.FlushWrite(0));
    m_channel.SetAbortFlag(nullptr);
    EXPECT_EQ(0, m_channel.FlushWrite(0));
}

TEST_F(ChannelTest, AnAbortFromAnotherThreadEndsAWait) {
    OpenTuned();
    std::atomic<int> flag{0};
    m_channel.SetAbortFlag(&flag);
    std::thread other([&flag] { flag = 1; });
    char byte = 0;
    EXPECT_EQ(-1, m_channel.Read(&byte, 1));
    other.join();
}

TEST_F(ChannelTest, SilenceOfTheTotalTimeoutEndsARead) {
    OpenTuned();
    m_channel.SetTimeout(1);
    LogCapture log;
    char byte = 0;
    EXPECT_EQ(ERR_CONNECTION_TIMEOUT, m_channel.Read(&byte, 1));
    EXPECT_TRUE(log.Has("[DBG] select: timeout"));
    EXPECT_TRUE(log.Has("[DBG] ReadMore: Channel timeout for 1 seconed"));
}

TEST_F(ChannelTest, APeerThatNeverReadsEndsAFlush) {
    OpenTuned();
    m_channel.SetTimeout(1);
    LogCapture log;
    const std::string block(Channel::DEFAULT_CAPACITY, 'b');
    int result = 0;
    for (int i = 0; i < 100 && result == 0; ++i)
        result = m_channel.Write(block.data(), block.size());
    EXPECT_EQ(ERR_CONNECTION_TIMEOUT, result);
    EXPECT_TRUE(log.Has("[WARN] FlushWrite: Channel timeout for 1 seconds"));
    EXPECT_TRUE(log.Has("[ERR] Write: FlushWrite failed"));
}

TEST_F(ChannelTest, ASignalDuringAWaitIsNotAnError) {
    OpenTuned();
    m_channel.SetTimeout(1);
    struct sigaction action {};
    action.sa_handler = [](int) {};  // without SA_RESTART
    ASSERT_EQ(0, sigaction(SIGUSR1, &action, nullptr));
    LogCapture log;
    const pthread_t reader = pthread_self();
    std::atomic<bool> done{false};
    std::thread other([&] {
        while (!done) {  // until one of them has met the wait
            pthread_kill(reader, SIGUSR1);
            if (log.Has("[DBG] select: EINTR")) break;
        }
        PeerSends("x");
    });
    char byte = 0;
    EXPECT_EQ(0, m_channel.Read(&byte, 1));
    done = true;
    other.join();
    EXPECT_TRUE(log.Has("[DBG] select: EINTR"));
}

TEST_F(ChannelTest, SignalsDoNotKeepAReadFromTimingOut) {
    OpenTuned();
    m_channel.SetTimeout(1);
    const SignalStorm storm;
    char byte = 0;
    EXPECT_EQ(ERR_CONNECTION_TIMEOUT, m_channel.Read(&byte, 1));
    EXPECT_FALSE(storm.HasBlownOver());
}

TEST_F(ChannelTest, WithoutRoomForAByteNothingIsReadOrWritten) {
    Channel channel(0);
    ASSERT_EQ(0, channel.Open(m_descriptor, true));
    PeerSends("x");
    char byte = 0;
    size_t got = 7;
    EXPECT_EQ(ERR_INVALID_ARGUMENT, channel.Read(&byte, 1, &got));
    EXPECT_EQ(0U, got);
    EXPECT_EQ(0, channel.Read(&byte, 0));
    EXPECT_EQ(ERR_INVALID_ARGUMENT, channel.Write(&byte, 1));
}

TEST_F(ChannelTest, DescriptorsAboveTheSetOfSelectAreSafe) {
    UniqueFd high(fcntl(m_descriptor, F_DUPFD, 1500));
    UniqueFd low(m_descriptor);
    if (!high.IsValid()) GTEST_SKIP() << "no descriptor above 1500: " << strerror(errno);
    ASSERT_EQ(0, m_channel.Open(high.Release(), true));
    PeerSends("x");
    uint8_t byte = 0;
    EXPECT_EQ(0, m_channel.ReadU8(&byte));
    EXPECT_EQ('x', byte);
}

TEST_F(ChannelTest, BufferedShowsWhatTheRingHolds) {
    EXPECT_EQ("", m_channel.Buffered());
    OpenTuned();
    PeerSends("abc");
    EXPECT_EQ("", m_channel.Buffered());
    uint8_t byte = 0;
    ASSERT_EQ(0, m_channel.ReadU8(&byte));
    EXPECT_EQ("bc", m_channel.Buffered());
    m_channel.Skip(1);
    EXPECT_EQ("c", m_channel.Buffered());
    m_channel.Skip(1);
    EXPECT_EQ("", m_channel.Buffered());
}

TEST_F(ChannelTest, ResetReadDropsWhatTheRingHolds) {
    OpenTuned();
    PeerSends("ab");
    uint8_t byte = 0;
    ASSERT_EQ(0, m_channel.ReadU8(&byte));
    m_channel.ResetRead();
    PeerSends("z");
    ASSERT_EQ(0, m_channel.ReadU8(&byte));
    EXPECT_EQ('z', byte);
}

TEST(MemoryChannelRings, ResetWriteDropsWhatIsPending) {
    MemoryChannel channel;
    ASSERT_EQ(0, channel.Write("ab", 2));
    channel.ResetWrite();
    ASSERT_EQ(0, channel.FlushWrite(0));
    EXPECT_EQ("", channel.pipe.output);
}

TEST(MemoryChannelRings, AWriteFlushesOnlyTheExcess) {
    MemoryChannel channel("", 8);
    channel.pipe.write_limit = 3;
    ASSERT_EQ(0, channel.Write("12345678", 8));
    EXPECT_EQ("", channel.pipe.output);
    ASSERT_EQ(0, channel.Write("abcd", 4));
    EXPECT_EQ("123456", channel.pipe.output);  // two writes of three: at least four
    ASSERT_EQ(0, channel.FlushWrite(0));
    EXPECT_EQ("12345678abcd", channel.pipe.output);
}

TEST(MemoryChannelRings, AFailingFlushFailsTheWrite) {
    MemoryChannel channel("", 8);
    channel.pipe.writes_left = 0;
    ASSERT_EQ(0, channel.Write("12345678", 8));
    EXPECT_EQ(ERR_IO, channel.Write("a", 1));
}

// Pieces of every size through small rings: each byte passes every place of the ring.
TEST(MemoryChannelRings, BytesSurviveWrappingAtEveryPlace) {
    std::string expected;
    for (int i = 0; i < 5000; ++i) expected += static_cast<char>(i * 7 % 251);
    for (const size_t capacity : {1U, 2U, 3U, 7U, 16U, 64U}) {
        for (const size_t limit : {1U, 2U, 5U, 100U}) {
            SCOPED_TRACE(std::to_string(capacity) + "/" + std::to_string(limit));
            MemoryChannel channel(expected, capacity);
            channel.pipe.write_limit = limit;
            channel.pipe.read_limit = limit;
            std::string received;
            for (size_t at = 0, step = 1; at < expected.size(); step = step % 13 + 1) {
                const size_t length = std::min({step, capacity, expected.size() - at});
                ASSERT_EQ(0, channel.Write(expected.data() + at, length));
                std::string piece(length, '\0');
                size_t got = 0;
                ASSERT_EQ(0, channel.Read(piece.data(), length, &got));
                ASSERT_EQ(length, got);
                received += piece;
                at += length;
            }
            ASSERT_EQ(0, channel.FlushWrite(0));
            EXPECT_EQ(expected, channel.pipe.output);
            EXPECT_EQ(expected, received);
        }
    }
}

TEST(MemoryChannelRings, AReadLargerThanTheRingComesInChunks) {
    const std::string expected(1000, 'q');
    MemoryChannel channel("ab" + expected, 64);
    char head[1];
    ASSERT_EQ(0, channel.Read(head, 1));  // the rest of the ring comes out first
    std::string buffer(1001, '\0');
    size_t got = 0;
    ASSERT_EQ(0, channel.Read(buffer.data(), buffer.size(), &got));
    EXPECT_EQ(1001U, got);
    EXPECT_EQ("b" + expected, buffer);
    EXPECT_EQ(ERR_IO, channel.Read(buffer.data(), 1, &got));
    EXPECT_EQ(0U, got);
}

}  // namespace
