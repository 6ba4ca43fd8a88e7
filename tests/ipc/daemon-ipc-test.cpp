#include "ipc/daemon-ipc.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/socket.h>

#include <functional>
#include <thread>

#include "ipc/channel.h"
#include "ipc/ipc-sender.h"
#include "ipc/pobject.h"
#include "ipc/simple-ipc.h"
#include "ipc/stream.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/unique-fd.h"

namespace {

// Listens like the daemon, and serves one client as the test says.
class FakeDaemon {
public:
    using Answer = std::function<void(int descriptor)>;

    // Reads one request, then does what `answer` says with the connection, and hangs up.
    FakeDaemon(const std::string& path, Answer answer) {
        EXPECT_EQ(0, m_listener.Listen(path));
        m_thread = std::thread([this, answer = std::move(answer)] {
            const UniqueFd client(m_listener.Accept());
            Channel channel(Channel::DEFAULT_CAPACITY);
            const int copy = dup(client.Get());
            ASSERT_EQ(0, channel.Open(copy, true));
            PStream stream;
            ASSERT_EQ(0, stream.Recv(channel, m_request));
            answer(client.Get());
        });
    }
    ~FakeDaemon() {
        if (m_thread.joinable()) m_thread.join();
    }
    FakeDaemon(const FakeDaemon&) = delete;
    FakeDaemon& operator=(const FakeDaemon&) = delete;

    [[nodiscard]] std::string RequestText() {
        m_thread.join();
        return m_request.ToText();
    }

private:
    IPCListener m_listener;
    std::thread m_thread;
    PObject m_request;
};

void SendBytes(int descriptor, const std::string& bytes) {
    EXPECT_EQ(static_cast<ssize_t>(bytes.size()),
              send(descriptor, bytes.data(), bytes.size(), MSG_NOSIGNAL));
}

FakeDaemon::Answer Bytes(const std::string& bytes) {
    return [bytes](int descriptor) { SendBytes(descriptor, bytes); };
}

// {"ack": "ok"}
const std::string kAck("\x42\x10\0\3ack\x10\0\2ok\x40", 13);

class DaemonIPCTest : public testing::Test {
protected:
    void SetUp() override { m_request["action"] = "list_task"; }
    [[nodiscard]] int Send() { return DaemonIPC(m_path).SendCommand(m_request, m_response); }

