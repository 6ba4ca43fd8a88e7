// TaskDB: tasks, their lists and the outcome of a run.
#include "db/task-db.h"

#include "db/task-db-fixture.h"

namespace {

// Texts that a careless statement or log line would stumble over.
const std::string kOddTexts[] = {
    "",
    "it's",
    "''; DROP TABLE task_info_table; --",
    "50% %s %n %Q",
    "two\nlines\r\n\ttabbed",
    "\"double\" `back` \\slash\\",
    "not UTF-8: \xff\xfe\xc3\x28 end",
    "\xe2\x82\xac \xf0\x9f\x93\xb7",
    std::string(65535, '\''),
};

// Every field differs from its default and from every other.
TaskInfo FullTask() {
    TaskInfo task;
    task.usb_id = 11;
    task.schedule_id = 12;
    task.is_enable = true;
    task.task_name = "name";
    task.task_type = TASK_TYPE_IMPORT_PHOTO;
    task.usb_folder_path = "/DCIM";
    task.hub_folder_path = "/2024";
    task.hub_share_name = "photos";
    task.last_copied_time = 4294967295u;
    task.copy_strategy = COPY_STRATEGY_INCREMENTAL;
    task.keep_dir_structure = false;
    task.smart_create_date_dir = true;
    task.rename_photo_video = true;
    task.remove_src_file = true;
    task.conflict_policy = CONFLICT_POLICY_RENAME;
    task.enable_rotation = true;
    task.max_version_count = 9223372036854775807u;
    task.rotation_policy = ROTATION_POLICY_CONDITIONAL;
    task.error = -23;
    return task;
}

TEST(TaskInfoTest, RecordsStartWithTheirDefaults) {
    const USBInfo usb;
    EXPECT_EQ(0u, usb.id);
    EXPECT_FALSE(usb.run_when_plug_in);
    EXPECT_TRUE(usb.eject_when_task_done);
    EXPECT_EQ("", usb.uuid + usb.producer + usb.product);
    const TaskInfo task;
    EXPECT_EQ(0u, task.id);
    EXPECT_EQ(0u, task.usb_id);
    EXPECT_EQ(-1, task.schedule_id);
    EXPECT_FALSE(task.is_enable);
    EXPECT_EQ(0, task.task_type);
    EXPECT_EQ(0u, task.last_copied_time);
    EXPECT_EQ(0, task.copy_strategy);
    EXPECT_TRUE(task.keep_dir_structure);
    EXPECT_FALSE(task.smart_create_date_dir || task.rename_photo_video || task.remove_src_file ||
                 task.enable_rotation);
    EXPECT_EQ(0, task.conflict_policy);
    EXPECT_EQ(0u, task.max_version_count);
    EXPECT_EQ(0, task.rotation_policy);
    EXPECT_EQ(0, task.error);
}

// --- Tasks

TEST_F(TaskDBTest, TaskReadsBackAsItWasAdded) {
    TaskInfo task = FullTask();
    ASSERT_EQ(0, m_db.AddTaskInfo(task, task.id));
    EXPECT_EQ(task, Task(task.id));
}

TEST_F(TaskDBTest, EachFieldHasAColumnOfItsOwn) {
    TaskInfo task = FullTask();
    ASSERT_EQ(0, m_db.AddTaskInfo(task, task.id));
    EXPECT_EQ(
        "1,11,1,name,3,/DCIM,/2024,photos,4294967295,3,0,1,1,1,1,1,9223372036854775807,2,12,"
        "-23",
        Raw("SELECT concat FROM (SELECT id || ',' || usb_id || ',' || is_enable || ',' || "
            "task_name || ',' || task_type || ',' || usb_folder_path || ',' || "
            "hub_folder_path || ',' || hub_share_name || ',' || last_copied_time || ',' || "
            "copy_strategy || ',' || keep_dir_structure || ',' || smart_create_date_dir || "
            "',' || rename_photo_video || ',' || remove_src_file || ',' || conflict_policy "
            "|| ',' || enable_rotation || ',' || max_version_count || ',' || "
            "rotation_policy || ',' || schedule_id || ',' || error AS concat FROM "
            "task_info_table)"));
}

TEST_F(TaskDBTest, FlagsDoNotStandForEachOther) {
    bool TaskInfo::*const flags[] = {&TaskInfo::is_enable,
                                     &TaskInfo::keep_dir_structure,
                                     &TaskInfo::smart_create_date_dir,
                                     &TaskInfo::rename_photo_video,
                                     &TaskInfo::remove_src_file,
                                     &TaskInfo::enable_rotation};
    for (bool TaskInfo::*const flag : flags) {
        TaskInfo task;
        task.keep_dir_structure = false;
        task.*flag = true;
        ASSERT_EQ(0, m_db.AddTaskInfo(task, task.id));
        EXPECT_EQ(task, Task(task.id));
        for (bool TaskInfo::*const each : flags) task.*each = each != flag;
        ASSERT_EQ(0, m_db.UpdateTaskInfo(task));
        EXPECT_EQ(task, Task(task.id));
    }
}

TEST_F(TaskDBTest, UpdatedTaskReadsBackAndOthersStay) {
    const uint64_t other = AddTask(3);
    TaskInfo task;
    ASSERT_EQ(0, m_db.AddTaskInfo(task, task.id));
    const uint64_t id = task.id;
    task = FullTask();
    task.id = id;
    EXPECT_EQ(0, m_db.UpdateTaskInfo(task));
    EXPECT_EQ(task, Task(id));
    EXPECT_EQ("task", Task(other).task_name);
}

TEST_F(TaskDBTest, OddTextsPassUnharmed) {
    for (const std::string& text : kOddTexts) {
        USBInfo usb;
        usb.uuid = text;
        usb.producer = text;
        usb.product = text;
        ASSERT_EQ(0, m_db.AddUSBInfo(usb, usb.id)) << text;
        USBInfo read_usb;
        EXPECT_EQ(1, m_db.GetUSBInfoByUUID(text, read_usb)) << text;
        EXPECT_EQ(usb, read_usb) << text;
        usb.run_when_plug_in = true;
        EXPECT_EQ(0, m_db.UpdateUSBInfo(usb)) << text;
        EXPECT_EQ(1, m_db.GetUSBInfoByID(usb.id, read_usb)) << text;
        EXPECT_EQ(usb, read_usb) << text;

        TaskInfo task;
        task.task_name = text;
        task.usb_folder_path = text;
        task.hub_folder_path = text;
        task.hub_share_name = text;
        ASSERT_EQ(0, m_db.AddTaskInfo(task, task.id)) << text;
        EXPECT_EQ(task, Task(task.id)) << text;
        ASSERT_EQ(0, m_db.UpdateTaskInfo(task)) << text;
        EXPECT_EQ(task, Task(task.id)) << text;
        std::list<TaskInfo> list;
        ASSERT_EQ(0, m_db.ListTaskInfoByShare(text, list)) << text;
        ASSERT_EQ(1u, list.size()) << text;
        EXPECT_EQ(task, list.front()) << text;
        EXPECT_EQ(0, m_db.UpdateHUBShareName(text, text + "'")) << text;
        EXPECT_EQ(text + "'", Task(task.id).hub_share_name);
        EXPECT_EQ(0, m_db.RemoveTaskInfo(task.id)) << text;
    }
}

TEST_F(TaskDBTest, UnknownTaskIsAbsentAndLeavesTheRecordAtItsDefaults) {
    TaskInfo task;
    EXPECT_EQ(0, m_db.GetTaskInfo(1, task));
    EXPECT_EQ(0, m_db.GetTaskInfo(UINT64_MAX, task));
    EXPECT_EQ(TaskInfo(), task);
}

TEST_F(TaskDBTest, ScheduleOfMinusOneReadsBackAsMinusOne) {
    EXPECT_EQ(-1, Task(AddTask(1)).schedule_id);
}

TEST_F(TaskDBTest, CountBeyondWhatTheFileHoldsReadsBackAsTheLargest) {
    TaskInfo task;
    task.max_version_count = UINT64_MAX;
    ASSERT_EQ(0, m_db.AddTaskInfo(task, task.id));
    EXPECT_EQ(static_cast<uint64_t>(INT64_MAX), Task(task.id).max_version_count);
}

TEST_F(TaskDBTest, OddValuesOfAnotherWriterReadBackByTheRules) {
    RawDatabase(m_path).Run(
        "INSERT INTO task_info_table VALUES ( 9, 1, 4294967296, 'n', 1, 'u', 'h', 's', 4294967298, "
        "1, -1, 2, 0, 0, 1, 0, 1, 1, NULL, 0 );");
    const TaskInfo task = Task(9);
    EXPECT_TRUE(task.is_enable) << "any value but 0 is true";
    EXPECT_TRUE(task.keep_dir_structure);
    EXPECT_TRUE(task.smart_create_date_dir);
    EXPECT_FALSE(task.rename_photo_video);
    EXPECT_EQ(2u, task.last_copied_time) << "narrowed to 32 bits";
    EXPECT_EQ(0, task.schedule_id);
}

TEST_F(TaskDBTest, TaskIsEnabledAndDisabledAlone) {
    const uint64_t first = AddTask(1);
    const uint64_t second = AddTask(2);
    EXPECT_EQ(0, m_db.SetTaskEnable(second, true));
    EXPECT_FALSE(Task(first).is_enable);
    EXPECT_TRUE(Task(second).is_enable);
    EXPECT_EQ(0, m_db.SetTaskEnable(second, false));
    EXPECT_FALSE(Task(second).is_enable);
}

TEST_F(TaskDBTest, ShareIsRenamedInAllItsTasks) {
    const uint64_t first = AddTask(1, "old");
    const uint64_t second = AddTask(2, "old");
    const uint64_t other = AddTask(3, "Old");
    EXPECT_EQ(0, m_db.UpdateHUBShareName("old", "new's"));
    EXPECT_EQ("new's", Task(first).hub_share_name);
    EXPECT_EQ("new's", Task(second).hub_share_name);
    EXPECT_EQ("Old", Task(other).hub_share_name);
}

TEST_F(TaskDBTest, ListsSelectByShareByDeviceOrAll) {
    AddTask(1, "a");
    AddTask(2, "b");
    AddTask(2, "a");
    const auto ids = [](const std::list<TaskInfo>& list) {
        std::vector<uint64_t> all;
        for (const TaskInfo& task : list) all.push_back(task.id);
        return all;
    };
    using Ids = std::vector<uint64_t>;
    std::list<TaskInfo> list(7);
    EXPECT_EQ(0, m_db.ListTaskInfoByShare("a", list));
    EXPECT_EQ((Ids{1, 3}), ids(list));
    EXPECT_EQ(0, m_db.ListTaskInfoByUSB(2, list));
    EXPECT_EQ((Ids{2, 3}), ids(list));
    EXPECT_EQ(0, m_db.ListAllTaskInfo(list));
    EXPECT_EQ((Ids{1, 2, 3}), ids(list));
    EXPECT_EQ(0, m_db.ListTaskInfoByShare("c", list));
    EXPECT_TRUE(list.empty());
}

TEST_F(TaskDBTest, ListStaysAsItWasWhenTheStatementCannotBePrepared) {
    RawDatabase(m_path).Run("DROP TABLE task_info_table");
    EXPECT_EQ(-1, m_db.RemoveTaskInfo(1)) << "the connection learns of the change by this";
    const LogCapture log;
    std::list<TaskInfo> list(3);
    EXPECT_EQ(-1, m_db.ListAllTaskInfo(list));
    EXPECT_EQ(3u, list.size());
    EXPECT_TRUE(log.Has("[ERR] sqlite3_prepare_v2: [1] no such table: task_info_table"));
}

TEST_F(TaskDBTest, ListKeepsTheRowsReadBeforeAFailure) {
    AddTask(1);
    AddTask(1);
    const uint64_t third = AddTask(1);
    BreakRow("task_info_table", third);
    const LogCapture log;
    std::list<TaskInfo> list(7);
    EXPECT_EQ(-1, m_db.ListAllTaskInfo(list));
    EXPECT_EQ(2u, list.size());
    EXPECT_TRUE(log.Has("[ERR] sqlite3_step: [1] integer overflow"));
}

TEST_F(TaskDBTest, FailedReadOfOneRowLeavesTheRecordUntouched) {
    const uint64_t id = AddTask(1);
    BreakRow("task_info_table", id);
    const LogCapture log;
    TaskInfo task;
    EXPECT_EQ(-1, m_db.GetTaskInfo(id, task));
    EXPECT_EQ(TaskInfo(), task);
    EXPECT_TRUE(log.Has("[ERR] sqlite3_step: [1] integer overflow"));
}

TEST_F(TaskDBTest, FailedListOfDevicesKeepsTheRowsReadBefore) {
    AddUSB("a");
    BreakRow("usb_info_table", AddUSB("b"));
    std::list<USBInfo> list(7);
    EXPECT_EQ(-1, m_db.ListUSBInfo(list));
    EXPECT_EQ(1u, list.size());
}

// --- The outcome of a run

TEST_F(TaskDBTest, GoodRunSetsItsTimeAndClearsTheError) {
    const uint64_t id = AddTask(1);
    EXPECT_EQ(0, m_db.SetTaskResult(id, -2, 0));
    EXPECT_EQ(0, m_db.SetTaskResult(id, 0, 4000000000u));
    EXPECT_EQ(0, Task(id).error);
    EXPECT_EQ(4000000000u, Task(id).last_copied_time);
}

TEST_F(TaskDBTest, FailedRunLeavesTheTimeOfTheLastGoodOne) {
    const uint64_t id = AddTask(1);
    const uint64_t other = AddTask(2);
    EXPECT_EQ(0, m_db.SetTaskResult(id, 0, 1700000000));
    EXPECT_EQ(0, m_db.SetTaskResult(id, -19, 0));
    EXPECT_EQ(-19, Task(id).error);
    EXPECT_EQ(1700000000u, Task(id).last_copied_time);
    EXPECT_EQ(0, Task(other).error);
    EXPECT_EQ(0u, Task(other).last_copied_time);
}

TEST_F(TaskDBTest, ResultOfAnUnknownTaskIsNoFailure) {
    EXPECT_EQ(0, m_db.SetTaskResult(99, -3, 0));
    EXPECT_EQ("0", Raw("SELECT COUNT(*) FROM task_info_table"));
}

}  // namespace
