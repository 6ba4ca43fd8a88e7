#include "updater/updater-v1.h"

#include <ctime>

#include "db/file-db.h"
#include "db/task-db.h"
#include "updater/updater-fixture.h"

namespace fs = std::filesystem;

namespace {

class UpdaterV1Test : public UpdaterTest {
protected:
    UpdaterV1Test() { MakeOldRepository(m_repository); }

    // Each database as it is now.
    std::vector<std::string> Dumps() const {
        std::vector<std::string> dumps;
        for (const std::string& path : DatabasesOf(m_repository)) {
            dumps.push_back(DumpDatabase(InRepository(path)));
        }
        return dumps;
    }
};

std::string Today() {
    const time_t now = time(nullptr);
    char text[16];
    strftime(text, sizeof(text), "%Y/%m/%d", localtime(&now));
    return text;
}

TEST_F(UpdaterV1Test, EveryTaskKeepsItsSettingsAndGetsTheNewOnes) {
    ASSERT_EQ(0, Run());
    EXPECT_TRUE(m_log.Has("[INFO] UpdaterV1: task_db_version (1) "));
    TaskDB db;
    ASSERT_EQ(0, db.Init(m_task_db));
    std::list<TaskInfo> tasks;
    ASSERT_EQ(0, db.ListAllTaskInfo(tasks));
    const std::list<TaskInfo> wanted = {
        {1, 1, 1, true,  "Mirror",    1, "/",     "/in", "photos",  1600000000,
         2, true,  false, false, false, 2, false, 256, 1, 0 },
        {2, 1, 2, true,  "It's 100%", 2, "/DCIM", "/",   "vid\"eo", 0,
         3, false, true,  true,  false, 1, false, 256, 1, -5},
        {4, 2, 3, false, "Photos",    3, "/",     "/",   "photos",  7,
         3, true,  false, true,  false, 2, false, 256, 1, 0 },
    };
    EXPECT_EQ(wanted, tasks);
    std::list<USBInfo> devices;
    ASSERT_EQ(0, db.ListUSBInfo(devices));
    const std::list<USBInfo> wanted_devices = {
        {1, "uuid-one", true,  false, "Maker", "Stick"},
        {2, "uuid-two", false, true,  "",      "Card" }
    };
    EXPECT_EQ(wanted_devices, devices);
}

// Opening it with the present schema changes nothing: it is the schema of a new database.
TEST_F(UpdaterV1Test, TheTaskDatabaseHasTheSchemaOfANewOne) {
    ASSERT_EQ(0, Run());
    const std::string schema =
        "SELECT group_concat(type || ' ' || name || ' ' || tbl_name, '; ') FROM (SELECT * FROM "
        "sqlite_master ORDER BY type, name);";
    const std::string columns =
        "SELECT group_concat(name || type || \"notnull\" || pk || coalesce(dflt_value, '')) FROM "
        "pragma_table_info('task_info_table');";
    TaskDB fresh;
    ASSERT_EQ(0, fresh.Init(m_dir / "fresh.db"));
    EXPECT_EQ(RawDatabase(m_dir / "fresh.db").Read(schema), Read(schema));
    EXPECT_EQ(RawDatabase(m_dir / "fresh.db").Read(columns), Read(columns));
    EXPECT_EQ("2", Read("SELECT value FROM config_table WHERE key = 'version';"));
    EXPECT_EQ("ok", Read("PRAGMA integrity_check;"));
}

TEST_F(UpdaterV1Test, DevicesAndTasksAreRemovedAsPairsAfterwards) {
    ASSERT_EQ(0, Run());
    TaskDB db;
    ASSERT_EQ(0, db.Init(m_task_db));
    USBInfo usb;
    EXPECT_EQ(0, db.RemoveTaskInfo(1));
    EXPECT_EQ(1, db.GetUSBInfoByID(1, usb)) << "it has another task";
    EXPECT_EQ(0, db.RemoveTaskInfo(2));
    EXPECT_EQ(0, db.GetUSBInfoByID(1, usb));
    TaskInfo task;
    EXPECT_EQ(1, db.GetTaskInfo(4, task));
    EXPECT_EQ(0, db.RemoveUSBInfo(2));
    EXPECT_EQ(0, db.GetTaskInfo(4, task));
}

TEST_F(UpdaterV1Test, TheNumberOfARemovedTaskIsNotGivenAgain) {
    ASSERT_EQ(0, Run());
    TaskDB db;
    ASSERT_EQ(0, db.Init(m_task_db));
    uint64_t id = 0;
    ASSERT_EQ(0, db.AddTaskInfo(TaskInfo(), id));
    EXPECT_EQ(10U, id);
}

TEST_F(UpdaterV1Test, ARepositoryWithoutTasksIsLifted) {
    RawDatabase(m_task_db).Run("PRAGMA recursive_triggers = ON; DELETE FROM usb_info_table;");
    ASSERT_EQ(0, Run());
    TaskDB db;
    ASSERT_EQ(0, db.Init(m_task_db));
    uint64_t id = 0;
    ASSERT_EQ(0, db.AddTaskInfo(TaskInfo(), id));
    EXPECT_EQ(10U, id);
    EXPECT_TRUE(m_fake.SchedEntries().empty());
}

TEST_F(UpdaterV1Test, EveryTaskGetsATimetableThatIsOff) {
    ASSERT_EQ(0, Run());
    const std::map<int, FakeSchedEntry> entries = m_fake.SchedEntries();
    ASSERT_EQ(3U, entries.size());
    const FakeSchedEntry& entry = entries.at(2);
    EXPECT_EQ("It's 100%", entry.name);
    EXPECT_EQ("#type:icon_export_general#", entry.action);
    EXPECT_EQ(0, entry.state);
    EXPECT_THAT(entry.command, testing::EndsWith("ferrix-notifier --execute-task 2"));
    EXPECT_EQ("{\"schedule\":{\"date\":\"" + Today() +
                  "\",\"date_type\":0,\"hour\":0,\"last_work_hour\":0,\"min\":0,\"repeat\":0,"
                  "\"repeat_hour\":0,\"week_name\":\"0,1,2,3,4,5,6\"}}",
              entry.json);
}

TEST_F(UpdaterV1Test, TheDatabasesOfIncrementalTasksGetTheNewIndexes) {
    ASSERT_EQ(0, Run());
    EXPECT_EQ(std::vector<std::string>{}, Leftovers());
    for (const char* task : {"2", "4"}) {
        RawDatabase db(InRepository("task/" + std::string(task) + "/file-db.sqlite"));
        EXPECT_EQ("file_info_dst_path_idx|file_info_src_path_idx",
                  db.Read("SELECT name FROM sqlite_master WHERE type = 'index' AND sql NOT NULL "
                          "ORDER BY name;"));
        EXPECT_EQ("2", db.Read("SELECT value FROM config_table WHERE key = 'version';"));
        EXPECT_EQ("/a.jpg|/sub|/sub/b.jpg", db.Read("SELECT source_path FROM file_info_table;"));
    }
    FileDB file_db;
    ASSERT_EQ(0, file_db.Init(InRepository("task/2/file-db.sqlite")));
    FileInfo info;
    ASSERT_EQ(1, file_db.GetFileInfoBySourcePath("/sub/b.jpg", info));
    EXPECT_EQ(5000000000U, info.size);
    EXPECT_FALSE(fs::exists(InRepository("task/1/file-db.sqlite")));
}

TEST_F(UpdaterV1Test, ASecondRunDoesNothing) {
    ASSERT_EQ(0, Run());
    const std::vector<std::string> after = Dumps();
    m_log.Clear();
    m_fake.ForgetCalls();
    EXPECT_EQ(0, Run());
    EXPECT_EQ(after, Dumps());
    EXPECT_TRUE(m_log.Lines().empty());
    EXPECT_TRUE(m_fake.Calls().empty());
    EXPECT_EQ(0, UpdaterV1(m_repository).Run());
    EXPECT_TRUE(m_log.Has("[INFO] UpdaterV1: task_db_version (2) "));
    EXPECT_EQ(after, Dumps());
}

TEST_F(UpdaterV1Test, AFutureVersionIsLeftAlone) {
    RawDatabase(m_task_db).Run("UPDATE config_table SET value = 3 WHERE key = 'version';");
    const std::vector<std::string> before = Dumps();
    EXPECT_EQ(0, Run());
    EXPECT_EQ(before, Dumps());
}

// A killed daemon leaves rows in the write-ahead log alone.
TEST_F(UpdaterV1Test, WhatLiesInAWriteAheadLogIsTakenAlong) {
    const std::string file_db = InRepository("task/4/file-db.sqlite");
    for (const std::string& path : {m_task_db, file_db}) {
        RawDatabase open(path);
        if (path == m_task_db) {
            open.Run("UPDATE task_info_table SET task_name = 'From the log' WHERE id = 1;");
        } else {
            open.Run("INSERT INTO file_info_table VALUES (7, '/late', '/late', 0, 1, 1);");
        }
        for (const char* part : {"", "-wal"}) fs::copy_file(path + part, (m_dir / "keep") + part);
        open.Run("PRAGMA wal_checkpoint(TRUNCATE);");
        const std::string moved = path + ".moved";
        fs::rename(m_dir / "keep", moved);
        fs::rename(m_dir / "keep-wal", moved + "-wal");
    }
    for (const std::string& path : {m_task_db, file_db}) {
        fs::remove(path + "-shm");
        fs::rename(path + ".moved", path);
        fs::rename(path + ".moved-wal", path + "-wal");
        ASSERT_GT(fs::file_size(path + "-wal"), 0U);
    }
    ASSERT_EQ(0, Run());
    EXPECT_EQ(std::vector<std::string>{}, Leftovers());
    EXPECT_EQ("From the log", Read("SELECT task_name FROM task_info_table WHERE id = 1;"));
    EXPECT_EQ("/late",
              RawDatabase(file_db).Read("SELECT source_path FROM file_info_table WHERE id = 7;"));
}

TEST_F(UpdaterV1Test, ATaskDatabaseThatIsNotThereIsRefused) {
    EXPECT_EQ(-1, UpdaterV1(m_dir / "none").Run());
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: task db '" + (m_dir / "none/db/task-db.sqlite") +
                          "' does not exist"));
}

