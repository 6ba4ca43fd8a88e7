// Channels over IPv4, on the loopback interface.
#include <arpa/inet.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <filesystem>
#include <thread>

#include "ipc/channel.h"
#include "ipc/signal-storm.h"
#include "ipc/simple-ipc.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/error-code.h"
#include "utils/unique-fd.h"

namespace {

// Waits of a millisecond, and calls that fail when told to.
class TestChannel : public Channel {
public:
    TestChannel() : Channel(64) { m_operation_timeout = {0, 1000}; }
    ~TestChannel() override { Channel::Close(); }
    [[nodiscard]] int CreateSocket() const override {
        return fails_socket ? -1 : Channel::CreateSocket();
    }
    [[nodiscard]] int SetLinger(int descriptor, int seconds) const override {
        return fails_linger ? -1 : Channel::SetLinger(descriptor, seconds);
    }
    [[nodiscard]] int SetNonBlock(int descriptor) const override {
        return fails_non_block ? -1 : Channel::SetNonBlock(descriptor);
    }

    void WaitMilliseconds(int milliseconds) { m_operation_timeout = {0, milliseconds * 1000}; }
    [[nodiscard]] int Descriptor() const { return kPlainTransport.get_descriptor(m_handle); }

    bool fails_socket = false;
    bool fails_linger = false;
    bool fails_non_block = false;
};

size_t OpenDescriptors() {
    size_t count = 0;
    for ([[maybe_unused]] const auto& entry : std::filesystem::directory_iterator("/proc/self/fd"))
        ++count;
    return count;
}

class ChannelTcpTest : public testing::Test {
protected:
    void SetUp() override {
        m_port = m_listener.ListenOnPort(0);
        ASSERT_GT(m_port, 0);
    }

    IPCListener m_listener;
    int m_port = 0;
    TestChannel m_channel;
};

// A port that takes no more connections: an attempt hangs, as with a host that drops it.
class FullPort {
public:
    FullPort() : m_server(socket(AF_INET, SOCK_STREAM, 0)) {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        auto* general = reinterpret_cast<sockaddr*>(&address);
        socklen_t size = sizeof(address);
        EXPECT_EQ(0, bind(m_server.Get(), general, size));
        EXPECT_EQ(0, listen(m_server.Get(), 0));
        EXPECT_EQ(0, getsockname(m_server.Get(), general, &size));
        m_port = ntohs(address.sin_port);
        for (UniqueFd& client : m_clients) {
            client.Reset(socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK, 0));
            static_cast<void>(connect(client.Get(), general, size));
        }
    }
    [[nodiscard]] int Port() const { return m_port; }

private:
    UniqueFd m_server;
    UniqueFd m_clients[4];
    int m_port = 0;
};

TEST_F(ChannelTcpTest, WithoutAnIpOrAPortNothingIsOpened) {
    LogCapture log;
    EXPECT_EQ(0, m_channel.Open(static_cast<const char*>(nullptr), m_port));
    EXPECT_EQ(0, m_channel.Open("127.0.0.1", -1));
    EXPECT_TRUE(m_channel.IsClosed());
    EXPECT_TRUE(log.Lines().empty());
}

TEST_F(ChannelTcpTest, BytesPassBothWays) {
    ASSERT_EQ(0, m_channel.Open("127.0.0.1", m_port));
    const UniqueFd server(m_listener.Accept());
    ASSERT_EQ(0, m_channel.Write("ask", 3));
    ASSERT_EQ(0, m_channel.FlushWrite(0));
    char bytes[4] = {};
    ASSERT_EQ(3, recv(server.Get(), bytes, sizeof(bytes), 0));
    EXPECT_STREQ("ask", bytes);
    ASSERT_EQ(4, send(server.Get(), "told", 4, 0));
    m_channel.SetTimeout(60);
    ASSERT_EQ(0, m_channel.Read(bytes, 4));
    EXPECT_EQ("told", std::string(bytes, 4));
}

