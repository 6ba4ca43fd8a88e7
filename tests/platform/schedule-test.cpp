#include "platform/schedule.h"

#include <gtest/gtest.h>
#include <json/value.h>

#include <functional>

#include "fake/fake-keld.h"
#include "platform/json-util.h"
#include "support/log-capture.h"

namespace {

constexpr char kApplication[] = "KELD.KDS.Ferrix.Application";
constexpr char kJson[] =
    R"({"minute":30,"hour":4,"week_day":"1,2,5","repeat_date":0,"date_type":0})";

using Lines = std::vector<std::string>;

class ScheduleTest : public testing::Test {
protected:
    int64_t Create(int task_type = 1, const std::string& json = kJson) {
        int64_t id = -1;
        EXPECT_TRUE(CreateSchedule(42, task_type, "my task", true, json, id));
        return id;
    }
    FakeSchedEntry Entry(int64_t id) { return m_fake.SchedEntries().at(static_cast<int>(id)); }
    int Add(const std::string& app, int listable) {
        FakeSchedEntry entry;
        entry.app = app;
        entry.listable = listable;
        return m_fake.AddSchedEntry(entry);
    }
    // What the scheduler was handed for a client's timetable, parsed.
    Json::Value Converted(const std::string& json) {
        Json::Value converted;
        EXPECT_EQ(0, ParseJson(Entry(Create(1, json)).json, converted));
        return converted;
    }
    void ExpectNothingIsHeld() {
        EXPECT_EQ(m_fake.CallCount("KELDSchedTaskAlloc"), m_fake.CallCount("KELDSchedTaskFree"));
    }