TEST_F(UpdaterV1Test, ATaskDatabaseWithoutAVersionIsRefused) {
    RawDatabase(m_task_db).Run("DELETE FROM config_table;");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterCore: Failed to get task db version '" + m_task_db + "'"));
    EXPECT_EQ(-1, UpdaterV1(m_repository).Run());
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to get task db version '" + m_task_db + "'"));
    m_dir.Write("v1/@Ferrix/db/task-db.sqlite", std::string(5000, 'x'));
    EXPECT_EQ(-1, Run());
    EXPECT_EQ(std::string(5000, 'x'), ReadWholeFile(m_task_db));
}

TEST_F(UpdaterV1Test, AMissingFileDatabaseIsAFailureThatChangesNothing) {
    fs::remove(InRepository("task/2/file-db.sqlite"));
    const std::vector<std::string> before = Dumps();
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterCore: Failed to run updater v1"));
    EXPECT_EQ(before, Dumps());
}

TEST_F(UpdaterV1Test, EachFailureOfAFileDatabaseIsTold) {
    const std::string path = InRepository("task/2/file-db.sqlite");
    fs::rename(path, path + ".away");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: file db '" + path + "' does not exist"));
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to update file db"));
    m_dir.Write("v1/@Ferrix/task/2/file-db.sqlite", std::string(5000, 'x'));
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to get file db version '" + path + "'"));
    fs::rename(path + ".away", path);
    RawDatabase(path).Run("ALTER TABLE file_info_table RENAME TO other;");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to update file db '" + path + ".bkp_v1'"));
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to update file db for task '2'"));
    RawDatabase(path).Run("ALTER TABLE other RENAME TO file_info_table;");
    fs::create_directories(path + ".bkp_v1/in-the-way");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to backup file db '" + path + "' -> '" + path +
                          ".bkp_v1'"));
    EXPECT_EQ("1", Read("SELECT value FROM config_table WHERE key = 'version';"));
    fs::remove_all(path + ".bkp_v1");
    EXPECT_EQ(0, Run());
}