TEST_F(ChannelTcpTest, AnOpenedSocketIsTunedAndItsRingsAreEmpty) {
    ASSERT_EQ(0, m_channel.Open("127.0.0.1", m_port));
    EXPECT_NE(0, fcntl(m_channel.Descriptor(), F_GETFL) & O_NONBLOCK);
    linger value{};
    socklen_t size = sizeof(value);
    ASSERT_EQ(0, getsockopt(m_channel.Descriptor(), SOL_SOCKET, SO_LINGER, &value, &size));
    EXPECT_EQ(1, value.l_onoff);
    EXPECT_EQ(1, value.l_linger);
    const UniqueFd first(m_listener.Accept());
    ASSERT_EQ(2, send(first.Get(), "ab", 2, 0));
    char byte = 0;
    ASSERT_EQ(0, m_channel.Read(&byte, 1));
    m_channel.Close();
    ASSERT_EQ(0, m_channel.Open("127.0.0.1", m_port));
    EXPECT_EQ("", m_channel.Buffered());
    const UniqueFd second(m_listener.Accept());
    ASSERT_EQ(1, send(second.Get(), "c", 1, 0));
    ASSERT_EQ(0, m_channel.Read(&byte, 1));
    EXPECT_EQ('c', byte);
}

TEST_F(ChannelTcpTest, AnOpenChannelIsNotOpenedAgain) {
    ASSERT_EQ(0, m_channel.Open("127.0.0.1", m_port));
    LogCapture log;
    EXPECT_EQ(ERR_INVALID_ARGUMENT, m_channel.Open("127.0.0.1", m_port));
    EXPECT_TRUE(log.Has("[ERR] Open: Invalid argument"));
    EXPECT_FALSE(m_channel.IsClosed());
}

TEST_F(ChannelTcpTest, EachStepOfOpeningHasItsCodeAndClosesTheSocket) {
    const size_t before = OpenDescriptors();
    m_channel.fails_socket = true;
    EXPECT_EQ(ERR_IO, m_channel.Open("127.0.0.1", m_port));
    m_channel.fails_socket = false;
    m_channel.fails_linger = true;
    EXPECT_EQ(ERR_SYSTEM, m_channel.Open("127.0.0.1", m_port));
    m_channel.fails_linger = false;
    m_channel.fails_non_block = true;
    EXPECT_EQ(ERR_SYSTEM, m_channel.Open("127.0.0.1", m_port));
    m_channel.fails_non_block = false;
    EXPECT_EQ(ERR_IO, m_channel.Open("no address", m_port));
    m_listener.Stop();
    EXPECT_EQ(ERR_IO, m_channel.Open("127.0.0.1", m_port));
    EXPECT_TRUE(m_channel.IsClosed());
    EXPECT_EQ(before - 1, OpenDescriptors());  // the listener's
}

TEST_F(ChannelTcpTest, WhatIsNoAddressIsRefused) {
    const UniqueFd descriptor(m_channel.CreateSocket());
    const struct {
        int descriptor;
        const char* ip;
        int port;
        const char* text;
    } cases[] = {
        {descriptor.Get(), nullptr,     80,    "(null), port: 80"      },
        {descriptor.Get(), "127.0.0.1", -1,    "127.0.0.1, port: -1"   },
        {descriptor.Get(), "127.0.0.1", 65536, "127.0.0.1, port: 65536"},
        {descriptor.Get(), "localhost", 80,    "localhost, port: 80"   },
        {descriptor.Get(), "",          80,    ", port: 80"            },
        {descriptor.Get(), "::1",       80,    "::1, port: 80"         },
        {descriptor.Get(), "%s%n",      80,    "%s%n, port: 80"        },
        {-1,               "127.0.0.1", 80,    "127.0.0.1, port: 80"   },
    };
    for (const auto& c : cases) {
        LogCapture log;
        EXPECT_EQ(ERR_INVALID_ARGUMENT, m_channel.Connect(c.descriptor, c.ip, c.port)) << c.text;
        EXPECT_TRUE(log.Has(std::string("[ERR] Invalid argumants (ip: ") + c.text)) << c.text;
    }
}

TEST_F(ChannelTcpTest, APortWhereNobodyListensRefusesTheConnection) {
    m_listener.Stop();
    const UniqueFd descriptor(m_channel.CreateSocket());
    ASSERT_EQ(0, m_channel.SetNonBlock(descriptor.Get()));
    LogCapture log;
    EXPECT_EQ(ERR_SYSTEM, m_channel.Connect(descriptor.Get(), "127.0.0.1", m_port));
    EXPECT_TRUE(log.Has("[ERR] Connect error 127.0.0.1 (" + std::to_string(m_port) +
                        "). Connection refused (111)"));
}

