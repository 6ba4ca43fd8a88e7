// "set_trigger_time_setting".
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "command-fixture.h"
#include "db/log-description.h"
#include "db/task-db.h"
#include "processor/task-entry-handler.h"

using testing::ElementsAre;
using testing::HasSubstr;

namespace {

constexpr char WEEKLY[] = R"({"date_type":0,"week_day":"1","repeat_date":0,"hour":3,"minute":7})";

class TriggerTest : public CommandTest {
protected:
    TriggerTest() {
        PlugIn("a", "u-1");
        m_task_id = AddTask("a", "u-1");  // does not run when plugged in, ejects when done
        m_log.Clear();
    }
    PObject Request(bool runs, bool ejects, bool is_scheduled = false,
                    const std::string& schedule = "{}") const {
        PObject request = ForTask(m_task_id);
        request["run_when_plug_in"] = runs;
        request["eject_when_task_done"] = ejects;
        request["schedule_enabled"] = is_scheduled;
        request["schedule_json_str"] = schedule;
        return request;
    }
    PObject Set(const PObject& request) { return Send("set_trigger_time_setting", request); }
    USBInfo Row() { return Devices().front(); }
    USBRunInfo LiveUSB() {
        USBRunInfo usb;
        EXPECT_EQ(0, TaskEntryHandler::GetInstance().GetUSBEntry(Row().id, usb));
        return usb;
    }
    FakeSchedEntry Schedule() { return m_fake.SchedEntries().begin()->second; }
    void ForgetSchedule() {
        TaskInfo task = Task(m_task_id);
        task.schedule_id = -1;
        ASSERT_EQ(0, TaskDB::GetInstance().UpdateTaskInfo(task));
    }

    uint64_t m_task_id = 0;
};

TEST_F(TriggerTest, BothFlagsReachTheRowAndTheEntry) {
    const PObject response = Set(Request(true, false));
    EXPECT_EQ("{\"schedule_id\": 1}", response.ToText());
    EXPECT_TRUE(Row().run_when_plug_in);
    EXPECT_FALSE(Row().eject_when_task_done);
    EXPECT_TRUE(LiveUSB().run_when_plug_in);
    EXPECT_FALSE(LiveUSB().eject_when_task_done);
    EXPECT_EQ("u-1", LiveUSB().uuid);
    EXPECT_EQ(MountPath("a"), LiveUSB().usb_share_path);
    EXPECT_TRUE(m_log.Has("[INFO] Set Task '1' Trigger Time"));
}

TEST_F(TriggerTest, TheTimetableIsChanged) {
    Set(Request(false, true, true, WEEKLY));
    EXPECT_EQ(1, Schedule().state);
    EXPECT_THAT(Schedule().json, HasSubstr("\"week_name\":\"1\""));
    EXPECT_THAT(Schedule().json, HasSubstr("\"min\":7"));
    EXPECT_EQ("My task", Schedule().name);
    Set(Request(false, true, false, WEEKLY));
    EXPECT_EQ(0, Schedule().state);
}

TEST_F(TriggerTest, ALogRowNamesTheTask) {
    Set(Request(true, true));
    EXPECT_THAT(LogTexts(LogDescription::LOG_DESC_TASK_SETTING_CHANGED),
                ElementsAre("[\"My task\"]"));
}

// The asymmetry is wanted: the row wins at the next load.
TEST_F(TriggerTest, ARequestWithOneKeyClearsTheOtherFlagInTheEntryWhileTheRowKeepsIt) {
    PObject request = Request(true, false);
    request.AsMap().erase("eject_when_task_done");
    ASSERT_THAT(Set(request), IsSuccess());
    EXPECT_TRUE(Row().run_when_plug_in);
    EXPECT_TRUE(Row().eject_when_task_done);
    EXPECT_TRUE(LiveUSB().run_when_plug_in);
    EXPECT_FALSE(LiveUSB().eject_when_task_done);
    ASSERT_EQ(0, PreUnmount("a"));
    ASSERT_EQ(0, PostMount("a"));
    EXPECT_TRUE(LiveUSB().eject_when_task_done);
}

TEST_F(TriggerTest, TheOtherKeyAloneClearsTheFirstFlagInTheEntry) {
    ASSERT_THAT(Set(Request(true, true)), IsSuccess());
    PObject request = Request(true, false);
    request.AsMap().erase("run_when_plug_in");
    ASSERT_THAT(Set(request), IsSuccess());
    EXPECT_TRUE(Row().run_when_plug_in);
    EXPECT_FALSE(Row().eject_when_task_done);
    EXPECT_FALSE(LiveUSB().run_when_plug_in);
    EXPECT_FALSE(LiveUSB().eject_when_task_done);
}

TEST_F(TriggerTest, FlagsThatDoNotDifferTouchNeitherRowNorEntry) {
    USBRunInfo usb = LiveUSB();
    usb.eject_when_task_done = false;  // differs from the row, as after a request with one key
    TaskEntryHandler::GetInstance().AddUSBEntry(usb);
    BreakTable("usb_info_table", "UPDATE");
    EXPECT_THAT(Set(Request(false, true)), IsSuccess());
    EXPECT_FALSE(LiveUSB().eject_when_task_done);
    PObject neither = Request(false, true);
    neither.AsMap().erase("run_when_plug_in");
    neither.AsMap().erase("eject_when_task_done");
    EXPECT_THAT(Set(neither), IsSuccess());
    EXPECT_TRUE(Row().eject_when_task_done);
    EXPECT_EQ(2u, LogRows(LogDescription::LOG_DESC_TASK_SETTING_CHANGED));
}

TEST_F(TriggerTest, AnUnpluggedDeviceTakesTheFlagsAtItsNextMount) {
    ASSERT_EQ(0, PreUnmount("a"));
    EXPECT_THAT(Set(Request(true, false)), IsSuccess());
    EXPECT_TRUE(m_log.Has("[INFO] USB '1' dose not mount"));
    ASSERT_EQ(0, PostMount("a"));
    EXPECT_TRUE(LiveUSB().run_when_plug_in);
    EXPECT_FALSE(LiveUSB().eject_when_task_done);
}

TEST_F(TriggerTest, WithoutAScheduleTheFlagsAreSetAndTheTimetableIsIgnored) {
    ForgetSchedule();
    const PObject response = Set(Request(true, false, true, "no timetable"));
    EXPECT_THAT(response, IsSuccess());
    EXPECT_EQ(-1, response["schedule_id"].AsInt64());
    EXPECT_TRUE(Row().run_when_plug_in);
    EXPECT_EQ(1u, m_fake.SchedEntries().size());
    EXPECT_EQ(0, Schedule().state);
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_TASK_SETTING_CHANGED));
}

