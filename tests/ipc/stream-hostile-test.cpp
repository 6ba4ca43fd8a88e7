// What a broken or malicious client may send, and clients that stall.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/socket.h>

#include <random>
#include <thread>

#include "ipc/memory-channel.h"
#include "ipc/pobject.h"
#include "ipc/stream.h"
#include "support/log-capture.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

constexpr int kBadWire = -5;

int Decode(const std::string& bytes, PObject& value) {
    MemoryChannel channel(bytes, 4096);
    PStream stream;
    stream.RefuseBinaries();  // binary-test.cpp has them
    return stream.Recv(channel, value);
}

int Decode(const std::string& bytes) {
    PObject value;
    return Decode(bytes, value);
}

std::string Repeat(const std::string& piece, int count) {
    std::string out;
    out.reserve(piece.size() * static_cast<size_t>(count));
    for (int i = 0; i < count; ++i) out += piece;
    return out;
}

// Deep values are a line for each level; collecting millions of them is not the point here.
class Quiet {
public:
    Quiet() {
        LogSetSink([](int, std::string_view) {});
    }
    ~Quiet() { LogSetSink(nullptr); }
    Quiet(const Quiet&) = delete;
    Quiet& operator=(const Quiet&) = delete;
};

TEST(PStreamHostile, EveryUnknownTagIsRefused) {
    for (int tag = 0; tag < 256; ++tag) {
        if (tag == 0x00 || tag == 0x01 || tag == 0x10 || tag == 0x41 || tag == 0x42) continue;
        const std::string byte(1, static_cast<char>(tag));
        EXPECT_EQ(kBadWire, Decode(byte + std::string(20, '\0'))) << tag;
        if (tag == 0x40) continue;
        EXPECT_EQ(kBadWire, Decode("\x41" + byte + std::string(20, '\0'))) << tag << " in an array";
    }
}

TEST(PStreamHostile, AnEndMarkInPlaceOfAMembersValueIsRefused) {
    EXPECT_EQ(kBadWire, Decode(std::string("\x42\x10\0\1a\x40\x40", 7)));
}

TEST(PStreamHostile, AnIntegerOfMoreThanEightBytesIsRefused) {
    for (int n = 9; n < 256; ++n) {
        EXPECT_EQ(kBadWire,
                  Decode(std::string(1, '\1') + static_cast<char>(n) + std::string(256, 'x')))
            << n;
    }
}

TEST(PStreamHostile, ANullWithABodyIsRefused) {
    LogCapture log;
    EXPECT_EQ(kBadWire, Decode(std::string("\0\x07", 2)));
    EXPECT_TRUE(log.Has("[ERR] expect length 0, but we've got 7"));
}

TEST(PStreamHostile, AKeyThatIsNoStringIsRefused) {
    LogCapture log;
    EXPECT_EQ(kBadWire, Decode("\x42\x01"));
    EXPECT_TRUE(log.Has("[ERR] PStream: expect string, but get tag 1"));
    EXPECT_EQ(kBadWire, Decode(std::string("\x42\x00", 2)));
    EXPECT_TRUE(log.Has("[ERR] PStream: expect string, but get tag 0"));
}

TEST(PStreamHostile, TheErrorStackNamesThePlace) {
    LogCapture log;
    EXPECT_EQ(kBadWire, Decode(std::string("\x42\x10\0\1a\x42\x10\0\1b\xff", 11)));
    EXPECT_TRUE(log.Has("[ERR] Error stack: a.a.b"));
    // Between two members only the outer key is on it.
    EXPECT_EQ(kBadWire, Decode(std::string("\x42\x10\0\1a\x42\x10\0\1b\0\0\xff", 13)));
    EXPECT_TRUE(log.Has("[ERR] Error stack: a.a"));
    EXPECT_EQ(kBadWire, Decode(std::string("\x42\x10\0\1a\x41\0\0\x40\xff", 11)));
    EXPECT_TRUE(log.Has("[ERR] Error stack: "));
}

TEST(PStreamHostile, AMillionNestedArraysAreDecodedAndEncoded) {
    const Quiet quiet;
    constexpr int kDepth = 1000000;
    const std::string bytes =
        Repeat("\x41", kDepth) + std::string("\0\0", 2) + Repeat("\x40", kDepth);
    PObject value;
    ASSERT_EQ(0, Decode(bytes, value));
    MemoryChannel channel;
    PStream stream;
    ASSERT_EQ(0, stream.Send(channel, value));
    EXPECT_EQ(bytes, channel.pipe.output);
}

TEST(PStreamHostile, AMillionNestedArraysThatNeverEndAreFreedAgain) {
    const Quiet quiet;
    EXPECT_EQ(ERR_IO, Decode(Repeat("\x41", 1000000)));
}

