// TaskDB: its schema, opening, closing, and what happens to every operation when it cannot work.
#include <fstream>
#include <functional>
#include <memory>
#include <thread>

#include "db/task-db-fixture.h"

namespace {

TEST_F(TaskDBTest, SchemaStandsAsDocumented) {
    EXPECT_EQ("2", Raw("SELECT value FROM config_table WHERE key = 'version'"));
    EXPECT_EQ("wal", Raw("PRAGMA journal_mode"));
    EXPECT_EQ("key|value", Raw("SELECT name FROM pragma_table_info('config_table')"));
    EXPECT_EQ("TEXT 0 1|TEXT 1 0", Raw("SELECT type || ' ' || \"notnull\" || ' ' || pk FROM "
                                       "pragma_table_info('config_table')"));
    EXPECT_EQ(
        "id INTEGER 0|uuid TEXT 1|run_when_plug_in INTEGER 1|eject_when_task_done INTEGER 1|"
        "producer TEXT 1|product TEXT 1",
        Raw("SELECT name || ' ' || type || ' ' || \"notnull\" FROM "
            "pragma_table_info('usb_info_table')"));
    EXPECT_EQ(
        "0 id INTEGER 0 -|1 usb_id INTEGER 1 -|2 is_enable INTEGER 1 -|"
        "3 task_name TEXT 1 -|4 task_type INTEGER 1 -|5 usb_folder_path TEXT 1 -|"
        "6 hub_folder_path TEXT 1 -|7 hub_share_name TEXT 1 -|"
        "8 last_copied_time INTEGER 1 -|9 copy_strategy INTEGER 1 -|"
        "10 keep_dir_structure INTEGER 1 -|11 smart_create_date_dir INTEGER 1 -|"
        "12 rename_photo_video INTEGER 1 -|13 remove_src_file INTEGER 1 -|"
        "14 conflict_policy INTEGER 1 -|15 enable_rotation INTEGER 1 -|"
        "16 max_version_count INTEGER 1 -|17 rotation_policy INTEGER 1 -|"
        "18 schedule_id INTEGER 0 -1|19 error INTEGER 1 -",
        Raw("SELECT cid || ' ' || name || ' ' || type || ' ' || \"notnull\" || ' ' || "
            "ifnull(dflt_value, '-') FROM pragma_table_info('task_info_table')"));
    EXPECT_EQ(
        "CREATE INDEX task_info_table_hub_share_name_idx on task_info_table(hub_share_name)|"
        "CREATE INDEX task_info_table_usb_id_idx on task_info_table(usb_id)|"
        "CREATE INDEX usb_info_table_uuid_idx on usb_info_table(uuid)",
        Raw("SELECT sql FROM sqlite_master WHERE type = 'index' AND sql IS NOT NULL ORDER BY "
            "name"));
    EXPECT_EQ(
        "CREATE TRIGGER usb_info_delete_trigger AFTER DELETE ON usb_info_table BEGIN       "
        "DELETE FROM task_info_table WHERE usb_id = OLD.id; END|"
        "CREATE TRIGGER task_info_delete_trigger AFTER DELETE ON task_info_table BEGIN   "
        "DELETE FROM usb_info_table WHERE id = OLD.usb_id AND (0 = (SELECT COUNT(*) FROM "
        "task_info_table WHERE usb_id = OLD.usb_id)); END",
        Raw("SELECT sql FROM sqlite_master WHERE type = 'trigger'"));
    EXPECT_EQ("task_info_table|usb_info_table",
              Raw("SELECT name FROM sqlite_master WHERE sql LIKE '%AUTOINCREMENT%' ORDER BY name"));
}

// What is settled for a connection alone leaves no trace in the file.
TEST_F(TaskDBTest, OpeningSettlesTheConnectionAndMakesTheSchemaInOneTransaction) {
    TaskDB db;
    const StatementTrace trace;
    ASSERT_EQ(0, db.Init(m_dir / "fresh.sqlite"));
    EXPECT_EQ((std::vector<std::string>{
                  "PRAGMA journal_mode = WAL;", "PRAGMA synchronous = NORMAL;",
                  "PRAGMA recursive_triggers = true;", "BEGIN IMMEDIATE;", "COMMIT;"}),
              trace.Framing());
    db.Close();
}

TEST_F(TaskDBTest, InitTwiceKeepsTheFirstConnection) {
    const LogCapture log;
    const std::string second = m_dir / "second.sqlite";
    EXPECT_EQ(0, m_db.Init(second));
    EXPECT_TRUE(log.Has("[INFO] Task DB has been inited"));
    EXPECT_FALSE(std::ifstream(second).is_open());
    AddUSB("u");
    EXPECT_EQ("u", Raw("SELECT uuid FROM usb_info_table"));
}

TEST_F(TaskDBTest, OpeningAnExistingFileKeepsItsRowsAndItsVersion) {
    const uint64_t id = AddTask(AddUSB("u"));
    m_db.Close();
    RawDatabase(m_path).Run("UPDATE config_table SET value = 7 WHERE key = 'version'");
    ASSERT_EQ(0, m_db.Init(m_path));
    EXPECT_EQ("task", Task(id).task_name);
    EXPECT_EQ("7", Raw("SELECT value FROM config_table WHERE key = 'version'"));
}

TEST_F(TaskDBTest, MissingFolderFailsAndInitMayBeTriedAgain) {
    TaskDB db;
    const LogCapture log;
    const std::string path = m_dir / "later/task-db.sqlite";
    EXPECT_EQ(-1, db.Init(path));
    EXPECT_TRUE(log.Has("[ERR] Failed to create task db at '" + path +
                        "'. [14] unable to open database file"));
    m_dir.MakeDir("later");
    EXPECT_EQ(0, db.Init(path));
}

TEST_F(TaskDBTest, FileThatIsNoDatabaseFailsAndIsLeftAsItIs) {
    TaskDB db;
    const LogCapture log;
    const std::string content(5000, 'x');
    const std::string path = m_dir.Write("text", content);
    EXPECT_EQ(-1, db.Init(path));
    EXPECT_TRUE(log.Has("[ERR] Failed to create task db table at '" + path +
                        "'. [26] file is not a database"));
    EXPECT_EQ(content, ReadWholeFile(path));
    uint64_t id = 0;
    EXPECT_EQ(-1, db.AddUSBInfo({}, id));
}

TEST_F(TaskDBTest, FolderInPlaceOfTheFileFails) {
    TaskDB db;
    EXPECT_EQ(-1, db.Init(m_dir.MakeDir("folder")));
}

TEST_F(TaskDBTest, FileLockedByAnotherConnectionIsWaitedFor) {
    auto other = std::make_unique<RawDatabase>(m_path);
    other->Run("BEGIN EXCLUSIVE");
    TaskDB db;
    std::thread opener([&] {
        EXPECT_EQ(0, db.Init(m_path));
        uint64_t id = 0;
        EXPECT_EQ(0, db.AddUSBInfo({}, id));
    });
    LetOtherThreadMeetTheLock();
    other->Run("INSERT INTO usb_info_table VALUES ( 1, 'first', 0, 0, '', '' ); COMMIT");
    opener.join();
    EXPECT_EQ("1|2", Raw("SELECT id FROM usb_info_table ORDER BY id"));
}

TEST_F(TaskDBTest, WriteWaitsForAnotherConnectionsTransaction) {
    RawDatabase other(m_path);
    other.Run("BEGIN IMMEDIATE");
    std::thread writer([&] { AddUSB("second"); });
    LetOtherThreadMeetTheLock();
    other.Run("INSERT INTO usb_info_table VALUES ( 1, 'first', 0, 0, '', '' ); COMMIT");
    writer.join();
    EXPECT_EQ("first|second", Raw("SELECT uuid FROM usb_info_table ORDER BY id"));
}

TEST_F(TaskDBTest, EveryOperationFailsWhileClosed) {
    m_db.Close();
    m_db.Close();
    uint64_t id = 5;
    USBInfo usb;
    TaskInfo task;
    std::list<USBInfo> usbs(1);
    std::list<TaskInfo> tasks(1);
    const std::function<int()> operations[] = {
        [&] { return m_db.AddUSBInfo(usb, id); },
        [&] { return m_db.UpdateUSBInfo(usb); },
        [&] { return m_db.GetUSBInfoByID(1, usb); },
        [&] { return m_db.GetUSBInfoByUUID("u", usb); },
        [&] { return m_db.RemoveUSBInfo(1); },
        [&] { return m_db.ListUSBInfo(usbs); },
        [&] { return m_db.AddTaskInfo(task, id); },
        [&] { return m_db.UpdateTaskInfo(task); },
        [&] { return m_db.SetTaskEnable(1, true); },
        [&] { return m_db.UpdateHUBShareName("a", "b"); },
        [&] { return m_db.GetTaskInfo(1, task); },
        [&] { return m_db.RemoveTaskInfo(1); },
        [&] { return m_db.ListTaskInfoByShare("a", tasks); },
        [&] { return m_db.ListTaskInfoByUSB(1, tasks); },
        [&] { return m_db.ListAllTaskInfo(tasks); },
        [&] { return m_db.SetTaskResult(1, 0, 1); },
    };
    for (const auto& operation : operations) {
        const LogCapture log;
        EXPECT_EQ(-1, operation());
        EXPECT_TRUE(log.Contains("bad parameter or other API misuse"));
    }
    EXPECT_EQ(5u, id);
    EXPECT_EQ(1u, usbs.size());
    EXPECT_EQ(1u, tasks.size());
}

TEST_F(TaskDBTest, EveryFormattedStatementFailsWithoutMemory) {
    USBInfo usb;
    TaskInfo task;
    std::list<TaskInfo> tasks(1);
    uint64_t id = 5;
    const std::function<int()> operations[] = {
        [&] { return m_db.AddUSBInfo(usb, id); },
        [&] { return m_db.UpdateUSBInfo(usb); },
        [&] { return m_db.GetUSBInfoByID(1, usb); },
        [&] { return m_db.GetUSBInfoByUUID("u", usb); },
        [&] { return m_db.RemoveUSBInfo(1); },
        [&] { return m_db.AddTaskInfo(task, id); },
        [&] { return m_db.UpdateTaskInfo(task); },
        [&] { return m_db.SetTaskEnable(1, true); },
        [&] { return m_db.UpdateHUBShareName("a", "b"); },
        [&] { return m_db.GetTaskInfo(1, task); },
        [&] { return m_db.RemoveTaskInfo(1); },
        [&] { return m_db.ListTaskInfoByShare("a", tasks); },
    };
    for (const auto& operation : operations) {
        const LogCapture log;
        int result = 0;
        {
            const NoSqliteMemory no_memory;
            result = operation();
        }
        EXPECT_EQ(-1, result);
        EXPECT_TRUE(log.Contains("sqlite3_mprintf: return NULL"));
    }
    EXPECT_EQ(1u, tasks.size());
    AddUSB("memory is back");
}

TEST_F(TaskDBTest, InstanceIsOneAndLivesOn) {
    TaskDB& instance = TaskDB::GetInstance();
    EXPECT_EQ(&instance, &TaskDB::GetInstance());
    ASSERT_EQ(0, instance.Init(m_path));
    uint64_t id = 0;
    EXPECT_EQ(0, instance.AddUSBInfo({}, id));
    instance.Close();
}

}  // namespace