TEST_F(UpdaterV1Test, ATaskListThatCannotBeReadIsAFailure) {
    RawDatabase(m_task_db).Run("ALTER TABLE task_info_table RENAME TO other;");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to list incbkp task info"));
}

TEST_F(UpdaterV1Test, ATaskDatabaseThatCannotBeCopiedIsAFailure) {
    fs::create_directories(m_task_db + ".bkp_v1/in-the-way");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to backup task db '" + m_task_db + "' -> '" +
                          m_task_db + ".bkp_v1'"));
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to update task db '" + m_task_db + "'"));
    EXPECT_EQ("1", Read("SELECT value FROM config_table WHERE key = 'version';"));
}

TEST_F(UpdaterV1Test, ATaskDatabaseThatCannotBeChangedStaysAsItWas) {
    RawDatabase(m_task_db).Run("ALTER TABLE task_info_table RENAME COLUMN rename_photo_file TO x;");
    const std::string before = DumpDatabase(m_task_db);
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] sqlite3_exec: [1] no such column: rename_photo_file"));
    EXPECT_EQ(before, DumpDatabase(m_task_db));
    EXPECT_EQ(std::vector<std::string>{}, Leftovers());
}

// Only the first n timetables can be made; the databases of the tasks may be new, and all else is
// as it was.
TEST_F(UpdaterV1Test, ATimetableThatCannotBeMadeTakesTheOthersAlong) {
    const std::string before = DumpDatabase(m_task_db);
    for (int n = 0; n < 3; ++n) {
        m_fake.FailCall("KELDSchedTaskSave", KELDERR_SYSTEM, 1, n);
        EXPECT_EQ(-1, Run()) << n;
        EXPECT_TRUE(m_fake.SchedEntries().empty()) << n;
        EXPECT_EQ(before, DumpDatabase(m_task_db)) << n;
        EXPECT_EQ(std::vector<std::string>{}, Leftovers());
    }
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to CreateSchedule for task '1', 'uuid-one'"));
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to CreateSchedule for task '4', 'uuid-two'"));
    EXPECT_EQ(0, Run());
    EXPECT_EQ(3U, m_fake.SchedEntries().size());
}

TEST_F(UpdaterV1Test, ATaskWithoutADeviceIsAFailure) {
    RawDatabase(m_task_db).Run("UPDATE task_info_table SET usb_id = 77 WHERE id = 4;");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get uuid for usb id '77'"));
    EXPECT_TRUE(m_fake.SchedEntries().empty());
}

TEST_F(UpdaterV1Test, TimetablesOfAnAttemptThatWasBrokenOffAreReplaced) {
    FakeSchedEntry left;
    left.app = "KELD.KDS.Ferrix.Application";
    m_fake.AddSchedEntry(left);
    left.app = "other";
    m_fake.AddSchedEntry(left);
    ASSERT_EQ(0, Run());
    const std::map<int, FakeSchedEntry> entries = m_fake.SchedEntries();
    EXPECT_EQ(4U, entries.size());
    EXPECT_FALSE(entries.contains(1));
    EXPECT_EQ("other", entries.at(2).app);
    EXPECT_EQ("3|4|5", Read("SELECT schedule_id FROM task_info_table;"));
}

}  // namespace
