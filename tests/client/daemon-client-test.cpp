#include "client/daemon-client.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <mutex>

#include "client/exit-status.h"
#include "scripted-daemon.h"
#include "support/temp-dir.h"

using testing::HasSubstr;
using testing::Not;

namespace {

// Answers each request alike, and keeps the last.
class OneAnswer {
public:
    OneAnswer(const std::string& path, PObject answer)
        : m_daemon(path, [this, answer = std::move(answer)](const PObject& asked) {
              const std::lock_guard lock(m_mutex);
              m_request = asked;
              return answer;
          }) {}

    [[nodiscard]] PObject Request() {
        const std::lock_guard lock(m_mutex);
        return m_request;
    }

private:
    std::mutex m_mutex;
    PObject m_request;
    ScriptedDaemon m_daemon;  // last: it ends first
};

PObject Map(std::initializer_list<std::pair<const char*, PObject>> members) {
    PObject map;
    for (const auto& [key, value] : members) map[key] = value;
    return map;
}

PObject TaskList(std::initializer_list<std::pair<uint64_t, const char*>> tasks) {
    PObject::array_type list;
    for (const auto& [id, name] : tasks)
        list.push_back(Map({
            {"id",        id  },
            {"task_name", name}
        }));
    PObject answer = Map({
        {"ack", "ok"}
    });
    answer["task_list"] = list;
    return answer;
}

class DaemonClientTest : public testing::Test {
protected:
    // The status and text with which the command ends.
    static std::pair<ExitStatus, std::string> EndOf(const std::function<void()>& command) {
        try {
            command();
        } catch (const CommandError& error) {
            return {error.Status(), error.what()};
        }
        return {EXIT_DONE, ""};
    }

    TempDir m_folder;
    std::string m_path = m_folder.Path() + "/socket";
    DaemonClient m_client{m_path};
};

}  // namespace

TEST_F(DaemonClientTest, AsksAndGivesTheAnswerBack) {
    OneAnswer daemon(m_path, Map({
                                 {"ack",     "ok"},
                                 {"task_id", 7   }
    }));
    EXPECT_EQ(7U, m_client
                      .Ask("add_task", Map({
                                           {"uuid", "x"}
    }))["task_id"]
                      .AsUInt64());
    EXPECT_EQ("add_task", daemon.Request()["action"].AsString());
    EXPECT_EQ("x", daemon.Request()["uuid"].AsString());
}

TEST_F(DaemonClientTest, ARefusalHoldsTheDaemonsTextAndWhatToDo) {
    OneAnswer daemon(
        m_path, Map({
                    {"ack",        "ok"                         },
                    {"error",      "Duplicated destination path"},
                    {"error_code", 9                            }
    }));
    const auto [status, text] = EndOf([this] { (void)m_client.AskAbout("run_task", 3); });
    EXPECT_EQ(EXIT_REFUSED, status);
    EXPECT_THAT(text, HasSubstr("Duplicated destination path: "));
    EXPECT_THAT(text, HasSubstr("--to"));
    EXPECT_EQ(3U, daemon.Request()["task_id"].AsUInt64());
}

TEST_F(DaemonClientTest, ARefusalCannotSteerTheTerminal) {
    OneAnswer daemon(m_path, Map({
                                 {"ack",        "ok"     },
                                 {"error",      "\033[2J"},
                                 {"error_code", 99       }
    }));
    const auto [status, text] = EndOf([this] { (void)m_client.Ask("stop"); });
    EXPECT_EQ(EXIT_REFUSED, status);
    EXPECT_THAT(text, Not(HasSubstr("\033")));
}

TEST_F(DaemonClientTest, NoDaemonIsNotReachable) {
    const auto [status, text] = EndOf([this] { (void)m_client.Tasks(); });
    EXPECT_EQ(EXIT_NOT_REACHABLE, status);
    EXPECT_THAT(text, HasSubstr("service start"));
}

TEST_F(DaemonClientTest, AHookIsSentWithItsKindAndKeys) {
    OneAnswer daemon(m_path, Map({
                                 {"ack", "ok"}
    }));
    m_client.SendHook("post_mount", "volume_hook",
                      {
                          {"mountpoint", "/m"    },
                          {"device",     "/dev/x"}
    });
    EXPECT_EQ("post_mount", daemon.Request()["notify"].AsString());
    EXPECT_EQ("volume_hook", daemon.Request()["type"].AsString());
    EXPECT_EQ("/m", daemon.Request()["mountpoint"].AsString());
    EXPECT_FALSE(daemon.Request().HasMember("action"));
}

TEST_F(DaemonClientTest, ATaskIsFoundByItsIdBeforeItsName) {
    OneAnswer daemon(m_path, TaskList({
                                 {1, "2"     },
                                 {2, "Camera"}
    }));
    EXPECT_EQ("Camera", m_client.FindTask("2")["task_name"].AsString());
}

TEST_F(DaemonClientTest, ATaskIsFoundByItsName) {
    OneAnswer daemon(m_path, TaskList({
                                 {1, "Stick" },
                                 {2, "Camera"}
    }));
    EXPECT_EQ(2U, m_client.FindTask("Camera")["id"].AsUInt64());
}

TEST_F(DaemonClientTest, ANameOfTwoTasksIsNotGuessed) {
    OneAnswer daemon(m_path, TaskList({
                                 {1, "Camera"},
                                 {2, "Camera"}
    }));
    EXPECT_EQ(EXIT_USAGE, EndOf([this] { (void)m_client.FindTask("Camera"); }).first);
}

TEST_F(DaemonClientTest, ATaskThatIsNotThereIsAWrongWord) {
    OneAnswer daemon(m_path, TaskList({
                                 {1, "Camera"}
    }));
    EXPECT_EQ(EXIT_USAGE, EndOf([this] { (void)m_client.FindTask("camera"); }).first);
}
