// "set_task_setting" and "get_task_setting": what is changed and what is logged.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "db/task-db.h"
#include "setting-fixture.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

// --- What may be changed

TEST_F(SettingTest, EveryKeyOfAnImportReachesItsColumnAndNoOther) {
    TaskInfo expected = Task(m_task_id);
    const std::vector<std::pair<Keys, std::function<void()>>> changes = {
        {{{"hub_share_name", "music"}},                             [&] { expected.hub_share_name = "music"; }    },
        {{{"hub_share_name", "music"}, {"hub_folder_path", "/in"}},
         [&] { expected.hub_folder_path = "/in"; }                                                                },
        {{{"task_name", "New"}},                                    [&] { expected.task_name = "New"; }           },
        {{{"keep_dir_structure", false}},                           [&] { expected.keep_dir_structure = false; }  },
        {{{"smart_create_date_dir", true}},                         [&] { expected.smart_create_date_dir = true; }},
        {{{"rename_photo_video", true}},                            [&] { expected.rename_photo_video = true; }   },
        {{{"remove_src_file", true}},                               [&] { expected.remove_src_file = true; }      },
        {{{"conflict_policy", 1}},                                  [&] { expected.conflict_policy = 1; }         },
        {{{"enable_rotation", true}},                               [&] { expected.enable_rotation = true; }      },
        {{{"max_version_count", uint64_t{1} << 40}},
         [&] { expected.max_version_count = uint64_t{1} << 40; }                                                  },
        {{{"rotation_policy", 2}},                                  [&] { expected.rotation_policy = 2; }         },
    };
    AddShare("music");
    m_dir.MakeDir("v1/music/in");
    for (const auto& [keys, change] : changes) {
        change();
        PObject request = Import(keys);
        // What was changed before is sent as it is by now.
        request["hub_share_name"] = expected.hub_share_name;
        request["hub_folder_path"] = expected.hub_folder_path;
        EXPECT_EQ("null", Set(request).ToText()) << keys.begin()->first;
        EXPECT_EQ(expected, Task(m_task_id)) << keys.begin()->first;
    }
    EXPECT_TRUE(m_log.Has("[INFO] Set Task '1' Setting"));
}

TEST_F(SettingTest, AllKeysAtOnce) {
    TaskInfo expected = Task(m_task_id);
    expected.hub_folder_path = "/in";
    expected.task_name = "New";
    expected.keep_dir_structure = false;
    expected.smart_create_date_dir = true;
    expected.rename_photo_video = true;
    expected.remove_src_file = true;
    expected.conflict_policy = 1;
    expected.enable_rotation = true;
    expected.max_version_count = 3;
    expected.rotation_policy = 2;
    EXPECT_THAT(Set(Import({
                    {"hub_folder_path",       "/in"},
                    {"task_name",             "New"},
                    {"keep_dir_structure",    false},
                    {"smart_create_date_dir", true },
                    {"rename_photo_video",    true },
                    {"remove_src_file",       true },
                    {"conflict_policy",       1    },
                    {"enable_rotation",       true },
                    {"max_version_count",     3    },
                    {"rotation_policy",       2    }
    })),
                IsSuccess());
    EXPECT_EQ(expected, Task(m_task_id));
}

TEST_F(SettingTest, WhatCannotBeChangedStays) {
    const TaskInfo before = Task(m_task_id);
    EXPECT_THAT(Set(Import({
                    {"usb_id",           77   },
                    {"copy_strategy",    1    },
                    {"last_copied_time", 77   },
                    {"schedule_id",      77   },
                    {"is_enable",        false},
                    {"error",            -3   },
                    {"usb_folder_path",  "/in"}, // the source side of an import
    })),
                IsSuccess());
    EXPECT_EQ(before, Task(m_task_id));
}

TEST_F(SettingTest, AnExportChangesItsFolderOnTheDeviceAlone) {
    const uint64_t task_id = AddExport();
    TaskInfo expected = Task(task_id);
    expected.usb_folder_path = "/backup";
    EXPECT_THAT(Set(Export(task_id,
                           {
                               {"usb_folder_path", "/backup"},
                               {"hub_share_name",  "music"  },
                               {"hub_folder_path", "/in"    }
    })),
                IsSuccess());
    EXPECT_EQ(expected, Task(task_id));
}

