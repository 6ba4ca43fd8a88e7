// "ferrixctl task set", "trigger" and "show", from the command line to what the daemon is asked.
#include <json/value.h>

#include "client/ctl-fixture.h"
#include "client/timetable.h"
#include "db/task-info.h"
#include "utils/error-code.h"

using testing::HasSubstr;
using testing::Not;

namespace {

constexpr int SCHEDULE = 12;
constexpr int NO_SCHEDULE = -1;

PObject Task(const char* name, int type, int strategy) {
    PObject task;
    task["id"] = 3;
    task["type"] = type;
    task["task_name"] = name;
    task["copy_strategy"] = strategy;
    task["uuid"] = "stick-01";
    task["source_path"] = type == TASK_TYPE_EXPORT_GENERAL ? "/photos/out" : "/";
    task["destination_path"] = type == TASK_TYPE_EXPORT_GENERAL ? "/old" : "/photos/in";
    task["schedule_id"] = SCHEDULE;
    task["run_when_plug_in"] = 1;
    task["eject_when_task_done"] = 1;
    task["max_version_count"] = 100;
    return task;
}

PObject Import(int strategy) { return Task("Camera", TASK_TYPE_IMPORT_GENERAL, strategy); }
PObject Export() { return Task("Backup", TASK_TYPE_EXPORT_GENERAL, COPY_STRATEGY_MIRROR); }

class CtlTaskChangeTest : public CtlTest {
protected:
    // The status of a command about the only task; what the daemon was asked is in m_requests.
    int RunOn(const PObject& task, const std::string& command, const std::string& options = "") {
        TaskDaemon daemon(m_socket, {task});
        const int status = Run("task " + command + " 3 " + options);
        m_requests = daemon.Requests();
        return status;
    }
    PObject Asked(const PObject& task, const std::string& command, const std::string& options) {
        EXPECT_EQ(EXIT_DONE, RunOn(task, command, options)) << m_errors;
        EXPECT_EQ(1U, m_requests.size());
        return m_requests.empty() ? PObject() : m_requests.front();
    }

    std::vector<PObject> m_requests;
};

}  // namespace

TEST_F(CtlTaskChangeTest, SettingsOfAnotherStrategyAreRefused) {
    for (const char* options : {"--versions 5", "--all-versions", "--rotation smart"}) {
        EXPECT_EQ(EXIT_USAGE, RunOn(Import(COPY_STRATEGY_INCREMENTAL), "set", options));
        EXPECT_THAT(m_errors, HasSubstr("this is incremental"));
        EXPECT_EQ(EXIT_USAGE, RunOn(Export(), "set", options)) << options;
        EXPECT_TRUE(m_requests.empty());
    }
    for (const char* word : {"--rename", "--no-rename", "--date-folders", "--flat", "--move"}) {
        EXPECT_EQ(EXIT_USAGE, RunOn(Import(COPY_STRATEGY_MIRROR), "set", word)) << word;
        EXPECT_EQ(EXIT_USAGE, RunOn(Import(COPY_STRATEGY_VERSION), "set", word)) << word;
        EXPECT_TRUE(m_requests.empty());
        EXPECT_EQ(EXIT_DONE, RunOn(Import(COPY_STRATEGY_INCREMENTAL), "set", word)) << m_errors;
    }
}

TEST_F(CtlTaskChangeTest, ARotationNeedsANumberOfVersions) {
    PObject task = Import(COPY_STRATEGY_VERSION);
    task["enable_rotation"] = 0;
    EXPECT_EQ(EXIT_USAGE, RunOn(task, "set", "--rotation oldest"));
    EXPECT_THAT(m_errors, HasSubstr("3 Camera keeps all its versions: say with --versions"));
    EXPECT_TRUE(m_requests.empty());
    const PObject both = Asked(task, "set", "--rotation oldest --versions 9");
    EXPECT_TRUE(both["enable_rotation"].AsBool());
    EXPECT_EQ(9U, both["max_version_count"].AsUInt64());
    task["enable_rotation"] = 1;
    const PObject rotated = Asked(task, "set", "--rotation oldest");
    EXPECT_EQ(int{ROTATION_POLICY_OLDEST}, rotated["rotation_policy"].AsInt32());
    EXPECT_TRUE(rotated["enable_rotation"].AsBool());
    EXPECT_FALSE(rotated.HasMember("max_version_count")) << "it stays";
}

TEST_F(CtlTaskChangeTest, TheDestinationOfAnExportIsAFolderOfTheDevice) {
    for (const std::string& to :
         {std::string("new/one"), std::string("/new/one/"), m_stick + "/new/one"}) {
        const PObject asked = Asked(Export(), "set", "--to " + to);
        EXPECT_EQ("/new/one", asked["usb_folder_path"].AsString()) << to;
        EXPECT_EQ(int{TASK_TYPE_EXPORT_GENERAL}, asked["task_type"].AsInt32());
        EXPECT_FALSE(asked.HasMember("hub_share_name"));
    }
    EXPECT_FALSE(Asked(Export(), "set", "--name Other").HasMember("usb_folder_path"));
    FakeKeld::Get().Unmount(m_stick);
    EXPECT_EQ("/new", Asked(Export(), "set", "--to new")["usb_folder_path"].AsString());
    EXPECT_EQ(EXIT_USAGE, RunOn(Export(), "set", "--to ../new"));
}

