#include "client/share-change.h"

#include <gmock/gmock.h>
#include <pthread.h>

#include <atomic>
#include <csignal>
#include <mutex>

#include "client/exit-status.h"
#include "client/fake-box-admin.h"
#include "client/scripted-daemon.h"
#include "db/task-info.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

using testing::AllOf;
using testing::HasSubstr;

namespace {

using Events = std::vector<std::string>;

// A box and a daemon with one task, "3 Camera" on the share "photos"; what either is asked is
// written down in one list.
class ShareChangeTest : public testing::Test {
protected:
    ShareChangeTest() {
        FakeBoxAdmin::Reset().on_call = [this](const std::string& what) {
            Note(what);
            const auto failure = m_failures.find(what);
            if (failure != m_failures.end()) throw CommandError(EXIT_REFUSED, failure->second);
        };
    }
    ~ShareChangeTest() override { FakeBoxAdmin::Reset(); }

    void Note(const std::string& event) {
        const std::lock_guard lock(m_mutex);
        m_events.push_back(event);
    }

    // Hooks act on the task as the daemon's do, but for `m_ignored`; no answer to `m_silent`.
    std::optional<PObject> Answer(const PObject& request) {
        const std::string hook = request["notify"].AsString();
        std::string event = hook.empty() ? request["action"].AsString() : hook;
        for (const char* key : {"origin_share_name", "share_name"}) {
            if (request.HasMember(key)) event += " " + request[key].AsString();
        }
        EXPECT_EQ(hook.empty() ? "" : "share_hook", request["type"].AsString());
        Note(event);
        if (hook == m_silent || (hook.empty() && m_silent == "list_task")) return std::nullopt;
        if (hook != m_ignored) Act(hook, request);
        PObject answer;
        answer["ack"] = "ok";
        if (request["action"].AsString() == "list_task") answer["task_list"] = Tasks();
        return answer;
    }
    void Act(const std::string& hook, const PObject& request) {
        if (hook == "post_path_change" && m_task_share == request["origin_share_name"].AsString()) {
            m_task_share = request["share_name"].AsString();
        }
        if (hook == "pre_delete" && m_task_share == request["share_name"].AsString()) {
            m_task_share.clear();
        }
    }
    PObject::array_type Tasks() const {
        if (m_task_share.empty()) return {};
        PObject task;
        task["id"] = 3;
        task["type"] = int{TASK_TYPE_IMPORT_GENERAL};
        task["task_name"] = "Camera";
        task["destination_path"] = "/" + m_task_share + "/inbox";
        return {task};
    }

    void StartDaemon() {
        m_daemon.emplace(m_socket, [this](const PObject& request) { return Answer(request); });
    }
    void Rename() {
        Run([this] { m_path = RenameShareOfTasks(m_client, "photos", "pictures"); });
    }
    void Remove(bool with_tasks) {
        Run([&] { m_path = RemoveShareOfTasks(m_client, "photos", with_tasks); });
    }
    void Run(const std::function<void()>& command) {
        const LogCapture log;  // of what the connection meets
        m_status = EXIT_DONE;
        try {
            command();
        } catch (const CommandError& error) {
            m_status = error.Status();
            m_text = error.what();
        }
        m_daemon.reset();
    }

    TempDir m_dir;
    std::string m_socket = m_dir / "socket";
    DaemonClient m_client{m_socket};
    std::string m_task_share = "photos";
    std::string m_silent = "nothing";
    std::string m_ignored;
    std::map<std::string, std::string> m_failures;  // of the box, by what is asked

    std::mutex m_mutex;
    Events m_events;
    ExitStatus m_status = EXIT_DONE;
    std::string m_text;
    std::string m_path;
    std::optional<ScriptedDaemon> m_daemon;
};

}  // namespace

TEST_F(ShareChangeTest, ARenameIsToldBeforeAndAfter) {
    StartDaemon();
    Rename();
    EXPECT_EQ(EXIT_DONE, m_status) << m_text;
    EXPECT_EQ("/volume1/pictures", m_path);
    EXPECT_EQ((Events{"check rename photos pictures", "pre_path_change photos",
                      "rename photos pictures", "post_path_change photos pictures", "list_task"}),
              m_events);
}

// Ctrl-C between the hooks would leave the tasks out of service.
TEST_F(ShareChangeTest, AChangeIsNotBrokenOffHalfway) {
    static std::atomic<int> stops = 0;
    struct sigaction note {};
    note.sa_handler = [](int) { ++stops; };
    for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
        struct sigaction before {};
        ASSERT_EQ(0, sigaction(number, &note, &before));
        for (const bool is_removal : {false, true}) {
            stops = 0;
            FakeBoxAdmin::Reset().on_call = [this, number](const std::string& what) {
                Note(what);
                if (what.rfind("check", 0) == 0) return;
                pthread_kill(pthread_self(), number);
                EXPECT_EQ(0, stops) << "between the hooks";
            };
            m_task_share = "photos";
            StartDaemon();
            is_removal ? Remove(true) : Rename();
            EXPECT_EQ(EXIT_DONE, m_status) << m_text;
            EXPECT_EQ(1, stops) << "afterwards it counts";
        }
        ASSERT_EQ(0, sigaction(number, &before, nullptr));
    }
}

