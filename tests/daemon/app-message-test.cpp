// The road of a message to its handler, and the application thread.
#include <unistd.h>

#include "shell-fixture.h"

namespace {

using testing::ElementsAre;

// Lines that tell which handlers ran: each refuses a message without its keys.
constexpr char kMountRan[] = "[ERR] HandleVolumeMount: Invalid parameter";
constexpr char kUnmountRan[] = "[ERR] HandleVolumeUnmount: Invalid parameter";

class MessageTest : public ShellTest {
protected:
    static PObject Hook(const std::string& name, const std::string& type) {
        PObject request;
        request["notify"] = name;
        request["type"] = type;
        return request;
    }
    PObject Process(const PObject& request) {
        PObject response;
        EXPECT_EQ(0, m_app.ProcessMessage(request, response));
        return response;
    }
};

TEST_F(MessageTest, TheTablesHoldWhatThisDaemonCanDo) {
    EXPECT_THAT(
        FerrixdPeer::Actions(m_app),
        ElementsAre("add_task", "cancel_task", "disable_task", "enable_task", "get_filter_setting",
                    "get_task_progress", "get_task_setting", "link", "list_entry", "list_task",
                    "remove_task", "run_task", "set_filter_setting", "set_global_setting",
                    "set_task_setting", "set_trigger_time_setting", "stop"));
    EXPECT_THAT(
        FerrixdPeer::Hooks(m_app),
        ElementsAre("post_decrypt", "post_ferrix", "post_mount", "post_path_change",
                    "post_snapshot_restore", "post_transform", "pre_delete", "pre_encrypt",
                    "pre_path_change", "pre_snapshot_restore", "pre_transform", "pre_unmount"));
}

TEST_F(MessageTest, TheRequestAndTheResponseAreLogged) {
    Handle(Action("remove_task"));
    EXPECT_TRUE(m_log.Has("[DBG] >>> {\"action\": \"remove_task\"}"));
    EXPECT_TRUE(m_log.Has("[DBG] <<< {\"error\": \"Invalid parameter\", \"error_code\": 1}"));
}

TEST_F(MessageTest, AnUnknownActionRunsNothingAndEndsThere) {
    PObject request = Hook("post_mount", "volume_hook");
    request["action"] = "Stop";  // names are compared byte for byte
    EXPECT_TRUE(Handle(request).IsNull());
    EXPECT_FALSE(m_log.Contains(kMountRan));
    EXPECT_FALSE(m_log.Contains("<<<"));
    EXPECT_TRUE(FerrixdPeer::IsRunning(m_app));
}

TEST_F(MessageTest, AnActionThatIsNoStringIsUnknown) {
    PObject request;
    request["action"].AsArray().emplace_back("stop");
    EXPECT_TRUE(Handle(request).IsNull());
    EXPECT_TRUE(FerrixdPeer::IsRunning(m_app));
}

TEST_F(MessageTest, EachOfTheThreeTypesReachesAHook) {
    for (const char* type : {"volume_hook", "ferrix_hook", "share_hook"}) {
        m_log.Clear();
        Handle(Hook("post_mount", type));
        EXPECT_EQ(1, m_log.Count(kMountRan)) << type;
        EXPECT_TRUE(m_log.Has("[DBG] <<< null"));
    }
}

TEST_F(MessageTest, SeveralHooksShareAHandlerAndTheTypeDoesNotMatter) {
    for (const PObject& request :
         {Hook("pre_transform", "share_hook"), Hook("pre_path_change", "volume_hook"),
          Hook("pre_snapshot_restore", "ferrix_hook")}) {
        m_log.Clear();
        Handle(request);
        EXPECT_TRUE(m_log.Has("[ERR] HandleShareRemoveEntry: Invalid parameter"));
    }
}

TEST_F(MessageTest, AHookWithoutATypeOrOfAnotherTypeIsIgnored) {
    PObject without_type;
    without_type["notify"] = "post_mount";
    for (const PObject& request : {without_type, Hook("post_mount", "disk_hook")}) {
        Handle(request);
        EXPECT_FALSE(m_log.Contains(kMountRan));
        EXPECT_TRUE(m_log.Has("[DBG] <<< null"));
    }
}

TEST_F(MessageTest, AnUnknownHookEndsThere) {
    Handle(Hook("post_dinner", "volume_hook"));
    EXPECT_FALSE(m_log.Contains("<<<"));
}

TEST_F(MessageTest, AnActionAndAHookInOneMessageBothRunTheActionFirst) {
    PObject request = Hook("pre_unmount", "volume_hook");
    request["action"] = "stop";
    Handle(request);
    EXPECT_LT(PlaceOf("[INFO] Unlink Daemon"), PlaceOf(kUnmountRan));
}

TEST_F(MessageTest, SetResponseErrorDropsWhatTheResponseHeld) {
    PObject response;
    response["task_id"] = 5;
    Ferrixd::SetResponseError(RESPONSE_DATABASE, "Failed to update task info", response);
    EXPECT_EQ("{\"error\": \"Failed to update task info\", \"error_code\": 2}", response.ToText());
}

TEST_F(MessageTest, EveryResponseIsAcknowledgedFailedOrNot) {
    ASSERT_EQ(0, m_app.StartAppThread());
    EXPECT_EQ("{\"ack\": \"ok\"}", Process(Action("no_such_thing")).ToText());
    EXPECT_EQ("{\"ack\": \"ok\"}", Process(PObject()).ToText());
    EXPECT_EQ("{\"ack\": \"ok\"}", Process(PObject("not a map")).ToText());
    EXPECT_EQ("{\"ack\": \"ok\"}", Process(Hook("post_mount", "volume_hook")).ToText());
    EXPECT_EQ("{\"ack\": \"ok\", \"error\": \"Invalid parameter\", \"error_code\": 1}",
              Process(Action("add_task")).ToText());
    m_app.StopAppThread();
    EXPECT_EQ(5, m_log.Count("[INFO] Ferrixd: get message") - 1);
}

TEST_F(MessageTest, AWakeUpWithoutAMessageIsHarmless) {
    ASSERT_EQ(0, m_app.StartAppThread());
    while (m_log.Count("[INFO] wait for message ...") < 3) {
        FerrixdPeer::WakeWithoutMessage(m_app);
        usleep(100);
    }
    EXPECT_EQ("{\"ack\": \"ok\"}", Process(Action("no_such_thing")).ToText());
    m_app.StopAppThread();
}

TEST_F(MessageTest, ManyMessagesAreDoneOneAfterAnother) {
    ASSERT_EQ(0, m_app.StartAppThread());
    for (int i = 0; i < 2000; ++i) {
        ASSERT_EQ("{\"ack\": \"ok\"}", Process(Action("no_such_thing")).ToText());
    }
    m_app.StopAppThread();
    EXPECT_EQ(0U, FerrixdPeer::QueueSize(m_app));
}

TEST_F(MessageTest, StoppingTheThreadRunsTheStopAction) {
    ASSERT_EQ(0, m_app.StartAppThread());
    m_app.StopAppThread();
    EXPECT_FALSE(FerrixdPeer::IsRunning(m_app));
    EXPECT_LT(PlaceOf("[INFO] app thread starts receiving messages"),
              PlaceOf("[INFO] Unlink Daemon"));
    EXPECT_LT(PlaceOf("[INFO] Unlink Daemon"), PlaceOf("[INFO] app thread down"));
}

TEST_F(MessageTest, AfterAClientsStopTheLastItemStaysUnread) {
    ASSERT_EQ(0, m_app.StartAppThread());
    EXPECT_EQ("{\"ack\": \"ok\"}", Process(Action("stop")).ToText());
    m_app.StopAppThread();
    EXPECT_EQ(1, m_log.Count("[INFO] Unlink Daemon"));
    EXPECT_EQ(1U, FerrixdPeer::QueueSize(m_app));
    m_app.StopAppThread();  // once more changes nothing
}

TEST_F(MessageTest, WithoutAThreadAMessageIsNotWaitedFor) {
    EXPECT_TRUE(Process(Action("list_task")).IsNull());
}

}  // namespace
