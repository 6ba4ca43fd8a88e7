// The socket loop, one client at a time, on a socket of the test's own.
#include "daemon/usb-daemon.h"

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>

#include "ipc/channel.h"
#include "ipc/simple-ipc.h"
#include "ipc/stream.h"
#include "shell-fixture.h"
#include "utils/error-code.h"
#include "utils/log.h"

class USBDaemonPeer {
public:
    static Ferrixd& App(USBDaemon& daemon) { return daemon.m_app; }
    static bool ServeOneClient(USBDaemon& daemon, const IPCListener& listener) {
        return daemon.ServeOneClient(listener);
    }
    static int LinkDaemon(USBDaemon& daemon) { return daemon.LinkDaemon(); }
};

namespace {

class SocketLoopTest : public ShellTest {
protected:
    SocketLoopTest() {
        signal(SIGPIPE, SIG_IGN);  // as the daemon does
        EXPECT_EQ(0, m_listener.Listen(m_dir / "socket"));
        EXPECT_EQ(0, USBDaemonPeer::App(m_daemon).StartAppThread());
    }
    ~SocketLoopTest() override { USBDaemonPeer::App(m_daemon).StopAppThread(); }

    // Connects, sends, has the daemon serve this client, and reads what comes back: 0 or -2 for a
    // connection that was closed without a word.
    int Ask(const PObject& request, PObject& response) {
        Channel client(Channel::DEFAULT_CAPACITY);
        EXPECT_EQ(0, client.Open(m_dir / "socket"));
        PStream stream;
        EXPECT_EQ(0, stream.Send(client, request));
        m_goes_on = Serve();
        return stream.Recv(client, response);
    }
    bool Serve() { return USBDaemonPeer::ServeOneClient(m_daemon, m_listener); }

