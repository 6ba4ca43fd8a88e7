#include "client/notifier.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/socket.h>

#include <functional>
#include <thread>

#include "client/command.h"
#include "client/daemon-client.h"
#include "client/exit-status.h"
#include "ipc/simple-ipc.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/unique-fd.h"

using testing::HasSubstr;
using testing::Not;

namespace {

// {"ack": "ok"}
const std::string ACK("\x42\x10\0\3ack\x10\0\2ok\x40", 13);

std::string String(const std::string& text) {
    return std::string{'\x10', static_cast<char>(text.size() >> 8),
                       static_cast<char>(text.size())} +
           text;
}

std::string Map(const std::vector<std::pair<std::string, std::string>>& pairs) {
    std::string bytes = "\x42";
    for (const auto& [key, value] : pairs) bytes += String(key) + value;
    return bytes + "\x40";
}

// The request for a task whose id has these bytes on the wire.
std::string RunTask(const std::string& id) {
    const std::string integer = std::string{'\x01', static_cast<char>(id.size())} + id;
    return Map({
        {"action",  String("run_task")},
        {"task_id", integer           }
    });
}

// Takes as many bytes as the request shall have, answers, and takes what comes after.
class RawDaemon {
public:
    RawDaemon(const std::string& path, size_t request_size, const std::string& answer) {
        EXPECT_EQ(0, m_listener.Listen(path));
        m_thread = std::thread([this, request_size, answer] {
            const UniqueFd client(m_listener.Accept());
            m_request.resize(request_size);
            const ssize_t got = recv(client.Get(), m_request.data(), request_size, MSG_WAITALL);
            m_request.resize(got > 0 ? static_cast<size_t>(got) : 0);
            EXPECT_EQ(static_cast<ssize_t>(answer.size()),
                      send(client.Get(), answer.data(), answer.size(), MSG_NOSIGNAL));
            shutdown(client.Get(), SHUT_WR);
            char more[256];
            for (ssize_t size = 0; (size = recv(client.Get(), more, sizeof more, 0)) > 0;) {
                m_request.append(more, static_cast<size_t>(size));
            }
        });
    }
    ~RawDaemon() {
        if (m_thread.joinable()) m_thread.join();
    }
    RawDaemon(const RawDaemon&) = delete;
    RawDaemon& operator=(const RawDaemon&) = delete;

    // All that has arrived when the client has gone.
    [[nodiscard]] std::string Request() {
        m_thread.join();
        return m_request;
    }

private:
    IPCListener m_listener;
    std::string m_request;
    std::thread m_thread;
};

class NotifierTest : public testing::Test {
protected:
    int Run(std::vector<const char*> arguments) {
        arguments.insert(arguments.begin(), "ferrix-notifier");
        const DaemonClient client(m_path);
        testing::internal::CaptureStdout();
        testing::internal::CaptureStderr();
        const int status = RunProgram(*MakeNotifierProgram(client),
                                      static_cast<int>(arguments.size()), arguments.data());
        m_output = testing::internal::GetCapturedStdout();
        m_errors = testing::internal::GetCapturedStderr();
        return status;
    }

    TempDir m_folder;
    std::string m_path = m_folder / "socket";
    LogCapture m_log;
    std::string m_output;
    std::string m_errors;
};

}  // namespace

TEST_F(NotifierTest, ATaskIsRunByItsId) {
    const std::string request = RunTask("\x07");
    RawDaemon daemon(m_path, request.size(), ACK);
    EXPECT_EQ(EXIT_DONE, Run({"--execute-task", "7"}));
    EXPECT_EQ(request, daemon.Request());
    EXPECT_EQ("", m_output);
    EXPECT_EQ("", m_errors);
}

TEST_F(NotifierTest, AnIdHasAll64Bits) {
    const std::string request = RunTask("\xff\xff\xff\xff\xff\xff\xff\xff");
    RawDaemon daemon(m_path, request.size(), ACK);
    EXPECT_EQ(EXIT_DONE, Run({"--execute-task=18446744073709551615"}));
    EXPECT_EQ(request, daemon.Request());
}

TEST_F(NotifierTest, AnIdIsDecimalAlsoWithAZeroInFront) {
    const std::string request = RunTask("\x0a");
    RawDaemon daemon(m_path, request.size(), ACK);
    EXPECT_EQ(EXIT_DONE, Run({"--execute-task", "010"}));
    EXPECT_EQ(request, daemon.Request());
}

TEST_F(NotifierTest, AHookIsSentWithItsKindAndItsKeys) {
    const std::string request = Map({
        {"device",     String("/dev/sdb1")        },
        {"mountpoint", String("/media/a=b \xff\n")},
        {"notify",     String("post_mount")       },
        {"type",       String("volume_hook")      }
    });
    RawDaemon daemon(m_path, request.size(), ACK);
    EXPECT_EQ(EXIT_DONE, Run({"--hook", "post_mount", "--type", "volume_hook",
                              "mountpoint=/media/a=b \xff\n", "device=/dev/sdb1"}));
    EXPECT_EQ(request, daemon.Request());
    EXPECT_EQ("", m_output);
    EXPECT_EQ("", m_errors);
}

TEST_F(NotifierTest, AHookNeedsNoKeys) {
    const std::string request = Map({
        {"notify", String("post_ferrix")},
        {"type",   String("ferrix_hook")}
    });
    RawDaemon daemon(m_path, request.size(), ACK);
    EXPECT_EQ(EXIT_DONE, Run({"--type", "ferrix_hook", "--hook", "post_ferrix"}));
    EXPECT_EQ(request, daemon.Request());
}