TEST_F(CtlTaskChangeTest, TheDestinationOfAnImportIsSentWithEveryChange) {
    const PObject renamed = Asked(Import(COPY_STRATEGY_MIRROR), "set", "--name Other");
    EXPECT_EQ("photos", renamed["hub_share_name"].AsString());
    EXPECT_EQ("/in", renamed["hub_folder_path"].AsString());
    const PObject moved = Asked(Import(COPY_STRATEGY_MIRROR), "set", "--to " + m_share + "/x");
    EXPECT_EQ("photos", moved["hub_share_name"].AsString());
    EXPECT_EQ("/x", moved["hub_folder_path"].AsString());
}

TEST_F(CtlTaskChangeTest, TheTimetableOfNowIsSentAgain) {
    FakeBoxAdmin::Get().timetables[SCHEDULE] = MakeTimetable("02:30", {"mon"});
    const PObject asked = Asked(Import(COPY_STRATEGY_MIRROR), "trigger", "--not-on-plug-in");
    EXPECT_FALSE(asked["run_when_plug_in"].AsBool());
    EXPECT_TRUE(asked["eject_when_task_done"].AsBool()) << "what is not named stays";
    EXPECT_TRUE(asked["schedule_enabled"].AsBool());
    EXPECT_EQ(ScheduleText(MakeTimetable("02:30", {"mon"})), asked["schedule_json_str"].AsString());
    FakeBoxAdmin::Reset();
    EXPECT_EQ(EXIT_USAGE, RunOn(Import(COPY_STRATEGY_MIRROR), "trigger", "--not-on-plug-in"));
    EXPECT_THAT(m_errors, HasSubstr("--no-timetable"));
}

TEST_F(CtlTaskChangeTest, ATaskWithoutATimetableKeepsNone) {
    PObject task = Import(COPY_STRATEGY_MIRROR);
    task["schedule_id"] = NO_SCHEDULE;
    const PObject asked = Asked(task, "trigger", "--no-eject");
    EXPECT_FALSE(asked["eject_when_task_done"].AsBool());
    EXPECT_TRUE(asked["run_when_plug_in"].AsBool());
    EXPECT_FALSE(asked["schedule_enabled"].AsBool());
    EXPECT_EQ("{}", asked["schedule_json_str"].AsString());
    EXPECT_EQ(EXIT_REFUSED, RunOn(task, "trigger", "--at 02:30"));
    EXPECT_THAT(m_errors, HasSubstr("remove the task and add it again"));
    EXPECT_THAT(m_errors, Not(HasSubstr("comes with the box")));
    EXPECT_TRUE(m_requests.empty());
    EXPECT_EQ(EXIT_USAGE, RunOn(task, "trigger"));
    EXPECT_EQ(EXIT_USAGE, RunOn(task, "trigger", "--days mon"));
}

TEST_F(CtlTaskChangeTest, ATaskThatComesWithTheBoxHasNoTimetable) {
    PObject task = Import(COPY_STRATEGY_MIRROR);
    task["schedule_id"] = NO_SCHEDULE;
    task["is_default_task"] = 1;
    EXPECT_FALSE(Asked(task, "trigger", "--not-on-plug-in")["run_when_plug_in"].AsBool());
    EXPECT_EQ(EXIT_REFUSED, RunOn(task, "trigger", "--at 02:30"));
    EXPECT_THAT(m_errors, HasSubstr("comes with the box"));
    EXPECT_TRUE(m_requests.empty());
}

TEST_F(CtlTaskChangeTest, AFailureIsShownInWords) {
    PObject task = Import(COPY_STRATEGY_MIRROR);
    task["task_status"] = "failed";
    task["error_code"] = int{ERR_SRC_ROOT_MISS};
    ASSERT_EQ(EXIT_DONE, RunOn(task, "show")) << m_errors;
    EXPECT_THAT(m_output, HasSubstr("failed: the source folder does not exist\n"));
}

TEST_F(CtlTaskChangeTest, ADeviceIsShownByWhatIsKnownOfIt) {
    PObject task = Import(COPY_STRATEGY_MIRROR);
    ASSERT_EQ(EXIT_DONE, RunOn(task, "show")) << m_errors;
    EXPECT_THAT(m_output, Not(HasSubstr("Device")));
    task["product"] = "Stick";
    ASSERT_EQ(EXIT_DONE, RunOn(task, "show")) << m_errors;
    EXPECT_THAT(m_output, HasSubstr("Device          Stick\n"));
    task["producer"] = "Maker\033[2J";
    ASSERT_EQ(EXIT_DONE, RunOn(task, "show")) << m_errors;
    EXPECT_THAT(m_output, HasSubstr("Device          Maker\\x1b[2J Stick\n"));
}