    USBDaemon m_daemon;
    IPCListener m_listener{
        {0, 100000}
    };
    bool m_goes_on = false;
};

TEST_F(SocketLoopTest, ARequestIsAnswered) {
    PObject response;
    EXPECT_EQ(0, Ask(Action("no_such_thing"), response));
    EXPECT_EQ("{\"ack\": \"ok\"}", response.ToText());
    EXPECT_TRUE(m_goes_on);
    EXPECT_TRUE(m_log.Has("[DBG] recieve msg >>> {\"action\": \"no_such_thing\"}"));
    EXPECT_TRUE(m_log.Has("[DBG] send rsp <<< {\"ack\": \"ok\"}"));
}

TEST_F(SocketLoopTest, AnAckThatIsNotWantedIsNotSent) {
    PObject request = Action("remove_task");
    request["need_ack"] = false;
    PObject response;
    EXPECT_EQ(ERR_IO, Ask(request, response));
    EXPECT_TRUE(m_goes_on);
    EXPECT_LT(PlaceOf("[DBG] <<< {\"error\": \"Invalid parameter\", \"error_code\": 1}"),
              PlaceOf("[DBG] NO NEED SEND ACK"));
}

TEST_F(SocketLoopTest, WhetherAnAckIsWantedFollowsTheRuleOfBooleans) {
    const struct {
        PObject need_ack;
        int expected;
    } cases[] = {
        {PObject(true),    0     },
        {PObject(5),       0     },
        {PObject("false"), 0     },
        {PObject(0),       ERR_IO},
        {PObject(""),      ERR_IO},
        {PObject(),        ERR_IO},
    };
    for (const auto& c : cases) {
        PObject request = Action("no_such_thing");
        request["need_ack"] = c.need_ack;
        PObject response;
        EXPECT_EQ(c.expected, Ask(request, response)) << c.need_ack.ToText();
    }
}

TEST_F(SocketLoopTest, StopEndsTheLoopAndIsNotAnsweredEvenOnDemand) {
    PObject request = Action("stop");
    request["need_ack"] = true;
    PObject response;
    EXPECT_EQ(ERR_IO, Ask(request, response));
    EXPECT_FALSE(m_goes_on);
    EXPECT_TRUE(m_log.Has("[INFO] Unlink Daemon"));
}

TEST_F(SocketLoopTest, WithoutAClientTheLoopGoesOn) { EXPECT_TRUE(Serve()); }

TEST_F(SocketLoopTest, AMessageThatCanNotBeDecodedIsNotAnswered) {
    Channel client(16);
    ASSERT_EQ(0, client.Open(m_dir / "socket"));
    ASSERT_EQ(0, client.WriteU8(0xff));
    ASSERT_EQ(0, client.FlushWrite(0));
    EXPECT_TRUE(Serve());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to recieve message from channel."));
    uint8_t byte = 0;
    EXPECT_EQ(ERR_IO, client.ReadU8(&byte));
    PObject response;
    EXPECT_EQ(0, Ask(Action("no_such_thing"), response));  // the next one is served
}

TEST_F(SocketLoopTest, AClientThatHangsUpBeforeItsAnswerIsLoggedOnly) {
    {
        Channel client(1024);
        ASSERT_EQ(0, client.Open(m_dir / "socket"));
        PStream stream;
        ASSERT_EQ(0, stream.Send(client, Action("no_such_thing")));
    }
    EXPECT_TRUE(Serve());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to send message from channel."));
}

TEST_F(SocketLoopTest, AnotherUserIsTurnedAwayUnheard) {
    if (geteuid() != 0) GTEST_SKIP() << "needs root to become another user";
    ASSERT_EQ(0, chmod(m_dir.Path().c_str(), 0755));
    ASSERT_EQ(0, chmod((m_dir / "socket").c_str(), 0777));
    const pid_t child = fork();
    if (child == 0) {
        LogSetSink([](int, std::string_view) {});  // the lock of m_log may be another thread's
        alarm(60);
        Channel client(1024);
        PStream stream;
        PObject response;
        if (setuid(65534) != 0 || client.Open(m_dir / "socket") != 0) _exit(1);
        // Turned away before the sending or after it, there is no answer.
        const bool is_sent = stream.Send(client, Action("stop")) == 0;
        _exit(is_sent && stream.Recv(client, response) == 0 ? 3 : 0);
    }
    while (!m_listener.Wait()) {
    }
    EXPECT_TRUE(Serve());
    int status = -1;
    ASSERT_EQ(child, waitpid(child, &status, 0));
    EXPECT_EQ(0, status);
    EXPECT_TRUE(m_log.Contains("[WARN] user 65534"));
    EXPECT_FALSE(m_log.Contains("recieve msg"));
}

TEST_F(SocketLoopTest, LinkGoesThroughTheQueueOfTheClients) {
    EXPECT_EQ(0, USBDaemonPeer::LinkDaemon(m_daemon));
    EXPECT_TRUE(m_log.Has("[DBG] >>> {\"action\": \"link\"}"));
    EXPECT_TRUE(m_log.Has("[DBG] response <<< {\"ack\": \"ok\"}"));
    PObject response;
    EXPECT_EQ(0, Ask(Action("link"), response));  // once more, from a client
    EXPECT_EQ("{\"ack\": \"ok\"}", response.ToText());
    EXPECT_EQ(0, Ask(Action("list_task"), response));
    EXPECT_EQ("{\"ack\": \"ok\", \"task_list\": []}", response.ToText());
}

TEST_F(SocketLoopTest, AFailedLinkIsReported) {
    m_dir.MakeDir("v1/@Ferrix/db/task-db.sqlite");
    EXPECT_EQ(-1, USBDaemonPeer::LinkDaemon(m_daemon));
    EXPECT_TRUE(m_log.Has("[ERR] LinkDaemon error: \"failed to initialize environment\""));
}

TEST_F(ShellTest, LinkWithoutAnApplicationThreadHasNoAck) {
    USBDaemon daemon;
    EXPECT_EQ(-1, USBDaemonPeer::LinkDaemon(daemon));
    EXPECT_TRUE(m_log.Has("[ERR] Can not recieve ack."));
}

}  // namespace