TEST_F(TriggerTest, WithoutATaskIdOrForAnUnknownTaskItIsRefused) {
    EXPECT_THAT(Set(PObject()), IsError(1, "Invalid parameter"));
    EXPECT_TRUE(m_log.Has("[ERR] Invalid parameter"));
    EXPECT_THAT(Set(ForTask(99)), IsError(6, "Task id does not exist"));
    EXPECT_THAT(Set(ForTask(0)), IsError(6, "Task id does not exist"));
}

TEST_F(TriggerTest, ATaskWhoseDeviceHasNoRowIsRefused) {
    TaskInfo task = Task(m_task_id);
    task.usb_id = 77;
    task.schedule_id = -1;
    uint64_t orphan = 0;
    ASSERT_EQ(0, TaskDB::GetInstance().AddTaskInfo(task, orphan));
    EXPECT_THAT(Set(ForTask(orphan)), IsError(5, "USB id does not exist"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get usb info for usb id '77'"));
    EXPECT_TRUE(
        m_log.Has("[ERR] Failed to set usb info for task '" + std::to_string(orphan) + "'"));
}

TEST_F(TriggerTest, ARowThatCannotBeWrittenIsAFailureAndTheEntryStays) {
    BreakTable("usb_info_table", "UPDATE");
    EXPECT_THAT(Set(Request(true, false)), IsError(2, "Failed to update usb info"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to update usb info for '1"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set usb info for task '1'"));
    EXPECT_FALSE(LiveUSB().run_when_plug_in);
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_TASK_SETTING_CHANGED));
}

TEST_F(TriggerTest, ATimetableThatIsNoneFailsAfterTheFlagsAreSet) {
    for (const char* schedule : {"", "{broken", "[]", "7"}) {
        EXPECT_THAT(Set(Request(true, false, true, schedule)),
                    IsError(11, "Failed to UpdateScheduleContent"))
            << schedule;
        EXPECT_TRUE(m_log.Has("[ERR] Failed to update schedule [" + std::string(schedule) + "]"));
    }
    EXPECT_TRUE(Row().run_when_plug_in);
    EXPECT_EQ(0, Schedule().state);
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_TASK_SETTING_CHANGED));
}

// A client sends its timetable with every request.
TEST_F(TriggerTest, WithoutTheTimetablesKeysATaskThatHasOneFails) {
    PObject request = ForTask(m_task_id);
    request["run_when_plug_in"] = true;
    request["eject_when_task_done"] = true;
    EXPECT_THAT(Set(request), IsError(11, "Failed to UpdateScheduleContent"));
    EXPECT_TRUE(Row().run_when_plug_in);
}

TEST_F(TriggerTest, ALogRowThatCannotBeAddedIsAFailure) {
    BreakTable("log_info_table", "INSERT");
    EXPECT_THAT(Set(Request(true, false)), IsError(2, "Failed to add log info to log db"));
    EXPECT_TRUE(Row().run_when_plug_in);
    EXPECT_FALSE(m_log.Contains("Trigger Time"));
}

TEST_F(TriggerTest, FlagsOfOtherKindsAreReadByTheirOwnRule) {
    PObject request = Request(false, true);
    request["run_when_plug_in"] = "false";       // a text is true when it is not empty
    request["eject_when_task_done"] = List({});  // a list is true when it is not empty
    EXPECT_THAT(Set(request), IsSuccess());
    EXPECT_TRUE(Row().run_when_plug_in);
    EXPECT_FALSE(Row().eject_when_task_done);
    request["run_when_plug_in"] = PObject();
    request["eject_when_task_done"] = -7;
    EXPECT_THAT(Set(request), IsSuccess());
    EXPECT_FALSE(Row().run_when_plug_in);
    EXPECT_TRUE(Row().eject_when_task_done);
}

}  // namespace