TEST_F(NotifierTest, ARefusalIsToldInTheDaemonsWords) {
    const std::string request = RunTask("\x07");
    const std::string error_code("\x01\x01\x0b", 3);
    const std::string refusal = Map({
        {"ack",        String("ok")                  },
        {"error",      String("Task is not runnable")},
        {"error_code", error_code                    }
    });
    RawDaemon daemon(m_path, request.size(), refusal);
    EXPECT_EQ(EXIT_REFUSED, Run({"--execute-task", "7"}));
    EXPECT_EQ("", m_output);
    EXPECT_THAT(m_errors, HasSubstr("ferrix-notifier: Task is not runnable"));
}

TEST_F(NotifierTest, ADaemonThatSaysNothingIsNotReachable) {
    RawDaemon daemon(m_path, 1, "");
    EXPECT_EQ(EXIT_NOT_REACHABLE, Run({"--execute-task", "7"}));
    EXPECT_EQ("", m_output);
    EXPECT_THAT(m_errors, HasSubstr("does not answer"));
}

TEST_F(NotifierTest, AnAnswerWithoutAnAcknowledgementIsNoSuccess) {
    RawDaemon daemon(m_path, 1,
                     Map({
                         {"ack", String("no")}
    }));
    EXPECT_NE(EXIT_DONE, Run({"--execute-task", "7"}));
    EXPECT_NE("", m_errors);
}

TEST_F(NotifierTest, WithoutADaemonItIsNotReachable) {
    EXPECT_EQ(EXIT_NOT_REACHABLE, Run({"--execute-task", "7"}));
    EXPECT_THAT(m_errors, HasSubstr(m_path));
    EXPECT_EQ(EXIT_NOT_REACHABLE, Run({"--hook", "post_ferrix", "--type", "ferrix_hook"}));
}

TEST_F(NotifierTest, AWrongCommandLineSendsNothing) {
    IPCListener listener({0, 0});
    ASSERT_EQ(0, listener.Listen(m_path));
    const std::vector<const char*> wrong[] = {
        {               },
        {"--execute-task"},
        {"--execute-task", ""},
        {"--execute-task",                "-1"},
        {"--execute-task","+1"},
        {"--execute-task", "7x"},
        {"--execute-task",                " 7"},
        {"--execute-task",            "0x7"},
        {"--execute-task", "18446744073709551616"},
        {"--execute-task",                "7", "8"},
        {"--execute-task","7", "--execute-task", "8"},
        {"--execute-task", "7", "--hook", "post_ferrix", "--type", "ferrix_hook"},
        {"--execute-task",                "7", "--type", "ferrix_hook"},
        {"--hook","post_mount"},
        {"--hook",                "", "--type", "volume_hook"},
        {"--hook",              "post_mount", "--type", "any_hook"},
        {"--hook",             "post_moun", "--type", "volume_hook"},
        {"--hook", "post_moun", "--type", "ferrix_hook"},
        {"--hook",        "post_moun", "--type", "share_hook"},
        {"--hook",        "post_mount", "--type", "volume_hook", "mountpoint"},
        {"--hook",                "post_mount", "--type", "volume_hook", "=/media/card"},
        {"--hook","post_mount", "--type", "volume_hook", "action=stop"},
        {"--hook",   "post_mount", "--type", "volume_hook", "_action=stop"},
        {"--hook",         "post_mount", "--type", "volume_hook", "need_ack="},
        {"--type",                "volume_hook"},
        {"mountpoint=/media/card"},
        {"--unknown"  },
        {"7"        },
    };
    for (const std::vector<const char*>& arguments : wrong) {
        std::string line;
        for (const char* argument : arguments) line += std::string(" ") + argument;
        EXPECT_EQ(EXIT_USAGE, Run(arguments)) << line;
        EXPECT_THAT(m_errors, testing::StartsWith("ferrix-notifier: ")) << line;
        EXPECT_EQ("", m_output) << line;
        EXPECT_FALSE(listener.Wait()) << line;
    }
}

TEST_F(NotifierTest, ANameThatTheDaemonDoesNotKnowIsToldWithThoseThatThereAre) {
    EXPECT_EQ(EXIT_USAGE, Run({"--hook", "post_moun", "--type", "volume_hook"}));
    EXPECT_THAT(m_errors, HasSubstr("there is no hook \"post_moun\"; there are post_mount, "));
}

TEST_F(NotifierTest, AHostileWordCannotSteerTheTerminal) {
    EXPECT_EQ(EXIT_USAGE, Run({"--execute-task", "\033[2J"}));
    EXPECT_THAT(m_errors, Not(HasSubstr("\033")));
}

TEST_F(NotifierTest, ItsHelpShowsBothForms) {
    EXPECT_EQ(EXIT_DONE, Run({"--help"}));
    EXPECT_THAT(m_output, HasSubstr("--execute-task ID"));
    EXPECT_THAT(m_output, HasSubstr("--hook NAME"));
    EXPECT_THAT(m_output, HasSubstr("--type TYPE:{volume_hook,ferrix_hook,share_hook}"));
    EXPECT_THAT(m_output, HasSubstr("Example:\n  ferrix-notifier --execute-task 7\n"));
}
