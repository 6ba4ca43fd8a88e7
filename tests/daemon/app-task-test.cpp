// "add_task".
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "add-task-fixture.h"
#include "daemon/usb-matcher.h"
#include "db/file-db.h"
#include "db/log-description.h"
#include "db/task-db.h"
#include "processor/task-entry-handler.h"

using testing::IsEmpty;
using testing::SizeIs;

namespace {

constexpr int FRONT_USB = 99;

// --- What a good request leaves

TEST_F(AddTaskTest, WritesBothRowsAsTheyWereSent) {
    const PObject response = Add([](PObject& request) {
        request["run_when_plug_in"] = true;
        request["eject_when_task_done"] = false;
        request["usb_folder_path"] = "/DCIM";
        request["smart_create_date_dir"] = true;
        request["keep_dir_structure"] = false;
        request["rename_photo_video"] = true;
        request["remove_src_file"] = true;
        request["conflict_policy"] = 1;
        request["enable_rotation"] = true;
        request["max_version_count"] = uint64_t{1} << 40;
        request["rotation_policy"] = 77;  // nothing is range-checked here
    });
    ASSERT_THAT(response, IsSuccess());
    EXPECT_EQ("{\"task_id\": 1}", response.ToText());
    ASSERT_THAT(Devices(), SizeIs(1));
    const USBInfo usb = Devices().front();
    EXPECT_EQ("u-1", usb.uuid);
    EXPECT_TRUE(usb.run_when_plug_in);
    EXPECT_FALSE(usb.eject_when_task_done);
    EXPECT_EQ("Maker", usb.producer);
    EXPECT_EQ("Stick", usb.product);
    TaskInfo expected;
    expected.id = 1;
    expected.usb_id = usb.id;
    expected.schedule_id = m_fake.SchedEntries().begin()->first;
    expected.is_enable = true;
    expected.task_name = "My task";
    expected.task_type = 1;
    expected.usb_folder_path = "/DCIM";
    expected.hub_folder_path = "/";
    expected.hub_share_name = "photos";
    expected.copy_strategy = 2;
    expected.keep_dir_structure = false;
    expected.smart_create_date_dir = true;
    expected.rename_photo_video = true;
    expected.remove_src_file = true;
    expected.conflict_policy = 1;
    expected.enable_rotation = true;
    expected.max_version_count = uint64_t{1} << 40;
    expected.rotation_policy = 77;
    EXPECT_EQ(expected, Task(1));
}

TEST_F(AddTaskTest, MakesTheFolderTheEntryTheScheduleAndALogRow) {
    const uint64_t task_id = AddTask("a", "u-1");
    for (const char* file : {"user.config", "blacklist.filter", "whitelist.filter"}) {
        EXPECT_EQ(0, access((TaskFolder(task_id) + "/" + file).c_str(), F_OK)) << file;
    }
    EXPECT_TRUE(IsLoaded(task_id));
    ASSERT_THAT(m_fake.SchedEntries(), SizeIs(1));
    EXPECT_EQ("My task", m_fake.SchedEntries().begin()->second.name);
    EXPECT_EQ(0, m_fake.SchedEntries().begin()->second.state);
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_TASK_ADDED));
    EXPECT_TRUE(m_log.Has("[INFO] Add Task '1'"));
}

TEST_F(AddTaskTest, TheTasksFilesAreWritableByTheirOwnerAlone) {
    const mode_t before = umask(0);
    const uint64_t task_id = AddTask("a", "u-1");
    umask(before);
    const std::string folder = TaskFolder(task_id);
    for (const std::string& path : {folder, folder + "/user.config", folder + "/blacklist.filter",
                                    folder + "/whitelist.filter"}) {
        struct stat info = {};
        ASSERT_EQ(0, stat(path.c_str(), &info)) << path;
        EXPECT_EQ(0u, info.st_mode & (S_IWGRP | S_IWOTH)) << path;
    }
}

TEST_F(AddTaskTest, MissingOptionalKeysReadAsEmptyValues) {
    PObject request;
    request["usb_share_path"] = MountPath("a");
    request["uuid"] = "u-1";
    request["task_type"] = 2;  // an export: its share is not looked at here
    for (const char* key :
         {"custom_name", "custom_ext", "black_name", "black_ext", "white_name", "white_ext"}) {
        request[key] = List({});
    }
    request["schedule_json_str"] = "{}";
    EXPECT_THAT(Send("add_task", request), IsSuccess());
    const TaskInfo task = Tasks().front();
    EXPECT_EQ("", task.task_name);
    EXPECT_FALSE(task.keep_dir_structure);
    EXPECT_EQ(0, task.copy_strategy);
    EXPECT_FALSE(Devices().front().eject_when_task_done);
    EXPECT_FALSE(IsLoaded(task.id));  // no strategy is 0: found out when the entry is built
}