TEST_F(ChannelTcpTest, AnErrorAtOnceIsAnErrorToo) {
    const UniqueFd descriptor(m_channel.CreateSocket());
    ASSERT_EQ(0, m_channel.SetNonBlock(descriptor.Get()));
    LogCapture log;
    // Without permission to broadcast.
    EXPECT_EQ(ERR_SYSTEM, m_channel.Connect(descriptor.Get(), "255.255.255.255", 9));
    EXPECT_TRUE(log.Contains("[ERR] Connect error 255.255.255.255 (9). "));
    EXPECT_EQ(0, log.Count("[DBG] select: timeout"));
}

TEST_F(ChannelTcpTest, AHostThatDoesNotAnswerIsGivenUpAfterTwentyWaits) {
    const FullPort full;
    LogCapture log;
    EXPECT_EQ(ERR_IO, m_channel.Open("127.0.0.1", full.Port()));
    EXPECT_EQ(20, log.Count("[DBG] select: timeout"));
    EXPECT_TRUE(log.Has("[ERR] Channel timed out during connect (60 seconds), abort anyway"));
    const UniqueFd descriptor(m_channel.CreateSocket());
    ASSERT_EQ(0, m_channel.SetNonBlock(descriptor.Get()));
    m_channel.SetTimeout(7);
    log.Clear();
    EXPECT_EQ(ERR_CONNECTION_TIMEOUT,
              m_channel.Connect(descriptor.Get(), "127.0.0.1", full.Port()));
    EXPECT_EQ(3, log.Count("[DBG] select: timeout"));
    EXPECT_TRUE(log.Has("[ERR] Channel timed out during connect (7 seconds), abort anyway"));
}

TEST_F(ChannelTcpTest, SignalsDoNotProlongTheWaitForAHost) {
    const FullPort full;
    m_channel.WaitMilliseconds(50);
    m_channel.SetTimeout(9);
    LogCapture log;
    const SignalStorm storm;
    EXPECT_EQ(ERR_IO, m_channel.Open("127.0.0.1", full.Port()));
    EXPECT_FALSE(storm.HasBlownOver());
    EXPECT_TRUE(log.Has("[DBG] select: EINTR"));
    EXPECT_EQ(3, log.Count("[DBG] select: timeout"));
}

TEST_F(ChannelTcpTest, WithoutALimitOnlyTheAbortFlagEndsTheWait) {
    const FullPort full;
    std::atomic<int> flag{0};
    m_channel.SetTimeout(0);
    m_channel.SetAbortFlag(&flag);
    LogCapture log;
    std::thread other([&] {
        while (log.Count("[DBG] select: timeout") < 30) std::this_thread::yield();
        flag = 1;
    });
    EXPECT_EQ(ERR_IO, m_channel.Open("127.0.0.1", full.Port()));
    other.join();
    EXPECT_FALSE(log.Contains("timed out during connect"));
}

TEST_F(ChannelTcpTest, ThePeersAddressIsTold) {
    std::string ip = "x";
    int port = 1;
    LogCapture log;
    EXPECT_EQ(0, m_channel.GetPeerInfo(ip, port));
    EXPECT_EQ("", ip);
    EXPECT_EQ(0, port);
    EXPECT_TRUE(log.Has("[WARN] GetPeerInfo: Attempting to get info of an uninitialized channel"));
    ASSERT_EQ(0, m_channel.Open("127.0.0.1", m_port));
    EXPECT_EQ(0, m_channel.GetPeerInfo(ip, port));
    EXPECT_EQ("127.0.0.1", ip);
    EXPECT_EQ(m_port, port);
}

TEST_F(ChannelTcpTest, APeerThatIsNotThereHasNoAddress) {
    std::string ip = "x";
    int port = 1;
    ASSERT_EQ(0, m_channel.Open(m_channel.CreateSocket(), false));
    LogCapture log;
    EXPECT_EQ(ERR_SYSTEM, m_channel.GetPeerInfo(ip, port));
    EXPECT_TRUE(log.Has("[ERR] GetPeerInfo: getpeername: Transport endpoint is not connected"));
}

TEST_F(ChannelTcpTest, APeerOfAnotherFamilyHasNoAddress) {
    std::string ip = "x";
    int port = 1;
    int ends[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM, 0, ends));
    const UniqueFd peer(ends[1]);
    ASSERT_EQ(0, m_channel.Open(ends[0], false));
    LogCapture log;
    EXPECT_EQ(-1, m_channel.GetPeerInfo(ip, port));
    EXPECT_TRUE(
        log.Has("[ERR] GetPeerInfo: inet_ntop: Address family not supported by protocol (97)"));
    EXPECT_EQ("", ip);
    EXPECT_EQ(0, port);
}

}  // namespace
