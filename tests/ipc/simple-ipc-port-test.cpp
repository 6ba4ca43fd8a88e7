// The forms of IPCListener that listen on a port.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "ipc/channel.h"
#include "ipc/simple-ipc.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/error-code.h"
#include "utils/unique-fd.h"

namespace {

class IPCListenerPortTest : public testing::Test {
protected:
    [[nodiscard]] static int Connect(const char* ip, int port) {
        Channel client(16);
        return client.Open(ip, port);
    }
    // A port that is free just now.
    [[nodiscard]] static int FreePort() {
        IPCListener listener;
        return listener.ListenOnPort(0);
    }

    IPCListener m_listener{
        {0, 1000}
    };
};

TEST_F(IPCListenerPortTest, PortZeroIsAnyAndTheOneInUseIsReturned) {
    LogCapture log;
    const int port = m_listener.ListenOnPort(0);
    ASSERT_GT(port, 0);
    EXPECT_THAT(log.Lines(),
                testing::ElementsAre("[INFO] Try to bind port: 0", "[INFO] Bind port 0 success",
                                     "[INFO] listening on port " + std::to_string(port)));
    EXPECT_FALSE(m_listener.Wait());
    Channel client(16);
    ASSERT_EQ(0, client.Open("127.0.0.1", port));
    EXPECT_TRUE(m_listener.Wait());
    const UniqueFd server(m_listener.Accept());
    EXPECT_TRUE(server.IsValid());
}

TEST_F(IPCListenerPortTest, OnlyTheLoopbackAddressIsServed) {
    const int port = m_listener.ListenOnPort(0);
    ASSERT_GT(port, 0);
    EXPECT_EQ(ERR_IO, Connect("127.0.0.2", port));
    EXPECT_EQ(0, Connect("127.0.0.1", port));
}

TEST_F(IPCListenerPortTest, APortInUseIsPassedOver) {
    IPCListener first;
    const int used = first.ListenOnPort(0);
    ASSERT_GT(used, 0);
    LogCapture log;
    const int port = m_listener.ListenOnPort(used);
    ASSERT_GT(port, used);
    EXPECT_EQ(0, Connect("127.0.0.1", port));
    const std::string number = std::to_string(used);
    EXPECT_TRUE(log.Has("[INFO] Try to bind port: " + number));
    EXPECT_TRUE(log.Has("[ERR] bind: Address already in use (98)"));
    EXPECT_TRUE(log.Has("[INFO] Bind port " + number + " failed, try next one"));
    EXPECT_TRUE(log.Has("[INFO] Try to bind port: " + std::to_string(port)));
    // With the port that the search began at, as it always was.
    EXPECT_TRUE(log.Has("[INFO] Bind port " + number + " success"));
    EXPECT_TRUE(log.Has("[INFO] listening on port " + std::to_string(port)));
}

TEST_F(IPCListenerPortTest, TheSearchEndsWithTheLastPort) {
    LogCapture log;
    EXPECT_EQ(-1, m_listener.ListenOnPort(65536));
    EXPECT_THAT(log.Lines(), testing::ElementsAre("[INFO] Try to bind port: 65536",
                                                  "[ERR] Port number exceeds 65536",
                                                  "[ERR] find available port failed."));
    EXPECT_EQ(-1, m_listener.Accept());
    EXPECT_FALSE(m_listener.Wait());
}

TEST_F(IPCListenerPortTest, ANegativePortIsNoPort) {
    LogCapture log;
    EXPECT_EQ(-1, m_listener.ListenOnPort(-1));
    EXPECT_TRUE(log.Has("[ERR] find available port failed."));
    EXPECT_EQ(-1, m_listener.Accept());
}

TEST_F(IPCListenerPortTest, ASearchClosesWhatItListenedOnBefore) {
    const TempDir dir;
    ASSERT_EQ(0, m_listener.Listen(dir / "socket"));
    const int first = m_listener.ListenOnPort(0);
    ASSERT_GT(first, 0);
    EXPECT_NE(0, access((dir / "socket").c_str(), F_OK));
    const int second = m_listener.ListenOnPort(0);
    ASSERT_GT(second, 0);
    EXPECT_EQ(0, Connect("127.0.0.1", second));
    EXPECT_EQ(-1, m_listener.ListenOnPort(65536));  // also when it fails
    EXPECT_EQ(ERR_IO, Connect("127.0.0.1", second));
    ASSERT_EQ(0, m_listener.Listen(dir / "socket"));
}

TEST_F(IPCListenerPortTest, StopClosesThePort) {
    const int port = m_listener.ListenOnPort(0);
    ASSERT_GT(port, 0);
    m_listener.Stop();
    EXPECT_EQ(ERR_IO, Connect("127.0.0.1", port));
    EXPECT_EQ(-1, m_listener.Accept());
}

TEST_F(IPCListenerPortTest, OnePortIsListenedOnWithoutASearch) {
    const int port = FreePort();
    LogCapture log;
    ASSERT_EQ(0, m_listener.Listen(port));
    EXPECT_THAT(log.Lines(),
                testing::ElementsAre("[DBG] listening on port " + std::to_string(port)));
    EXPECT_EQ(ERR_IO, Connect("127.0.0.2", port));
    EXPECT_EQ(0, Connect("127.0.0.1", port));
    EXPECT_TRUE(m_listener.Wait());
}

TEST_F(IPCListenerPortTest, OnePortInUseIsRefused) {
    IPCListener first;
    const int used = first.ListenOnPort(0);
    LogCapture log;
    EXPECT_EQ(-1, m_listener.Listen(used));
    EXPECT_THAT(log.Lines(), testing::ElementsAre("[ERR] bind: Address already in use (98)"));
    EXPECT_EQ(-1, m_listener.Accept());
    first.Stop();
    EXPECT_EQ(0, m_listener.Listen(used));
}

TEST_F(IPCListenerPortTest, WhatIsNoPortIsRefused) {
    for (const int port : {0, -1, 65536, 65536 + 22}) {
        EXPECT_EQ(-1, m_listener.Listen(port)) << port;
        EXPECT_EQ(-1, m_listener.Accept()) << port;
    }
}

TEST_F(IPCListenerPortTest, AListenerThatListensKeepsItsFirstPort) {
    const int port = m_listener.ListenOnPort(0);
    EXPECT_EQ(-1, m_listener.Listen(FreePort()));
    EXPECT_EQ(0, Connect("127.0.0.1", port));
    EXPECT_TRUE(m_listener.Wait());
}

}  // namespace