TEST_F(AddTaskTest, NamesOfAnyBytesAreKept) {
    const std::string name = "it's \"%s\"\n\xff\xfe 100%";
    const PObject response = Add([&](PObject& request) { request["task_name"] = name; });
    ASSERT_THAT(response, IsSuccess());
    EXPECT_EQ(name, Task(1).task_name);
    EXPECT_EQ(name, Entry(1).task_name);
}

TEST_F(AddTaskTest, VeryLongNamesAreKept) {
    const std::string name(100000, 'n');
    const PObject response = Add([&](PObject& request) { request["task_name"] = name; });
    ASSERT_THAT(response, IsSuccess());
    EXPECT_EQ(name, Task(1).task_name);
}

TEST_F(AddTaskTest, TakesTheDeviceOverFromTheDefaultTask) {
    const uint64_t default_id = AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("b", "u-2", FRONT_USB);
    ASSERT_EQ(0, PostMount("b"));
    ASSERT_TRUE(IsLoaded(default_id));
    // Another enabled import to the same folder stands in the way: give it another one.
    m_dir.MakeDir("v1/photos/b");
    m_dir.MakeDir("v1/photos/d");
    TaskInfo default_task = Task(default_id);
    default_task.hub_folder_path = "/d";
    ASSERT_EQ(0, TaskDB::GetInstance().UpdateTaskInfo(default_task));
    PObject request = AddRequest("b", "u-2");
    request["hub_folder_path"] = "/b";
    const PObject response = Send("add_task", request);
    ASSERT_THAT(response, IsSuccess());
    EXPECT_FALSE(IsLoaded(default_id));
    EXPECT_TRUE(IsLoaded(response["task_id"].AsUInt64()));
    EXPECT_TRUE(m_log.Has("[INFO] current uuid 'u-2' is a DEFAULT_TASK"));
    USBInfo usb_info;
    ASSERT_EQ(1, USBMatcher::GetInstance().Match("u-2", usb_info));
    EXPECT_EQ("u-2", usb_info.uuid);
    std::string path;
    EXPECT_EQ(-1, USBMatcher::GetInstance().GetMountPath(default_task.usb_id, path));
    EXPECT_EQ(m_log.Count("[INFO] Ferrixd: PauseProcessors"),
              m_log.Count("[INFO] Ferrixd: ResumeProcessors"));
}

// --- Refusals, in the order of the steps

TEST_F(AddTaskTest, WithoutAPathOrAUuidWritesNothing) {
    for (const char* key : {"usb_share_path", "uuid"}) {
        PObject request = AddRequest("a", "u-1");
        request.AsMap().erase(key);
        EXPECT_THAT(Send("add_task", request), IsError(1, "Invalid parameter")) << key;
    }
    EXPECT_THAT(Devices(), IsEmpty());
    EXPECT_THAT(Tasks(), IsEmpty());
}

TEST_F(AddTaskTest, ADuplicatedDestinationComesBeforeAKnownDevice) {
    ASSERT_THAT(Add(), IsSuccess());
    EXPECT_THAT(Add(), IsError(9, "Duplicated destination path"));
}

TEST_F(AddTaskTest, AKnownDeviceKeepsItsRowAsItWas) {
    ASSERT_THAT(Add(), IsSuccess());
    const USBInfo before = Devices().front();
    EXPECT_THAT(Add([](PObject& request) {
                    request["task_type"] = 2;
                    request["product"] = "Another";
                }),
                IsError(3, "USB info has already existed"));
    EXPECT_TRUE(m_log.Has("[ERR] USB info has already existed for uuid  'u-1'"));
    EXPECT_EQ(before, Devices().front());
    EXPECT_THAT(Tasks(), SizeIs(1));
}

TEST_F(AddTaskTest, ADeviceRowThatCannotBeWrittenLeavesNothing) {
    BreakTable("usb_info_table", "INSERT");
    EXPECT_THAT(Add(), IsError(2, "Failed to AddUSBInfo to DB"));
    EXPECT_THAT(Tasks(), IsEmpty());
}

