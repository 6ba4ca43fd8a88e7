// Connecting to a domain socket, also to one whose listener accepts nobody.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <filesystem>
#include <future>
#include <string>
#include <thread>
#include <vector>

#include "ipc/channel.h"
#include "ipc/signal-storm.h"
#include "ipc/simple-ipc.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/error-code.h"
#include "utils/unique-fd.h"

namespace {

// Waits of ten milliseconds.
class QuickChannel : public Channel {
public:
    QuickChannel() : Channel(64) { m_operation_timeout = {0, 10000}; }
    ~QuickChannel() override { Channel::Close(); }
    [[nodiscard]] int Descriptor() const { return kPlainTransport.get_descriptor(m_handle); }
};

// Listens and accepts nobody until it is told to; its backlog is full.
class HungListener {
public:
    explicit HungListener(const std::string& path)
        : m_server(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        path.copy(address.sun_path, sizeof(address.sun_path) - 1);
        const auto* general = reinterpret_cast<const sockaddr*>(&address);
        EXPECT_EQ(0, bind(m_server.Get(), general, sizeof(address)));
        EXPECT_EQ(0, listen(m_server.Get(), 0));
        for (bool is_full = false; !is_full;) {
            UniqueFd client(socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
            is_full = connect(client.Get(), general, sizeof(address)) != 0;
            if (!is_full) m_clients.push_back(std::move(client));
        }
        EXPECT_EQ(EAGAIN, errno);
    }
    // Makes room for one more.
    void AcceptOne() { m_accepted.emplace_back(accept(m_server.Get(), nullptr, nullptr)); }

private:
    UniqueFd m_server;
    std::vector<UniqueFd> m_clients;
    std::vector<UniqueFd> m_accepted;
};

size_t OpenDescriptors() {
    size_t count = 0;
    for ([[maybe_unused]] const auto& entry : std::filesystem::directory_iterator("/proc/self/fd"))
        ++count;
    return count;
}

class ChannelConnectTest : public testing::Test {
protected:
    // Opens in another thread; an attempt without an end gets a place after ten seconds, and
    // m_was_hung tells.
    [[nodiscard]] int OpenInTime(HungListener& listener) {
        auto opening = std::async(std::launch::async, [this] { return m_channel.Open(m_path); });
        m_was_hung = opening.wait_for(std::chrono::seconds(10)) != std::future_status::ready;
        if (m_was_hung) listener.AcceptOne();
        return opening.get();
    }
    // Until the attempt has had so many waits; not for ever, should it have failed.
    static void WaitForTimeouts(const LogCapture& log, int count) {
        const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(10);
        while (log.Count("[DBG] select: timeout") < count &&
               std::chrono::steady_clock::now() < end) {
            std::this_thread::yield();
        }
    }

    TempDir m_dir;
    std::string m_path = m_dir / "socket";
    QuickChannel m_channel;
    bool m_was_hung = false;
};

TEST_F(ChannelConnectTest, OpenConnectsAsAClient) {
    IPCListener listener({0, 0});
    ASSERT_EQ(0, listener.Listen(m_path));
    ASSERT_EQ(0, m_channel.Open(m_path));
    const UniqueFd server(listener.Accept());
    ASSERT_TRUE(server.IsValid());
    ASSERT_EQ(0, m_channel.WriteU8('y'));
    ASSERT_EQ(0, m_channel.FlushWrite(0));
    char byte = 0;
    EXPECT_EQ(1, read(server.Get(), &byte, 1));
    EXPECT_EQ('y', byte);
    EXPECT_EQ(ERR_INVALID_ARGUMENT, m_channel.Open(m_path));
}

TEST_F(ChannelConnectTest, APathWhereNobodyListensFails) {
    LogCapture log;
    EXPECT_EQ(ERR_IO, m_channel.Open(m_path));
    EXPECT_TRUE(log.Has("[ERR] Channel: Can not connect to server at '" + m_path +
                        "'. No such file or directory"));
    EXPECT_TRUE(m_channel.IsClosed());
}

TEST_F(ChannelConnectTest, AListenerThatAcceptsNobodyIsGivenUpAfterTheTotalTimeout) {
    HungListener listener(m_path);
    const size_t before = OpenDescriptors();
    m_channel.SetTimeout(1);
    LogCapture log;
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(ERR_IO, OpenInTime(listener));
    EXPECT_LE(std::chrono::seconds(1), std::chrono::steady_clock::now() - start);
    EXPECT_FALSE(m_was_hung);
    EXPECT_TRUE(log.Has("[ERR] Channel: Can not connect to server at '" + m_path +
                        "'. Connection timed out"));
    EXPECT_TRUE(m_channel.IsClosed());
    EXPECT_EQ(before, OpenDescriptors());
}

TEST_F(ChannelConnectTest, APlaceThatBecomesFreeInTimeIsTaken) {
    HungListener listener(m_path);
    LogCapture log;
    auto opening = std::async(std::launch::async, [this] { return m_channel.Open(m_path); });
    WaitForTimeouts(log, 5);
    listener.AcceptOne();
    EXPECT_EQ(0, opening.get());
    // The limit was for connecting only.
    timeval limit{7, 7};
    socklen_t size = sizeof(limit);
    ASSERT_EQ(0, getsockopt(m_channel.Descriptor(), SOL_SOCKET, SO_SNDTIMEO, &limit, &size));
    EXPECT_EQ(0, limit.tv_sec);
    EXPECT_EQ(0, limit.tv_usec);
    EXPECT_NE(0, fcntl(m_channel.Descriptor(), F_GETFL) & O_NONBLOCK);
}

TEST_F(ChannelConnectTest, AbortEndsTheAttempt) {
    HungListener listener(m_path);
    std::atomic<int> flag{0};
    m_channel.SetTimeout(0);
    m_channel.SetAbortFlag(&flag);
    LogCapture log;
    std::thread other([&] {
        WaitForTimeouts(log, 5);
        flag = 1;
    });
    EXPECT_EQ(ERR_IO, OpenInTime(listener));
    EXPECT_FALSE(m_was_hung);
    other.join();
    EXPECT_TRUE(m_channel.IsClosed());
}

TEST_F(ChannelConnectTest, SignalsNeitherFailNorProlongTheAttempt) {
    HungListener listener(m_path);
    m_channel.SetTimeout(1);
    LogCapture log;
    const SignalStorm storm;
    EXPECT_EQ(ERR_IO, m_channel.Open(m_path));
    EXPECT_FALSE(storm.HasBlownOver());
    EXPECT_TRUE(log.Has("[DBG] select: EINTR"));
    EXPECT_TRUE(log.Has("[ERR] Channel: Can not connect to server at '" + m_path +
                        "'. Connection timed out"));
    listener.AcceptOne();
    EXPECT_EQ(0, m_channel.Open(m_path));
}

}  // namespace