    TempDir m_dir;
    std::string m_path = m_dir / "socket";
    PObject m_request;
    PObject m_response{"as before"};
};

TEST_F(DaemonIPCTest, ACommandThatIsAcknowledgedSucceeds) {
    FakeDaemon daemon(m_path, Bytes(kAck));
    LogCapture log;
    EXPECT_EQ(0, Send());
    EXPECT_EQ("{\"ack\": \"ok\"}", m_response.ToText());
    EXPECT_EQ("{\"action\": \"list_task\"}", daemon.RequestText());
    EXPECT_TRUE(log.Has("[DBG] DaemonIPC: send request >>> {\"action\": \"list_task\"}"));
    EXPECT_TRUE(log.Has("[DBG] DaemonIPC: recv response <<< {\"ack\": \"ok\"}"));
    EXPECT_TRUE(log.Has("[DBG] Recieve ack."));
}

TEST_F(DaemonIPCTest, ADaemonThatIsNotThereFailsTheConnection) {
    LogCapture log;
    EXPECT_EQ(-1, Send());
    EXPECT_TRUE(log.Has("[ERR] Failed to connect at '" + m_path + "'"));
    EXPECT_EQ("as before", m_response.AsString());
}

TEST_F(DaemonIPCTest, ASocketFileOfADaemonThatHasDiedFailsTheConnection) {
    {
        IPCListener listener;
        ASSERT_EQ(0, listener.Listen(m_path));
        ASSERT_EQ(0, rename(m_path.c_str(), (m_path + "2").c_str()));  // Stop finds no file
    }
    ASSERT_EQ(0, rename((m_path + "2").c_str(), m_path.c_str()));
    LogCapture log;
    EXPECT_EQ(-1, Send());
    EXPECT_TRUE(log.Has("[ERR] Failed to connect at '" + m_path + "'"));
}

TEST_F(DaemonIPCTest, TheDaemonsSocketIsTheDefault) {
    EXPECT_STREQ("/tmp/ferrix-socket", DaemonIPC::SOCKET_PATH);
}

TEST_F(DaemonIPCTest, WithoutNeedOfAnAckNothingIsRead) {
    m_request["need_ack"] = 0;
    m_request["action"] = "stop";
    FakeDaemon daemon(m_path, [](int) {});
    LogCapture log;
    EXPECT_EQ(0, Send());
    EXPECT_TRUE(log.Has("[DBG] DaemonIPC: no need ack"));
    EXPECT_EQ("as before", m_response.AsString());
    EXPECT_EQ("{\"action\": \"stop\", \"need_ack\": 0}", daemon.RequestText());
}

TEST_F(DaemonIPCTest, ANeedOfAnAckThatIsTrueIsAnswered) {
    m_request["need_ack"] = 1;
    FakeDaemon daemon(m_path, Bytes(kAck));
    EXPECT_EQ(0, Send());
    EXPECT_EQ("ok", m_response["ack"].AsString());
}

TEST_F(DaemonIPCTest, AnErrorWinsOverAnAck) {
    FakeDaemon daemon(m_path, Bytes(std::string("\x42\x10\0\3ack\x10\0\2ok\x10\0\5error\x10\0\1x"
                                                "\x10\0\x0a"
                                                "error_code\1\1\7\x40",
                                                41)));
    LogCapture log;
    EXPECT_EQ(-1, Send());
    EXPECT_TRUE(log.Has("[ERR] SendCommand error: x"));
    EXPECT_EQ(7, m_response["error_code"].AsInt32());
    EXPECT_EQ("x", m_response["error"].AsString());
}

TEST_F(DaemonIPCTest, AnAnswerWithoutTheRightAckIsAFailure) {
    const std::string answers[] = {
        std::string("\x42\x40", 2),                         // {}
        std::string("\x42\x10\0\3ack\x10\0\2no\x40", 13),   // {"ack": "no"}
        std::string("\x42\x10\0\3ack\1\1\1\x40", 11),       // {"ack": 1}
        std::string("\x42\x10\0\3ack\x10\0\3ok!\x40", 14),  // {"ack": "ok!"}
        std::string("\x10\0\2ok", 5),                       // "ok"
        std::string("\0\0", 2),                             // null
        std::string("\x41\x10\0\3ack\x10\0\2ok\x40", 13),   // ["ack", "ok"]
    };
    for (const std::string& answer : answers) {
        FakeDaemon daemon(m_path, Bytes(answer));
        LogCapture log;
        EXPECT_EQ(-1, Send());
        EXPECT_TRUE(log.Has("[ERR] Can not recieve ack.")) << m_response.ToText();
    }
}

TEST_F(DaemonIPCTest, ADaemonThatHangsUpBeforeItsAnswerFailsIt) {
    FakeDaemon daemon(m_path, [](int) {});
    LogCapture log;
    EXPECT_EQ(-1, Send());
    EXPECT_TRUE(log.Has("[ERR] Failed to receive response."));
    EXPECT_EQ("as before", m_response.AsString());
}

TEST_F(DaemonIPCTest, ADaemonThatHangsUpInTheMiddleLeavesWhatArrived) {
    const std::string whole("\x42\x10\0\3ack\x10\0\2ok\x10\0\1z\x10\0\3abc\x40", 23);
    for (size_t length = 1; length < whole.size(); ++length) {
        FakeDaemon daemon(m_path, Bytes(whole.substr(0, length)));
        LogCapture log;
        EXPECT_EQ(-1, Send()) << length;
        EXPECT_TRUE(log.Has("[ERR] Failed to receive response.")) << length;
        if (length < 12) continue;
        EXPECT_EQ("ok", m_response["ack"].AsString()) << length;
    }
}

TEST_F(DaemonIPCTest, AnAnswerThatIsNoValueIsAFailure) {
    FakeDaemon daemon(m_path, Bytes("HTTP/1.1 200 OK\r\n"));
    LogCapture log;
    EXPECT_EQ(-1, Send());
    EXPECT_TRUE(log.Has("[ERR] Failed to receive response."));
}

TEST_F(DaemonIPCTest, AnAnswerCanNotMakeTheClientStoreAFile) {
    const std::string target = m_dir / "file";
    // Not even where a record of the caller's tells a place.
    m_response = PObject::binary_type{0, 0, target};
    FakeDaemon daemon(m_path, Bytes(std::string("\x30\0\0\0\0\0\0\0\1x", 10)));
    EXPECT_EQ(-1, Send());
    EXPECT_NE(0, access(target.c_str(), F_OK));
}

TEST_F(DaemonIPCTest, ARequestThatCanNotBeSentFails) {
    m_request["buffer"] = PObject::buffer_type();
    IPCListener listener;
    ASSERT_EQ(0, listener.Listen(m_path));
    LogCapture log;
    EXPECT_EQ(-1, Send());
    EXPECT_TRUE(log.Has("[ERR] Failed to send request."));
}

TEST_F(DaemonIPCTest, NamesInAnErrorAreNoFormat) {
    FakeDaemon daemon(m_path, Bytes(std::string("\x42\x10\0\5error\x10\0\4%s%n\x40", 17)));
    LogCapture log;
    EXPECT_EQ(-1, Send());
    EXPECT_TRUE(log.Has("[ERR] SendCommand error: %s%n"));
}

class IPCSenderTest : public testing::Test {
protected:
    void SetUp() override { ASSERT_EQ(0, m_listener.Listen(m_path)); }