TEST_F(AddTaskTest, ATaskRowThatIsThereAlreadyStaysAndTheDeviceRowToo) {
    TaskInfo stray;
    stray.usb_id = 1;  // the id that the new device is going to get
    uint64_t id = 0;
    ASSERT_EQ(0, TaskDB::GetInstance().AddTaskInfo(stray, id));
    EXPECT_THAT(Add(), IsError(4, "Task info has already existed"));
    EXPECT_TRUE(m_log.Has("[ERR] Task info has already added for usb_id '1'"));
    EXPECT_THAT(Devices(), SizeIs(1));
}

TEST_F(AddTaskTest, ATaskRowThatCannotBeWrittenLeavesTheDeviceRow) {
    BreakTable("task_info_table", "INSERT");
    EXPECT_THAT(Add(), IsError(2, "Failed to AddTaskInfo to DB"));
    EXPECT_THAT(Devices(), SizeIs(1));
    EXPECT_EQ(-1, access(TaskFolder(1).c_str(), F_OK));
}

TEST_F(AddTaskTest, AFolderThatCannotBeMadeLeavesTheRows) {
    m_dir.Write("v1/@Ferrix/task/1", "in the way");
    EXPECT_THAT(Add(), IsError(11, "Failed to InitTaskEnv"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to create task folder '" + TaskFolder(1) + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to InitTaskEnv for '1'"));
    EXPECT_THAT(Devices(), SizeIs(1));
    EXPECT_THAT(Tasks(), SizeIs(1));
    EXPECT_FALSE(IsLoaded(1));
    EXPECT_THAT(m_fake.SchedEntries(), IsEmpty());
}

// Numbers are given again where a repository has lost its task database and not its folders.
TEST_F(AddTaskTest, WhatATaskOfTheSameNumberHadCopiedIsForgotten) {
    const std::string path = TaskFolder(1) + "/file-db.sqlite";
    m_dir.MakeDir("v1/@Ferrix/task/1");
    {
        FileDB left;
        ASSERT_EQ(0, left.Init(path));
        ASSERT_EQ(0, left.SetFileInfoBySourcePath({"/a.jpg", "/a.jpg", FILE_INFO_FILE, 1, 1}));
        int64_t mark = 0;
        ASSERT_EQ(0, left.GetUnprovenMark(mark));
        ASSERT_EQ(0, left.ProveFileInfo(mark));
    }
    const std::string proof = m_dir.Write("v1/@Ferrix/task/1/unproven-run", "1 2 3\n");
    ASSERT_THAT(Add([](PObject& request) { request["copy_strategy"] = 3; }), IsSuccess());
    ASSERT_NE(nullptr, Entry(1).file_db);
    FileInfo info;
    EXPECT_EQ(0, Entry(1).file_db->GetFileInfoBySourcePath("/a.jpg", info));
    EXPECT_EQ("1 2 3\n", ReadWholeFile(proof)) << "what is not trusted stays so";
}

TEST_F(AddTaskTest, WhatCannotBeForgottenIsNotTakenOver) {
    m_dir.MakeDir("v1/@Ferrix/task/1/file-db.sqlite");
    EXPECT_THAT(Add(), IsError(11, "Failed to InitTaskEnv"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to create task folder '" + TaskFolder(1) + "'"));
    EXPECT_FALSE(IsLoaded(1));
}

TEST_F(AddTaskTest, AFilterThatCannotBeWrittenLeavesTheRowsAndTheFolder) {
    EXPECT_THAT(Add([](PObject& request) { request.AsMap().erase("white_ext"); }),
                IsError(11, "Failed to WriteFilterSetting"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to WriteFilterSetting for '1'"));
    EXPECT_THAT(Tasks(), SizeIs(1));
    EXPECT_EQ(0, access(TaskFolder(1).c_str(), F_OK));
    EXPECT_FALSE(IsLoaded(1));
    // The device is known now: only "remove_task" frees it.
    EXPECT_THAT(Add([](PObject& request) { request["task_type"] = 2; }),
                IsError(3, "USB info has already existed"));
    EXPECT_THAT(Send("remove_task", ForTask(1)), IsSuccess());
    EXPECT_THAT(Add(), IsSuccess());
}

TEST_F(AddTaskTest, EntriesThatCannotBeLoadedLeaveTheRowsAndTheFiles) {
    // The devices go while the path of the white list, the last file, is being made.
    m_fake.OnCall("KLIBCFileGetKeyValue", [this] {
        if (access((TaskFolder(1) + "/blacklist.filter").c_str(), F_OK) != 0) return;
        DropTable("usb_info_table");
        m_fake.OnCall("KLIBCFileGetKeyValue", {});
    });
    EXPECT_THAT(Add(), IsError(11, "Failed to LoadUSBTaskEntryByUSBID"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get usb info from db '1'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to add usb entry '1' and task entry"));
    EXPECT_FALSE(IsLoaded(1));
    EXPECT_THAT(Tasks(), SizeIs(1));
    EXPECT_EQ(0, access((TaskFolder(1) + "/whitelist.filter").c_str(), F_OK));
    EXPECT_THAT(m_fake.SchedEntries(), IsEmpty());
}

TEST_F(AddTaskTest, AScheduleThatIsNoJsonLeavesTheTask) {
    EXPECT_THAT(Add([](PObject& request) { request["schedule_json_str"] = "{broken"; }),
                IsError(11, "Failed to CreateSchedule"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to create schedule [{broken]"));
    EXPECT_TRUE(IsLoaded(1));
    EXPECT_EQ(-1, Task(1).schedule_id);
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_TASK_ADDED));
}

TEST_F(AddTaskTest, ARowThatCannotBeUpdatedLeavesTheSchedule) {
    BreakTable("task_info_table", "UPDATE");
    EXPECT_THAT(Add(), IsError(2, "Failed to update task info"));
    EXPECT_THAT(m_fake.SchedEntries(), SizeIs(1));
    EXPECT_EQ(-1, Task(1).schedule_id);
}

TEST_F(AddTaskTest, ALogRowThatCannotBeWrittenFailsAlthoughTheTaskExists) {
    BreakTable("log_info_table", "INSERT");
    EXPECT_THAT(Add(), IsError(2, "Failed to add log info to log db"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to add log info to log db for '1'"));
    EXPECT_TRUE(IsLoaded(1));
    EXPECT_NE(-1, Task(1).schedule_id);
}

TEST_F(AddTaskTest, ATaskThatCannotBeBuiltIsAddedAndNotLoaded) {
    const PObject response = Add([](PObject& request) { request["copy_strategy"] = 9; });
    EXPECT_THAT(response, IsSuccess());
    EXPECT_FALSE(IsLoaded(1));
    EXPECT_TRUE(m_log.Has(
        "[WARN] Failed to add task entry '1', usb_share_path = " + MountPath("a") + ", ignore"));
}

TEST_F(AddTaskTest, AnEmptyMountPathLeavesTheTaskUnloaded) {
    EXPECT_THAT(Add([](PObject& request) { request["usb_share_path"] = ""; }), IsSuccess());
    EXPECT_FALSE(IsLoaded(1));
    EXPECT_TRUE(TaskEntryHandler::GetInstance().IsUSBEntryEmpty());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to prepare usb entry for usb_share_path '', usb id '1'"));
    EXPECT_TRUE(m_log.Has("[WARN] Failed to add usb entry '1', usb_share_path = , ignore"));
}

TEST_F(AddTaskTest, AnEmptyUuidHasNoDefaultTaskToRelease) {
    EXPECT_THAT(Add([](PObject& request) { request["uuid"] = ""; }), IsSuccess());
    EXPECT_TRUE(m_log.Has("[ERR] Invalid parameter"));
    EXPECT_EQ(0, m_log.Count("[INFO] Ferrixd: PauseProcessors"));
}

TEST_F(AddTaskTest, ValuesOfWrongKindsAreRefusedOrReadAsEmpty) {
    const auto with = [](const char* key, const PObject& value) {
        return [key, value](PObject& request) { request[key] = value; };
    };
    EXPECT_THAT(Add(with("black_name", "a text")), IsError(11, "Failed to WriteFilterSetting"));
    ASSERT_THAT(Send("remove_task", ForTask(1)), IsSuccess());
    EXPECT_THAT(Add(with("hub_share_name", List({"photos"}))),
                IsError(11, "Failed to resolve import destination path."));
    EXPECT_THAT(Add(with("schedule_json_str", List({}))), IsError(11, "Failed to CreateSchedule"));
    EXPECT_EQ("{\"error\": \"Invalid parameter\", \"error_code\": 1}",
              Send("add_task", PObject("no map")).ToText());
}

}  // namespace