TEST(PStreamHostile, DeeplyNestedMapsAreDecoded) {
    const Quiet quiet;
    constexpr int kDepth = 200000;
    PObject value;
    ASSERT_EQ(0, Decode(Repeat(std::string("\x42\x10\0\1k", 5), kDepth) + std::string("\1\1\7", 3) +
                            Repeat("\x40", kDepth),
                        value));
    EXPECT_EQ(static_cast<size_t>(kDepth) * 7 + 1, value.ToText().size());
    EXPECT_EQ(ERR_IO, Decode(Repeat(std::string("\x42\x10\0\1k", 5), kDepth)));
}

TEST(PStreamHostile, AWideArrayIsDecoded) {
    PObject value;
    ASSERT_EQ(0, Decode("\x41" + std::string(2000000, '\0') + "\x40", value));
    EXPECT_EQ(1000000U, value.AsArray().size());
}

TEST(PStreamHostile, GarbageNeverDoesMoreThanFail) {
    const Quiet quiet;
    std::mt19937 random(20240501);  // NOLINT: the same bytes in each run
    const char kLikely[] = {0x00, 0x01, 0x10, 0x40, 0x41, 0x42, 0x02, 0x08};
    int decoded = 0;
    for (int round = 0; round < 20000; ++round) {
        std::string bytes;
        for (unsigned i = random() % 64; i > 0; --i) {
            bytes += random() % 4 != 0 ? kLikely[random() % sizeof(kLikely)]
                                       : static_cast<char>(random());
        }
        PObject value;
        const int result = Decode(bytes, value);
        ASSERT_THAT(result, testing::AnyOf(0, ERR_IO, kBadWire));
        if (result != 0) continue;
        ++decoded;
        MemoryChannel channel("", 4096);
        PStream stream;
        ASSERT_EQ(0, stream.Send(channel, value));
        PObject again;
        ASSERT_EQ(0, Decode(channel.pipe.output, again));
    }
    EXPECT_GT(decoded, 1000);
}

// --- Over a real socket

class StalledClientTest : public testing::Test {
protected:
    void SetUp() override {
        signal(SIGPIPE, SIG_IGN);
        int ends[2];
        ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM, 0, ends));
        ASSERT_EQ(0, m_channel.Open(ends[0], true));
        m_channel.SetTimeout(1);
        m_peer.Reset(ends[1]);
    }
    void PeerSends(const std::string& bytes) const {
        ASSERT_EQ(static_cast<ssize_t>(bytes.size()),
                  send(m_peer.Get(), bytes.data(), bytes.size(), 0));
    }

    Channel m_channel{Channel::DEFAULT_CAPACITY};
    UniqueFd m_peer;
    PStream m_stream;
    PObject m_value;
};

TEST_F(StalledClientTest, OneThatHangsUpInTheMiddleIsAnInputError) {
    PeerSends(std::string("\x42\x10\0\1k\x10\0\x64half", 12));
    m_peer.Reset();
    LogCapture log;
    EXPECT_EQ(ERR_IO, m_stream.Recv(m_channel, m_value));
    EXPECT_TRUE(log.Has("[WARN] Channel: -2"));
    EXPECT_TRUE(log.Has("[ERR] Error stack: k.k"));
}

TEST_F(StalledClientTest, OneThatStopsSendingTimesOut) {
    PeerSends("\x42");
    LogCapture log;
    EXPECT_EQ(ERR_IO, m_stream.Recv(m_channel, m_value));
    EXPECT_TRUE(log.Has("[WARN] Channel: -5"));
}

TEST_F(StalledClientTest, OneThatNeverReadsTimesOut) {
    PObject value;
    for (int i = 0; i < 100; ++i) value.AsArray().emplace_back(std::string(60000, 'x'));
    LogCapture log;
    EXPECT_EQ(ERR_IO, m_stream.Send(m_channel, value));
    EXPECT_TRUE(log.Has("[WARN] Channel: -5"));
}

TEST_F(StalledClientTest, OneThatHangsUpBeforeTheAnswerIsAnInputError) {
    m_peer.Reset();
    EXPECT_EQ(ERR_IO, m_stream.Send(m_channel, PObject("answer")));
}

TEST_F(StalledClientTest, AnotherThreadSeesWhereATransferStands) {
    m_channel.SetTimeout(60);
    PeerSends(std::string("\x42\x10\0\1a\x42\x10\0\1b", 10));
    int result = -100;
    std::thread receiver([&] { result = m_stream.Recv(m_channel, m_value); });
    std::string path;
    uint64_t done = 0;
    uint64_t total = 0;
    while (path != "a.a.b") m_stream.GetStatus(path, done, total);
    PeerSends(std::string("\1\1\7\x40\x40", 5));
    receiver.join();
    EXPECT_EQ(0, result);
    EXPECT_EQ("{\"a\": {\"b\": 7}}", m_value.ToText());
    m_stream.GetStatus(path, done, total);
    EXPECT_EQ("", path);
}

}  // namespace