    FakeKeld& m_fake = FakeKeld::Reset();
};

// --- Making an entry

TEST_F(ScheduleTest, NewEntryHasEveryFieldOfItsTask) {
    const FakeSchedEntry entry = Entry(Create());
    EXPECT_EQ(kApplication, entry.app);
    EXPECT_EQ("#common:app_name#", entry.app_name);
    EXPECT_EQ("my task", entry.name);
    EXPECT_EQ("#type:icon_import_general#", entry.action);
    EXPECT_EQ("/var/packages/Ferrix/target/bin/ferrix-notifier --execute-task 42", entry.command);
    EXPECT_EQ(1, entry.state);
    EXPECT_EQ(1, entry.can_run_app_same_time);
    EXPECT_EQ(1, entry.can_run_task_same_time);
    EXPECT_EQ(1, entry.can_run_from_ui);
    EXPECT_EQ(0, entry.owner);
    EXPECT_EQ(0, entry.can_edit_name);
    EXPECT_EQ(0, entry.can_edit_owner);
    EXPECT_EQ(0, entry.can_delete_from_ui);
    ExpectNothingIsHeld();
}

TEST_F(ScheduleTest, FieldsAreSetInTheirOrder) {
    Create();
    Lines names;
    for (const FakeCall& call : m_fake.Calls()) names.push_back(call.name);
    EXPECT_EQ((Lines{"KELDSchedTaskAlloc", "KELDSchedTaskConvertFromJson_Schedule",
                     "KELDSchedCTaskSetApp", "KELDSchedCTaskSetAppName", "KELDSchedCTaskSetName",
                     "KELDSchedCTaskSetAction", "KELDSchedCTaskSetCommand",
                     "KELDSchedCTaskSetState", "KELDSchedCTaskSetCanRunAppSameTime",
                     "KELDSchedCTaskSetCanRunTaskSameTime", "KELDSchedCTaskSetCanRunFromUI",
                     "KELDSchedCTaskSetOwner", "KELDSchedCTaskSetCanEditName",
                     "KELDSchedCTaskSetCanEditOwner", "KELDSchedCTaskSetCanDeleteFromUI",
                     "KELDSchedTaskSave", "KELDSchedCTaskGetID", "KELDSchedTaskFree"}),
              names);
}

TEST_F(ScheduleTest, ActionFollowsTheTypeOfTheTaskAndIsEmptyForAnyOther) {
    EXPECT_EQ("#type:icon_import_general#", Entry(Create(1)).action);
    EXPECT_EQ("#type:icon_export_general#", Entry(Create(2)).action);
    EXPECT_EQ("#type:icon_import_photo#", Entry(Create(3)).action);
    for (const int type : {-1, 0, 4}) EXPECT_EQ("", Entry(Create(type)).action) << type;
}

TEST_F(ScheduleTest, TaskWithoutATimetableIsAnEntryInTheDisabledState) {
    int64_t id = -1;
    EXPECT_TRUE(CreateSchedule(UINT64_MAX, 1, "t", false, "{}", id));
    EXPECT_EQ(0, Entry(id).state);
    EXPECT_EQ(
        "/var/packages/Ferrix/target/bin/ferrix-notifier --execute-task "
        "18446744073709551615",
        Entry(id).command);
}

TEST_F(ScheduleTest, NameOfTheTaskPassesUnharmed) {
    int64_t id = -1;
    EXPECT_TRUE(CreateSchedule(1, 1, "it's\n50% \xff", true, kJson, id));
    EXPECT_EQ("it's\n50% \xff", Entry(id).name);
}

TEST_F(ScheduleTest, EveryFailureOfCreateIsToldAndFreesTheEntry) {
    const std::pair<const char*, Lines> cases[] = {
        {"KELDSchedTaskAlloc",                    {"[ERR] KELDSchedTaskAlloc() failed"} },
        {"KELDSchedTaskConvertFromJson_Schedule",
         {"[ERR] KELDSchedTaskConvertFromJson_Schedule() failed, "
          "converted_json[{\"schedule\":{\"min\":null,\"repeat\":null,\"week_name\":null}}]",
          "[ERR] ConvertScheduleJson() failed"}                                         },
        {"KELDSchedTaskSave",                     {"[ERR] KELDSchedTaskSave() failed"}  },
        {"KELDSchedCTaskGetID",                   {"[ERR] KELDSchedCTaskGetID() failed"}},
    };
    for (const auto& [call, lines] : cases) {
        FakeKeld::Reset().FailCall(call);
        const LogCapture log;
        int64_t id = 5;
        EXPECT_FALSE(CreateSchedule(1, 1, "t", true, "{}", id)) << call;
        EXPECT_EQ(lines, log.Lines()) << call;
        EXPECT_EQ(5, id) << call;
        EXPECT_EQ(call == cases[0].first ? 0 : 1, m_fake.CallCount("KELDSchedTaskFree")) << call;
    }
}

TEST_F(ScheduleTest, WhicheverCallOfCreateFailsTheResultIsFalseAndNothingIsHeld) {
    int nth = 1;
    for (;; ++nth) {
        FakeKeld::Reset().FailNthCall(nth);
        int64_t id = 5;
        const bool result = CreateSchedule(1, 1, "t", true, kJson, id);
        if (!m_fake.Failed()) break;
        EXPECT_FALSE(result) << nth;
        EXPECT_EQ(5, id) << nth;
        EXPECT_EQ(nth == 1 ? 0 : 1, m_fake.CallCount("KELDSchedTaskFree")) << nth;
        // Only a failure after the save leaves an entry in the store.
        EXPECT_EQ(nth == 17 ? 1u : 0u, m_fake.SchedEntries().size()) << nth;
    }
    EXPECT_EQ(18, nth);
}

// --- The client's timetable

TEST_F(ScheduleTest, ThreeMembersGetTheirNamesAndAllOthersPass) {
    const Json::Value converted = Converted(
        R"({"minute":30,"week_day":"1,2","repeat_date":3,"hour":4,"min":99,"x":{"minute":1}})");
    Json::Value expected;
    ASSERT_EQ(0, ParseJson(R"({"schedule":{"min":30,"week_name":"1,2","repeat":3,"hour":4,)"
                           R"("x":{"minute":1}}})",
                           expected));
    EXPECT_EQ(expected, converted);
}

TEST_F(ScheduleTest, MissingMembersAreHandedOverAsNull) {
    const Json::Value schedule = Converted(R"({"hour":4})")["schedule"];
    EXPECT_EQ(4, schedule["hour"].asInt());
    for (const char* key : {"min", "week_name", "repeat"}) {
        EXPECT_TRUE(schedule.isMember(key) && schedule[key].isNull()) << key;
    }
    for (const char* key : {"minute", "week_day", "repeat_date"}) {
        EXPECT_FALSE(schedule.isMember(key)) << key;
    }
}

TEST_F(ScheduleTest, TextOfTheConverterIsAsciiOnOneLine) {
    const std::string text = Entry(Create(1, "{\"a\xc3\xbc\":\"\xff\\n\"}")).json;
    for (const signed char c : text) ASSERT_GE(c, 0x20) << text;
}

TEST_F(ScheduleTest, TextThatIsNoJsonObjectIsRefused) {
    const std::string texts[] = {
        "",    "nonsense", "{", "[1]", "7", "\"text\"", "null", "{} x", std::string(100000, '['),
        "%s%n"};
    for (const std::string& text : texts) {
        FakeKeld::Reset();
        const LogCapture log;
        int64_t id = 5;
        EXPECT_FALSE(CreateSchedule(1, 1, "t", true, text, id)) << text;
        EXPECT_EQ(0, m_fake.CallCount("KELDSchedTaskConvertFromJson_Schedule")) << text;
        EXPECT_TRUE(m_fake.SchedEntries().empty()) << text;
        if (text.size() < 100) {
            EXPECT_EQ((Lines{"[ERR] parse json[" + text + "] failed",
                             "[ERR] ConvertScheduleJson() failed"}),
                      log.Lines());
        }
        ExpectNothingIsHeld();
    }
}

// --- Changing an entry

TEST_F(ScheduleTest, UpdateChangesStateAndTimetableOnly) {
    const int64_t id = Create(2);
    FakeSchedEntry expected = Entry(id);
    m_fake.ForgetCalls();
    EXPECT_TRUE(UpdateSchedule(id, false, R"({"minute":1})"));
    const FakeSchedEntry entry = Entry(id);
    EXPECT_EQ(0, entry.state);
    EXPECT_NE(expected.json, entry.json);
    EXPECT_EQ(expected.action, entry.action);
    EXPECT_EQ(expected.command, entry.command);
    EXPECT_EQ(expected.name, entry.name);
    EXPECT_EQ(1u, m_fake.SchedEntries().size());
    ExpectNothingIsHeld();
}

TEST_F(ScheduleTest, UpdateOfTheNameChangesTheNameOnly) {
    const int64_t id = Create();
    const FakeSchedEntry before = Entry(id);
    m_fake.ForgetCalls();
    EXPECT_TRUE(UpdateScheduleName(id, "new name"));
    EXPECT_EQ("new name", Entry(id).name);
    EXPECT_EQ(before.json, Entry(id).json);
    EXPECT_EQ(before.state, Entry(id).state);
    ExpectNothingIsHeld();
}

TEST_F(ScheduleTest, ScheduleOfMinusOneIsPassedToTheScheduler) {
    const LogCapture log;
    EXPECT_FALSE(UpdateScheduleName(-1, "name"));
    EXPECT_EQ((std::vector<Lines>{{"-1"}}), m_fake.CallsOf("KELDSchedTaskLoad"));
    EXPECT_EQ(Lines{"[ERR] KELDSchedTaskLoad() failed."}, log.Lines());
    ExpectNothingIsHeld();
}

TEST_F(ScheduleTest, IdThatNoEntryCanHaveIsNotTakenForAnother) {
    const int64_t id = Create();
    const int64_t beyond = (int64_t{1} << 32) + id;
    const LogCapture log;
    EXPECT_FALSE(UpdateScheduleName(beyond, "other"));
    EXPECT_FALSE(UpdateSchedule(beyond, false, "{}"));
    EXPECT_EQ(2, log.Count("[ERR] KELDSchedTaskLoad() failed."));
    EXPECT_EQ("my task", Entry(id).name);
    EXPECT_EQ(1, Entry(id).state);
}

TEST_F(ScheduleTest, EveryFailureOfAnUpdateIsTold) {
    const int64_t id = Create();
    const std::pair<const char*, Lines> cases[] = {
        {"KELDSchedTaskAlloc", {"[ERR] KELDSchedTaskAlloc() failed."}},
        {"KELDSchedTaskLoad",  {"[ERR] KELDSchedTaskLoad() failed."} },
        {"KELDSchedTaskSave",  {"[ERR] KELDSchedTaskSave() failed."} },
    };
    for (const auto& [call, lines] : cases) {
        const std::function<bool()> updates[] = {[&] { return UpdateSchedule(id, false, "{}"); },
                                                 [&] { return UpdateScheduleName(id, "n"); }};
        for (const auto& update : updates) {
            m_fake.FailCall(call);
            const LogCapture log;
            EXPECT_FALSE(update()) << call;
            EXPECT_EQ(lines, log.Lines()) << call;
        }
    }
    const LogCapture log;
    EXPECT_FALSE(UpdateSchedule(id, false, "nonsense"));
    EXPECT_EQ((Lines{"[ERR] parse json[nonsense] failed", "[ERR] ConvertScheduleJson() failed."}),
              log.Lines());
    EXPECT_EQ(1, Entry(id).state);
    EXPECT_EQ("my task", Entry(id).name);
}

TEST_F(ScheduleTest, WhicheverCallOfAnUpdateFailsTheStoreStaysAndNothingIsHeld) {
    const std::function<bool(int64_t)> updates[] = {
        [](int64_t id) { return UpdateSchedule(id, false, "{}"); },
        [](int64_t id) { return UpdateScheduleName(id, "n"); }};
    const int calls[] = {5, 4};
    for (size_t i = 0; i < std::size(updates); ++i) {
        int nth = 1;
        for (;; ++nth) {
            FakeKeld::Reset();
            const int64_t id = Create();
            m_fake.ForgetCalls();
            m_fake.FailNthCall(nth);
            const bool result = updates[i](id);
            if (!m_fake.Failed()) break;
            EXPECT_FALSE(result) << nth;
            EXPECT_EQ(1, Entry(id).state) << nth;
            EXPECT_EQ("my task", Entry(id).name) << nth;
            EXPECT_EQ(nth == 1 ? 0 : 1, m_fake.CallCount("KELDSchedTaskFree")) << nth;
        }
        EXPECT_EQ(calls[i] + 1, nth);
    }
}

// --- All entries of the package

TEST_F(ScheduleTest, HidingAndShowingTouchesEntriesOfThePackageThatDiffer) {
    const int shown = Add(kApplication, 1);
    const int hidden = Add(kApplication, 0);
    const int other = Add("KELD.KDS.Ferrix.Application.Other", 1);
    const int longer = Add(kApplication + std::string(600, 'x'), 1);
    EXPECT_TRUE(HideAllSchedule());
    EXPECT_EQ(0, Entry(shown).listable);
    EXPECT_EQ(0, Entry(hidden).listable);
    EXPECT_EQ(1, Entry(other).listable);
    EXPECT_EQ(1, Entry(longer).listable);
    EXPECT_EQ((std::vector<Lines>{{std::to_string(shown)}}), m_fake.CallsOf("KELDSchedTaskSave"));
    EXPECT_TRUE(ShowAllSchedule());
    EXPECT_EQ(1, Entry(shown).listable);
    EXPECT_EQ(1, Entry(hidden).listable);
}

TEST_F(ScheduleTest, WithoutEntriesAllThreeSucceed) {
    EXPECT_TRUE(HideAllSchedule());
    EXPECT_TRUE(ShowAllSchedule());
    EXPECT_TRUE(RemoveAllSchedule());
}

TEST_F(ScheduleTest, ListThatCannotBeReadIsAFailure) {
    for (bool (*const operation)() : {HideAllSchedule, ShowAllSchedule, RemoveAllSchedule}) {
        FakeKeld::Reset();
        Add(kApplication, 1);
        m_fake.FailCall("KELDSchedTaskListGet");
        EXPECT_FALSE(operation());
        EXPECT_EQ(1u, m_fake.SchedEntries().size());
    }
}

TEST_F(ScheduleTest, FailureOnOneEntryDoesNotStopTheOthers) {
    for (const char* call : {"KELDSchedCTaskSetListable", "KELDSchedTaskSave"}) {
        FakeKeld::Reset();
        const int first = Add(kApplication, 1);
        const int second = Add(kApplication, 1);
        m_fake.FailCall(call);
        EXPECT_FALSE(HideAllSchedule()) << call;
        EXPECT_EQ(1, Entry(first).listable) << call;
        EXPECT_EQ(0, Entry(second).listable) << call;
        EXPECT_EQ(1, m_fake.CallCount("KELDSchedTaskListFree")) << call;
    }
}

TEST_F(ScheduleTest, RemovingTakesAwayEntriesOfThePackageAlone) {
    Add(kApplication, 1);
    const int other = Add("other", 1);
    Add(kApplication, 0);
    EXPECT_TRUE(RemoveAllSchedule());
    EXPECT_EQ(1u, m_fake.SchedEntries().size());
    EXPECT_TRUE(m_fake.SchedEntries().contains(other));
    EXPECT_EQ(1, m_fake.CallCount("KELDSchedTaskListFree"));
}

TEST_F(ScheduleTest, EntryThatCannotBeRemovedDoesNotStopTheOthers) {
    for (const char* call : {"KELDSchedCTaskGetID", "KELDSchedTaskRemove"}) {
        FakeKeld::Reset();
        const int first = Add(kApplication, 1);
        Add(kApplication, 1);
        m_fake.FailCall(call);
        EXPECT_FALSE(RemoveAllSchedule()) << call;
        EXPECT_EQ(1u, m_fake.SchedEntries().size()) << call;
        EXPECT_TRUE(m_fake.SchedEntries().contains(first)) << call;
    }
}

}  // namespace