TEST_F(SettingTest, AnAbsentKeyLeavesTheValueAlone) {
    const TaskInfo before = Task(m_task_id);
    EXPECT_THAT(Set(Import({})), IsSuccess());
    EXPECT_EQ(before, Task(m_task_id));
}

TEST_F(SettingTest, AnEmptyTextLeavesTheValueAlone) {
    const TaskInfo before = Task(m_task_id);
    EXPECT_THAT(Set(Import({
                    {"task_name",       ""},
                    {"hub_folder_path", ""}
    })),
                IsSuccess());
    EXPECT_EQ(before, Task(m_task_id));
    const uint64_t task_id = AddExport();
    EXPECT_THAT(Set(Export(task_id,
                           {
                               {"usb_folder_path", ""}
    })),
                IsSuccess());
    EXPECT_EQ("/", Task(task_id).usb_folder_path);
}

TEST_F(SettingTest, UnchangedValuesWriteNothingButTheLogRow) {
    BreakTable("task_info_table", "UPDATE");
    EXPECT_THAT(Set(Import({
                    {"task_name",         "My task"},
                    {"conflict_policy",   2        },
                    {"max_version_count", 256      }
    })),
                IsSuccess());
    EXPECT_THAT(Changes(), ElementsAre("[\"My task\"]"));
    EXPECT_EQ(0, m_fake.CallCount("KELDSchedTaskSave"));
}

// --- The log rows

TEST_F(SettingTest, ARenameIsLoggedWithBothNames) {
    EXPECT_THAT(Set(Import({
                    {"task_name", "New"}
    })),
                IsSuccess());
    EXPECT_THAT(LogTexts(LogDescription::LOG_DESC_TASK_RENAMED),
                ElementsAre("[\"My task\",\"New\"]"));
    EXPECT_THAT(Changes(), ElementsAre("[\"New\"]"));
}

TEST_F(SettingTest, WithoutANameTheStoredOneIsLogged) {
    EXPECT_THAT(Set(Import({
                    {"conflict_policy", 1}
    })),
                IsSuccess());
    EXPECT_THAT(Changes(), ElementsAre("[\"My task\"]"));
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_TASK_RENAMED));
}

// It looks like a mistake and is wanted: the log tells what was sent.
TEST_F(SettingTest, AnEmptyNameIsLoggedAsSentAlthoughTheOldOneStays) {
    EXPECT_THAT(Set(Import({
                    {"task_name", ""}
    })),
                IsSuccess());
    EXPECT_EQ("My task", Task(m_task_id).task_name);
    EXPECT_THAT(Changes(), ElementsAre("[\"\"]"));
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_TASK_RENAMED));
}

TEST_F(SettingTest, NamesOfAnyBytesSurvive) {
    for (const std::string& name :
         {std::string("new\nline"), std::string("quote'\"\\"), std::string("100%s%n"),
          std::string("caf\xc3\xa9"), std::string("\xff\xfe"), std::string(60000, 'x')}) {
        EXPECT_THAT(Set(Import({
                        {"task_name", name}
        })),
                    IsSuccess());
        EXPECT_EQ(name, Task(m_task_id).task_name);
        EXPECT_EQ(name, Get()["task_name"].AsString());
    }
}

// --- Rules that look like mistakes and are wanted

TEST_F(SettingTest, AnImportThatDoesNotSendItsThreeKeysFails) {
    const TaskInfo before = Task(m_task_id);
    PObject request = Import({
        {"task_name", "New"}
    });
    request.AsMap().erase("hub_share_name");
    EXPECT_THAT(Set(request), IsError(11, "Failed to resolve import destination path."));
    EXPECT_TRUE(m_log.Has("[ERR] CheckImportDestPath() failed"));
    // Without the type the request passes for an import, the kind of the lowest number.
    request = ForTask(m_task_id);
    request["task_name"] = "New";
    EXPECT_THAT(Set(request), IsError(11, "Failed to resolve import destination path."));
    EXPECT_EQ(before, Task(m_task_id));
    EXPECT_THAT(Changes(), IsEmpty());
}

