#include "db/sqlite-util.h"

#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <memory>
#include <thread>

#include "db/raw-database.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace {

mode_t ModeOf(const std::string& path) {
    struct stat info;
    EXPECT_EQ(0, stat(path.c_str(), &info)) << path;
    return info.st_mode & 07777;
}

class SqliteUtilTest : public testing::Test {
protected:
    SqliteUtilTest() : m_old_mask(umask(0)) {}
    ~SqliteUtilTest() override { umask(m_old_mask); }

    TempDir m_dir;
    mode_t m_old_mask;
};

constexpr char kScript[] = "PRAGMA journal_mode = WAL; CREATE TABLE IF NOT EXISTS t ( a TEXT );";

TEST_F(SqliteUtilTest, NewFileAndItsSideFilesBelongToTheirOwnerAloneUnderUmaskZero) {
    const std::string path = m_dir / "x.sqlite";
    const DatabaseOpenResult result = OpenDatabase(path, kScript);
    ASSERT_EQ(DatabaseOpenResult::DONE, result.failed_step);
    ASSERT_EQ(0, ExecSql(result.db, "INSERT INTO t VALUES ( 'b' );"));
    EXPECT_EQ(0600u, ModeOf(path));
    EXPECT_EQ(0600u, ModeOf(path + "-wal"));
    EXPECT_EQ(0600u, ModeOf(path + "-shm"));
    sqlite3_close_v2(result.db);
}

TEST_F(SqliteUtilTest, OthersLoseTheRightToWriteToAnExistingFile) {
    const std::string path = m_dir.Write("x.sqlite", "");
    ASSERT_EQ(0, chmod(path.c_str(), 0666));
    const DatabaseOpenResult result = OpenDatabase(path, kScript);
    ASSERT_EQ(DatabaseOpenResult::DONE, result.failed_step);
    EXPECT_EQ(0644u, ModeOf(path));
    EXPECT_EQ(0644u, ModeOf(path + "-wal"));
    sqlite3_close_v2(result.db);
}

// sqlite does not wait for other connections there.
TEST_F(SqliteUtilTest, AScriptThatLeavesTheLogModeWaitsForOthersAndNotForEver) {
    const std::string path = m_dir / "x.sqlite";
    auto other = std::make_unique<RawDatabase>(path);
    other->Run(kScript);
    const DatabaseOpenResult result = OpenDatabase(path, "");
    ASSERT_EQ(DatabaseOpenResult::DONE, result.failed_step);
    constexpr char leave[] = "SELECT COUNT(*) FROM t; PRAGMA journal_mode = DELETE;";
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(SQLITE_BUSY, RunSqlScript(result.db, leave, 50));
    EXPECT_LE(std::chrono::milliseconds(50), std::chrono::steady_clock::now() - start);
    std::thread program([&] {
        LetOtherThreadMeetTheLock();
        other.reset();
    });
    EXPECT_EQ(SQLITE_OK, RunSqlScript(result.db, leave, 60000));
    program.join();
    EXPECT_NE(0, access((path + "-wal").c_str(), F_OK));
    sqlite3_close_v2(result.db);
}

TEST_F(SqliteUtilTest, OpeningKeepsTheLocksOfOtherConnectionsOfThisProcess) {
    const std::string path = m_dir / "x.sqlite";
    RawDatabase other(path);
    other.Run("CREATE TABLE t ( a TEXT ); BEGIN EXCLUSIVE; INSERT INTO t VALUES ( 'b' );");
    // The script does not touch the file, so that it need not wait for the lock.
    const DatabaseOpenResult result = OpenDatabase(path, "");
    ASSERT_EQ(DatabaseOpenResult::DONE, result.failed_step);
    // A lock that was lost would let this connection in.
    sqlite3_busy_timeout(result.db, 0);
    EXPECT_EQ(SQLITE_BUSY, sqlite3_exec(result.db, "BEGIN EXCLUSIVE", nullptr, nullptr, nullptr));
    sqlite3_close_v2(result.db);
}

TEST_F(SqliteUtilTest, LockedFileIsWaitedForUpToFiveMinutes) {
    const DatabaseOpenResult result = OpenDatabase(m_dir / "x.sqlite", kScript);
    {
        SqlQuery query;
        ASSERT_EQ(0, query.Prepare(result.db, "PRAGMA busy_timeout"));
        ASSERT_EQ(1, query.Step());
        EXPECT_EQ(300000, query.Int(0));
    }
    sqlite3_close_v2(result.db);
}

TEST_F(SqliteUtilTest, FailedScriptLeavesNothingBehindButTheFile) {
    const std::string path = m_dir / "x.sqlite";
    const DatabaseOpenResult result =
        OpenDatabase(path, "BEGIN; CREATE TABLE t ( a TEXT ); SELECT * FROM missing; COMMIT;");
    EXPECT_EQ(DatabaseOpenResult::SCHEMA, result.failed_step);
    EXPECT_EQ(SQLITE_ERROR, result.code);
    EXPECT_EQ("no such table: missing", result.message);
    EXPECT_EQ(nullptr, result.db);
    EXPECT_EQ("0", RawDatabase(path).Read("SELECT COUNT(*) FROM sqlite_master"));
}

TEST_F(SqliteUtilTest, FormatThatFindsNoMemoryIsLoggedAndFails) {
    const LogCapture log;
    UniqueSqlText text;
    int result = 0;
    {
        const NoSqliteMemory no_memory;
        text = FormatSql("SELECT %Q", "a");
        result = ExecFormattedSql(nullptr, "DELETE %d", 1);
    }
    EXPECT_EQ(nullptr, text);
    EXPECT_EQ(-1, result);
    EXPECT_EQ((std::vector<std::string>{"[ERR] sqlite3_mprintf: return NULL\nSELECT %Q",
                                        "[ERR] sqlite3_mprintf: return NULL\nDELETE %d"}),
              log.Lines());
}

TEST_F(SqliteUtilTest, StatementsOfAClosedConnectionFailAndSaySo) {
    const LogCapture log;
    SqlQuery query;
    EXPECT_EQ(-1, ExecSql(nullptr, "SELECT 1"));
    EXPECT_EQ(-1, query.Prepare(nullptr, "SELECT 1"));
    EXPECT_EQ((std::vector<std::string>{
                  "[ERR] sqlite3_exec: [21] bad parameter or other API misuse",
                  "[ERR] sqlite3_prepare_v2: [21] bad parameter or other API misuse"}),
              log.Lines());
}

TEST_F(SqliteUtilTest, ColumnsReadAsTheirTypesAndNullAsTheEmptyValue) {
    const DatabaseOpenResult result = OpenDatabase(m_dir / "x.sqlite", kScript);
    {
        SqlQuery query;
        ASSERT_EQ(0, query.Prepare(result.db,
                                   "SELECT NULL, 4294967296, -7, x'610062', 9223372036854775807"));
        ASSERT_EQ(1, query.Step());
        EXPECT_EQ("", query.Text(0));
        EXPECT_EQ(0, query.Int64(0));
        EXPECT_FALSE(query.Bool(0));
        EXPECT_TRUE(query.Bool(1)) << "a value whose low 32 bits are 0";
        EXPECT_TRUE(query.Bool(2));
        EXPECT_EQ(-7, query.Int(2));
        EXPECT_EQ(std::string("a\0b", 3), query.Text(3));
        EXPECT_EQ(9223372036854775807u, query.UInt64(4));
        EXPECT_EQ(0, query.Step());
    }
    sqlite3_close_v2(result.db);
}

}  // namespace
