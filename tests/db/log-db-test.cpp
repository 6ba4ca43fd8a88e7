// LogDB: its schema, opening, rows and their limit.
#include "db/log-db.h"

#include <fstream>
#include <thread>

#include "db/log-db-fixture.h"

namespace {

// --- Opening

TEST_F(LogDBTest, SchemaStandsAsDocumented) {
    EXPECT_EQ("wal", Raw("PRAGMA journal_mode"));
    EXPECT_EQ("log_rotate_count=100000|version=1",
              Raw("SELECT key || '=' || value FROM config_table ORDER BY key"));
    EXPECT_EQ(
        "id INTEGER 0|task_id INTEGER 1|log_type INTEGER 1|timestamp INTEGER 1|"
        "description_id INTEGER 1|description_param TEXT 1|error INTEGER 1",
        Raw("SELECT name || ' ' || type || ' ' || \"notnull\" FROM "
            "pragma_table_info('log_info_table')"));
    EXPECT_EQ(
        "CREATE INDEX log_info_table_description_id_idx on log_info_table(description_id)|"
        "CREATE INDEX log_info_table_description_param_idx on log_info_table(description_param)|"
        "CREATE INDEX log_info_table_log_type_idx on log_info_table(log_type)|"
        "CREATE INDEX log_info_table_task_id_idx on log_info_table(task_id)|"
        "CREATE INDEX log_info_table_timestamp_idx on log_info_table(timestamp)",
        Raw("SELECT sql FROM sqlite_master WHERE type = 'index' AND sql IS NOT NULL ORDER BY "
            "name"));
    EXPECT_EQ("add_log_info_rotate_trigger|log_rotate_trigger",
              Raw("SELECT name FROM sqlite_master WHERE type = 'trigger' ORDER BY name"));
}

// What is settled for a connection alone leaves no trace in the file.
TEST_F(LogDBTest, OpeningSettlesTheConnectionAndMakesTheSchemaInOneTransaction) {
    LogDB db;
    const StatementTrace trace;
    ASSERT_EQ(0, db.Init(m_dir / "fresh.sqlite"));
    EXPECT_EQ((std::vector<std::string>{
                  "PRAGMA journal_mode = WAL;", "PRAGMA synchronous = NORMAL;",
                  "PRAGMA recursive_triggers = true;", "BEGIN IMMEDIATE;", "COMMIT;"}),
              trace.Framing());
    db.Close();
}

TEST_F(LogDBTest, InitSaysWhereTheFileIs) {
    LogDB db;
    const LogCapture log;
    const std::string path = m_dir / "other.sqlite";
    EXPECT_EQ(0, db.Init(path));
    EXPECT_TRUE(log.Has("[DBG] Log db is initialized successfully at location '" + path + "'"));
}

TEST_F(LogDBTest, InitTwiceKeepsTheFirstHandle) {
    const LogCapture log;
    const std::string second = m_dir / "second.sqlite";
    EXPECT_EQ(0, m_db.Init(second));
    EXPECT_TRUE(log.Has("[INFO] Task DB has been inited"));
    EXPECT_FALSE(std::ifstream(second).is_open());
    AddRows(1, 1);
    EXPECT_EQ("1", Raw("SELECT COUNT(*) FROM log_info_table"));
}

TEST_F(LogDBTest, OpeningAnExistingFileKeepsItsRowsAndItsLimit) {
    AddRows(1, 9);
    ASSERT_EQ(0, m_db.SetRotateCount(7));
    m_db.Close();
    ASSERT_EQ(0, m_db.Init(m_path));
    uint64_t count = 0;
    EXPECT_EQ(0, m_db.GetRotateCount(count));
    EXPECT_EQ(7u, count);
    EXPECT_EQ("7", Raw("SELECT COUNT(*) FROM log_info_table"));
}

TEST_F(LogDBTest, MissingFolderFails) {
    LogDB db;
    const LogCapture log;
    EXPECT_EQ(-1, db.Init("/no-such-folder/log-db.sqlite"));
    EXPECT_TRUE(
        log.Has("[ERR] Failed to create log db at '/no-such-folder/log-db.sqlite'. [14] "
                "unable to open database file"));
}

TEST_F(LogDBTest, FileThatIsNoDatabaseFailsAndInitMayBeTriedElsewhere) {
    LogDB db;
    const LogCapture log;
    const std::string path = m_dir.Write("text", std::string(5000, 'x'));
    EXPECT_EQ(-1, db.Init(path));
    EXPECT_TRUE(log.Has("[ERR] Failed to create log db table at '" + path +
                        "'. [26] file is not a database"));
    EXPECT_EQ(0, db.Init(m_dir / "fresh.sqlite"));
}

TEST_F(LogDBTest, RowWaitsForAnotherConnectionsTransaction) {
    RawDatabase other(m_path);
    other.Run("BEGIN IMMEDIATE");
    std::thread writer([&] { AddRows(2, 2); });
    LetOtherThreadMeetTheLock();
    other.Run("INSERT INTO log_info_table VALUES ( 1, 1, 1, 1, 0, '', 0 ); COMMIT");
    writer.join();
    EXPECT_EQ("1|2", Raw("SELECT timestamp FROM log_info_table ORDER BY id"));
}

TEST_F(LogDBTest, EveryOperationFailsWhileClosed) {
    m_db.Close();
    m_db.Close();
    uint64_t count = 5;
    std::vector<LogInfo> rows(1);
    EXPECT_EQ(-1, m_db.AddLogInfo(Row(1, 1)));
    EXPECT_EQ(-1, m_db.SetRotateCount(5));
    EXPECT_EQ(-1, m_db.GetRotateCount(count));
    EXPECT_EQ(-1, m_db.CountLogInfo(Everything(), count));
    EXPECT_EQ(-1, m_db.ListLogInfo(Everything(), rows));
    EXPECT_EQ(5u, count);
    EXPECT_EQ(1u, rows.size());
}

TEST_F(LogDBTest, StatementsFailWithoutMemory) {
    const LogInfo row = Row(1, 1);
    const LogCapture log;
    int added = 0;
    int set = 0;
    {
        const NoSqliteMemory no_memory;
        added = m_db.AddLogInfo(row);
        set = m_db.SetRotateCount(5);
    }
    EXPECT_EQ(-1, added);
    EXPECT_EQ(-1, set);
    EXPECT_TRUE(
        log.Has("[ERR] sqlite3_mprintf: return NULL\n INSERT INTO log_info_table ( "
                "task_id, log_type, timestamp, description_id, description_param, error ) "
                "VALUES  ( %llu, %d, %u, %u, %Q,  %d  );"));
    EXPECT_TRUE(
        log.Has("[ERR] sqlite3_mprintf: return NULL\n UPDATE config_table SET  value = "
                "%llu  WHERE key = 'log_rotate_count' ;"));
}

TEST_F(LogDBTest, InstanceIsOne) { EXPECT_EQ(&LogDB::GetInstance(), &LogDB::GetInstance()); }

// --- Rows

TEST_F(LogDBTest, RowReadsBackAsItWasAdded) {
    LogInfo info = Row(9223372036854775807u, 4294967295u, LogDescription::LOG_DESC_FILE_FAILED,
                       "it's 50% \"odd\"\n");
    info.SetError(-23);
    Add(info);
    std::vector<LogInfo> rows;
    ASSERT_EQ(0, m_db.ListLogInfo(Everything(), rows));
    ASSERT_EQ(1u, rows.size());
    EXPECT_EQ(info.task_id, rows[0].task_id);
    EXPECT_EQ(4, rows[0].log_type);
    EXPECT_EQ(4294967295u, rows[0].timestamp);
    EXPECT_EQ(1000, rows[0].description_id);
    EXPECT_EQ(info.description_param, rows[0].description_param);
    EXPECT_EQ(-23, rows[0].error);
}

TEST_F(LogDBTest, RefusedRowIsAFailure) {
    RawDatabase(m_path).Run("DROP TABLE log_info_table");
    const LogCapture log;
    EXPECT_EQ(-1, m_db.AddLogInfo(Row(1, 1)));
    EXPECT_TRUE(log.Has("[ERR] sqlite3_exec: [1] no such table: log_info_table"));
}

// --- The limit

TEST_F(LogDBTest, AtTheLimitTheOldestRowGoesAndIdsKeepRising) {
    ASSERT_EQ(0, m_db.SetRotateCount(5));
    AddRows(1, 5);
    EXPECT_EQ("1|2|3|4|5", Raw("SELECT timestamp FROM log_info_table ORDER BY id"));
    AddRows(6, 6);
    EXPECT_EQ("2|3|4|5|6", Raw("SELECT timestamp FROM log_info_table ORDER BY id"));
    AddRows(7, 20);
    EXPECT_EQ("16|17|18|19|20", Raw("SELECT id FROM log_info_table ORDER BY id"));
}

TEST_F(LogDBTest, IdsAreNotUsedAgainAfterTheTableWasEmptied) {
    AddRows(1, 3);
    RawDatabase(m_path).Run("DELETE FROM log_info_table");
    AddRows(4, 4);
    EXPECT_EQ("4", Raw("SELECT id FROM log_info_table"));
}

TEST_F(LogDBTest, LimitOutsideItsBoundsIsRefused) {
    uint64_t count = 0;
    for (const uint64_t bad : {uint64_t{0}, uint64_t{4}, uint64_t{100001}, UINT64_MAX}) {
        const LogCapture log;
        EXPECT_EQ(-1, m_db.SetRotateCount(bad));
        EXPECT_EQ(
            std::vector<std::string>{"[ERR] Invalid rotation count '" + std::to_string(bad) + "'"},
            log.Lines());
        EXPECT_EQ(0, m_db.GetRotateCount(count));
        EXPECT_EQ(100000u, count);
    }
}

TEST_F(LogDBTest, BothBoundsPass) {
    uint64_t count = 0;
    EXPECT_EQ(0, m_db.SetRotateCount(5));
    EXPECT_EQ(0, m_db.GetRotateCount(count));
    EXPECT_EQ(5u, count);
    EXPECT_EQ(0, m_db.SetRotateCount(100000));
    EXPECT_EQ(0, m_db.GetRotateCount(count));
    EXPECT_EQ(100000u, count);
}

TEST_F(LogDBTest, LoweringTheLimitKeepsTheNewestRows) {
    AddRows(1, 10);
    EXPECT_EQ(0, m_db.SetRotateCount(5));
    EXPECT_EQ("6|7|8|9|10", Raw("SELECT timestamp FROM log_info_table ORDER BY id"));
}

TEST_F(LogDBTest, LimitsAreComparedAsNumbers) {
    AddRows(1, 12);
    EXPECT_EQ(0, m_db.SetRotateCount(20));
    EXPECT_EQ(0, m_db.SetRotateCount(9));  // the text "9" is above "20"
    EXPECT_EQ("9", Raw("SELECT COUNT(*) FROM log_info_table"));
}

TEST_F(LogDBTest, RaisingTheLimitRemovesNothing) {
    ASSERT_EQ(0, m_db.SetRotateCount(5));
    AddRows(1, 5);
    EXPECT_EQ(0, m_db.SetRotateCount(100));
    AddRows(6, 6);
    EXPECT_EQ("6", Raw("SELECT COUNT(*) FROM log_info_table"));
}

TEST_F(LogDBTest, OtherSettingsDoNotRotate) {
    AddRows(1, 10);
    RawDatabase(m_path).Run("UPDATE config_table SET value = 0 WHERE key = 'version'");
    EXPECT_EQ("10", Raw("SELECT COUNT(*) FROM log_info_table"));
}

TEST_F(LogDBTest, MissingLimitReadsAsZeroAndKeepsAllRows) {
    RawDatabase(m_path).Run("DELETE FROM config_table WHERE key = 'log_rotate_count'");
    uint64_t count = 5;
    const LogCapture log;
    EXPECT_EQ(0, m_db.GetRotateCount(count));
    EXPECT_EQ(0u, count);
    EXPECT_TRUE(
        log.Has("[DBG] sql = 'SELECT value FROM config_table WHERE key = 'log_rotate_count'; \n'"));
    AddRows(1, 3);
    EXPECT_EQ("3", Raw("SELECT COUNT(*) FROM log_info_table"));
}

TEST_F(LogDBTest, ReadingTheLimitWithoutItsTableFails) {
    RawDatabase(m_path).Run("DROP TABLE config_table");
    uint64_t count = 5;
    const LogCapture log;
    EXPECT_EQ(-1, m_db.GetRotateCount(count));
    EXPECT_TRUE(log.Has("[ERR] sqlite3_step: [1] no such table: config_table"))
        << "the connection learns of the change by the first statement";
    EXPECT_EQ(-1, m_db.GetRotateCount(count));
    EXPECT_TRUE(log.Has("[ERR] sqlite3_prepare_v2: [1] no such table: config_table"));
    EXPECT_EQ(5u, count);
    EXPECT_EQ(-1, m_db.SetRotateCount(5));
    EXPECT_TRUE(log.Has("[ERR] sqlite3_exec: [1] no such table: config_table"));
}

}  // namespace