TEST_F(SettingTest, AnImportWithoutItsFolderIsCheckedForTheSharesRoot) {
    PObject request = Import({
        {"hub_folder_path", "/in"}
    });
    ASSERT_THAT(Set(request), IsSuccess());
    PlugIn("b", "u-2");
    PObject other = AddRequest("b", "u-2");
    other["hub_folder_path"] = "/other";
    ASSERT_THAT(Send("add_task", other), IsSuccess());
    request["task_name"] = "New";
    request.AsMap().erase("hub_folder_path");
    EXPECT_THAT(Set(request), IsError(9, "Duplicated destination path"));
}

TEST_F(SettingTest, AnExportThatDoesNotSendItsTypeFails) {
    const uint64_t task_id = AddExport();
    PObject request = ForTask(task_id);
    request["task_name"] = "New";
    EXPECT_THAT(Set(request), IsError(11, "Failed to resolve import destination path."));
    request["task_type"] = 2;
    EXPECT_THAT(Set(request), IsSuccess());
    EXPECT_EQ("New", Task(task_id).task_name);
}

// --- Failures of the databases

TEST_F(SettingTest, ARowThatCannotBeWrittenIsAFailureAndTheEntryStays) {
    BreakTable("task_info_table", "UPDATE");
    EXPECT_THAT(Set(Import({
                    {"hub_folder_path", "/in"},
                    {"task_name",       "New"}
    })),
                IsError(2, "Failed to update task info"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set task info for task '1'"));
    EXPECT_EQ("My task", Entry(m_task_id).task_name);
    EXPECT_EQ(m_volume + "/photos", Entry(m_task_id).dst_dir_path);
    EXPECT_THAT(Changes(), IsEmpty());
}

TEST_F(SettingTest, ALogRowThatCannotBeAddedDoesNotStopTheRename) {
    BreakTable("log_info_table", "INSERT");
    EXPECT_THAT(Set(Import({
                    {"task_name", "New"}
    })),
                IsError(2, "Failed to add log info to log db"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to add log info to log db for '1'"));
    EXPECT_EQ("New", Task(m_task_id).task_name);
    EXPECT_EQ("New", Entry(m_task_id).task_name);
    EXPECT_EQ("New", m_fake.SchedEntries().begin()->second.name);
    EXPECT_FALSE(m_log.Has("[ERR] Failed to set task info for task '1'"));
    EXPECT_FALSE(m_log.Has("[INFO] Set Task '1' Setting"));
}

TEST_F(SettingTest, AListThatCannotBeReadIsAFailureOfTheCheck) {
    DropTable("task_info_table");
    EXPECT_THAT(Set(Import({})), IsError(2, "Failed to list tasks from DB"));
    EXPECT_THAT(Set(Export(m_task_id, {})), IsError(6, "Task id does not exist"));
}

// --- "get_task_setting"

TEST_F(SettingTest, TheSettingIsWhatTheListShows) {
    const PObject response = Get();
    const PObject list = Send("list_task");
    EXPECT_EQ(list["task_list"][0].ToText(), response.ToText());
    EXPECT_EQ(m_task_id, response["id"].AsUInt64());
    EXPECT_EQ("initial", response["task_status"].AsString());
    EXPECT_TRUE(m_log.Has("[INFO] Get Task '1' Setting"));
}

TEST_F(SettingTest, TheSettingOfATaskWithoutADeviceRowIsAFailure) {
    TaskInfo task = Task(m_task_id);
    task.usb_id = 77;
    uint64_t orphan = 0;
    ASSERT_EQ(0, TaskDB::GetInstance().AddTaskInfo(task, orphan));
    EXPECT_THAT(Send("get_task_setting", ForTask(orphan)),
                IsError(11, "Failed to get task response"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get task response for '" + std::to_string(orphan) +
                          "', ignore"));
}

}  // namespace