TEST_F(ShareChangeTest, ARenameThatCannotBeDisturbsNoTask) {
    StartDaemon();
    m_failures["check rename photos pictures"] = "no such share";
    Rename();
    EXPECT_EQ(EXIT_REFUSED, m_status);
    EXPECT_EQ("no such share", m_text);
    EXPECT_EQ(Events{"check rename photos pictures"}, m_events);
}

TEST_F(ShareChangeTest, WhenTheRenameFailsTheTasksComeBack) {
    StartDaemon();
    m_failures["rename photos pictures"] = "the disk is full";
    Rename();
    EXPECT_EQ(EXIT_REFUSED, m_status);
    EXPECT_EQ("the disk is full", m_text);
    EXPECT_EQ("post_path_change photos photos", m_events.back());
    EXPECT_EQ("photos", m_task_share);
}

TEST_F(ShareChangeTest, WithoutTheDaemonNothingIsRenamed) {
    Rename();
    EXPECT_EQ(EXIT_NOT_REACHABLE, m_status);
    EXPECT_THAT(m_text, AllOf(HasSubstr("would not follow"), HasSubstr("start the service first")));
    EXPECT_EQ(Events{"check rename photos pictures"}, m_events);
}

TEST_F(ShareChangeTest, WhenTheFirstHookIsNotAnsweredTheTasksAreCalledBack) {
    StartDaemon();
    m_silent = "pre_path_change";
    Rename();
    EXPECT_EQ(EXIT_NOT_REACHABLE, m_status);
    EXPECT_EQ((Events{"check rename photos pictures", "pre_path_change photos",
                      "post_path_change photos photos"}),
              m_events);
}

TEST_F(ShareChangeTest, WhenTheLastHookIsNotAnsweredTheTextTellsHowToSendItAgain) {
    StartDaemon();
    m_silent = "post_path_change";
    Rename();
    EXPECT_EQ(EXIT_NOT_REACHABLE, m_status);
    EXPECT_THAT(m_text, AllOf(HasSubstr("the share is renamed, but"),
                              HasSubstr("ferrixctl hook post_path_change "
                                        "origin_share_name=photos share_name=pictures\"")));
}

TEST_F(ShareChangeTest, TasksThatHaveNotFollowedAreNamed) {
    StartDaemon();
    m_ignored = "post_path_change";
    Rename();
    EXPECT_EQ(EXIT_REFUSED, m_status);
    EXPECT_THAT(
        m_text,
        HasSubstr("the share is renamed, but these tasks still name the old one: 3 Camera"));
}

TEST_F(ShareChangeTest, AShareWithoutTasksIsRemoved) {
    StartDaemon();
    m_task_share = "music";
    Remove(false);
    EXPECT_EQ(EXIT_DONE, m_status) << m_text;
    EXPECT_EQ("/volume1/photos", m_path);
    EXPECT_EQ((Events{"check remove photos", "list_task", "pre_delete photos", "list_task",
                      "remove photos"}),
              m_events);
    EXPECT_EQ("music", m_task_share);
}

TEST_F(ShareChangeTest, AShareWithTasksIsNotRemovedUnasked) {
    StartDaemon();
    Remove(false);
    EXPECT_EQ(EXIT_REFUSED, m_status);
    EXPECT_THAT(m_text, AllOf(HasSubstr("these tasks use the share: 3 Camera;"),
                              HasSubstr("--with-tasks")));
    EXPECT_EQ((Events{"check remove photos", "list_task"}), m_events);
}

TEST_F(ShareChangeTest, AskedForTheTasksGoWithTheShare) {
    StartDaemon();
    Remove(true);
    EXPECT_EQ(EXIT_DONE, m_status) << m_text;
    EXPECT_EQ("", m_task_share);
    EXPECT_EQ("remove photos", m_events.back());
}

TEST_F(ShareChangeTest, ARemovalThatCannotBeCostsNoTask) {
    StartDaemon();
    m_failures["check remove photos"] = "the folder is not empty";
    Remove(true);
    EXPECT_EQ("the folder is not empty", m_text);
    EXPECT_EQ(Events{"check remove photos"}, m_events);
}

TEST_F(ShareChangeTest, AShareWhoseTasksCouldNotBeRemovedStays) {
    StartDaemon();
    m_ignored = "pre_delete";
    Remove(true);
    EXPECT_EQ(EXIT_REFUSED, m_status);
    EXPECT_THAT(m_text,
                HasSubstr("the share stays, as these tasks could not be removed: 3 Camera"));
    EXPECT_EQ("list_task", m_events.back());
}

TEST_F(ShareChangeTest, WhenOnlyTheRemovalFailsTheTextSaysThatTheTasksAreGone) {
    StartDaemon();
    m_failures["remove photos"] = "the disk is full";
    Remove(true);
    EXPECT_EQ(EXIT_REFUSED, m_status);
    EXPECT_EQ("the tasks are gone, but the share stays: the disk is full", m_text);
}

TEST_F(ShareChangeTest, WithoutTheDaemonNothingIsRemoved) {
    Remove(true);
    EXPECT_EQ(EXIT_NOT_REACHABLE, m_status);
    EXPECT_THAT(m_text, HasSubstr("it is not known which tasks use the share: start the service"));
    EXPECT_EQ(Events{"check remove photos"}, m_events);
}