    TempDir m_dir;
    std::string m_path = m_dir / "socket";
    IPCListener m_listener;
    IPCSender m_sender;
    PObject m_value;
};

TEST_F(IPCSenderTest, WithoutAConnectionNothingIsSentOrReceived) {
    EXPECT_EQ(-1, m_sender.Send(PObject(1)));
    EXPECT_EQ(-1, m_sender.Recv(m_value));
    EXPECT_EQ(-1, m_sender.SendAndRecv(PObject(1), true, m_value));
    EXPECT_EQ(-1, m_sender.Connect(m_dir / "none"));
    m_sender.Close();
}

TEST_F(IPCSenderTest, AReplyIsReadOnlyWhenItIsWanted) {
    ASSERT_EQ(0, m_sender.Connect(m_path));
    const UniqueFd server(m_listener.Accept());
    EXPECT_EQ(0, m_sender.SendAndRecv(PObject(5), false, m_value));
    EXPECT_TRUE(m_value.IsNull());
    SendBytes(server.Get(), std::string("\1\1\x2a", 3));
    EXPECT_EQ(0, m_sender.SendAndRecv(PObject(6), true, m_value));
    EXPECT_EQ(42, m_value.AsInt32());
    char bytes[16] = {};
    EXPECT_EQ(6, recv(server.Get(), bytes, sizeof(bytes), 0));
    EXPECT_EQ(std::string("\1\1\5\1\1\6", 6), std::string(bytes, 6));
}

TEST_F(IPCSenderTest, NothingIsReadWhenSendingFails) {
    ASSERT_EQ(0, m_sender.Connect(m_path));
    const UniqueFd server(m_listener.Accept());
    SendBytes(server.Get(), std::string("\1\1\x2a", 3));
    EXPECT_EQ(-1, m_sender.SendAndRecv(PObject(PObject::buffer_type()), true, m_value));
    EXPECT_TRUE(m_value.IsNull());
    EXPECT_EQ(0, m_sender.Recv(m_value));  // it is still there
}

TEST_F(IPCSenderTest, HalfARequestIsNotSentWhenTheConnectionIsClosed) {
    ASSERT_EQ(0, m_sender.Connect(m_path));
    const UniqueFd server(m_listener.Accept());
    PObject request;
    request["a"] = "goes into the ring";
    request["b"] = PObject::buffer_type();  // can not be sent
    EXPECT_EQ(-1, m_sender.Send(request));
    m_sender.Close();
    char bytes[64];
    EXPECT_EQ(0, recv(server.Get(), bytes, sizeof(bytes), 0));
}

TEST_F(IPCSenderTest, ASecondConnectIsRefusedUntilTheFirstIsClosed) {
    ASSERT_EQ(0, m_sender.Connect(m_path));
    EXPECT_EQ(-1, m_sender.Connect(m_path));
    EXPECT_EQ(0, m_sender.Send(PObject(1)));
    m_sender.Close();
    EXPECT_EQ(0, m_sender.Connect(m_path));
}

TEST_F(IPCSenderTest, APeerThatHasGoneIsAFailureAndNoSignal) {
    const auto former = signal(SIGPIPE, SIG_DFL);
    ASSERT_EQ(0, m_sender.Connect(m_path));
    UniqueFd(m_listener.Accept()).Reset();
    EXPECT_EQ(-1, m_sender.Send(PObject("x")));
    signal(SIGPIPE, former);
}

TEST_F(IPCSenderTest, TheDestructorClosesTheConnection) {
    UniqueFd server;
    {
        IPCSender sender;
        ASSERT_EQ(0, sender.Connect(m_path));
        server.Reset(m_listener.Accept());
        ASSERT_EQ(0, sender.Send(PObject(1)));
    }
    char bytes[16];
    EXPECT_EQ(3, recv(server.Get(), bytes, sizeof(bytes), 0));
    EXPECT_EQ(0, recv(server.Get(), bytes, sizeof(bytes), 0));
}

}  // namespace
