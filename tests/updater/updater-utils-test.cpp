#include "updater/updater-utils.h"

#include "db/sqlite-util.h"
#include "updater/updater-fixture.h"

namespace {

class UpdaterUtilsTest : public UpdaterTest {
protected:
    UpdaterUtilsTest() {
        RawDatabase(m_path).Run(
            "CREATE TABLE config_table ( key TEXT PRIMARY KEY, value TEXT NOT NULL );");
    }
    std::string m_path = m_dir / "some.db";
};

int Append(const SqlQuery& row, void* context) {
    *static_cast<std::string*>(context) += row.Text(0) + ";";
    return 0;
}

int Refuse(const SqlQuery& /*row*/, void* context) {
    ++*static_cast<int*>(context);
    return -1;
}

TEST_F(UpdaterUtilsTest, TheVersionIsRead) {
    RawDatabase(m_path).Run("INSERT INTO config_table VALUES ('version', 2);");
    unsigned version = 0;
    EXPECT_EQ(1, GetDBVersion(m_path, version));
    EXPECT_EQ(2U, version);
}

TEST_F(UpdaterUtilsTest, AFileWithoutAVersionGivesNone) {
    unsigned version = 17;
    EXPECT_EQ(0, GetDBVersion(m_path, version));
    RawDatabase(m_path).Run("INSERT INTO config_table VALUES ('version', 'two');");
    EXPECT_EQ(0, GetDBVersion(m_path, version));
    EXPECT_EQ(17U, version);
}

TEST_F(UpdaterUtilsTest, WhatIsNoDatabaseHasNoVersion) {
    unsigned version = 17;
    EXPECT_EQ(-1, GetDBVersion("", version));
    EXPECT_TRUE(m_log.Has("[ERR] db path is empty"));
    EXPECT_EQ(-1, GetDBVersion(m_dir / "none", version));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to open db at '" + (m_dir / "none") +
                          "'. [14] unable to open database file"));
    EXPECT_FALSE(std::filesystem::exists(m_dir / "none"));
    EXPECT_EQ(-1, GetDBVersion(m_dir.Write("text", std::string(4096, 'x')), version));
    EXPECT_TRUE(m_log.Has("[ERR] sqlite3_prepare_v2: [26] file is not a database"));
    EXPECT_EQ(17U, version);
}

TEST_F(UpdaterUtilsTest, ATransactionIsDoneAsAWhole) {
    EXPECT_EQ(0, ExecInTransaction(m_path,
                                   "INSERT INTO config_table VALUES ('a', 1);"
                                   "INSERT INTO config_table VALUES ('b', 2);"));
    EXPECT_EQ(-1, ExecInTransaction(m_path,
                                    "INSERT INTO config_table VALUES ('c', 3);"
                                    "INSERT INTO config_table VALUES ('a', 4);"));
    EXPECT_TRUE(m_log.Has("[ERR] sqlite3_exec: [19] UNIQUE constraint failed: config_table.key"));
    EXPECT_EQ("a=1|b=2", RawDatabase(m_path).Read("SELECT key || '=' || value FROM config_table;"));
}

TEST_F(UpdaterUtilsTest, AFailureThatHasEndedTheTransactionIsToldOnce) {
    EXPECT_EQ(-1,
              ExecInTransaction(m_path, "INSERT OR ROLLBACK INTO config_table VALUES (1, NULL);"));
    EXPECT_EQ(1U, m_log.Lines().size());
}

TEST_F(UpdaterUtilsTest, EmptyArgumentsAreRefused) {
    EXPECT_EQ(-1, ExecInTransaction("", "SELECT 1;"));
    EXPECT_EQ(-1, ExecInTransaction(m_path, ""));
    EXPECT_EQ(-1, QueryEach("", "SELECT 1;", Append, nullptr));
    EXPECT_EQ(-1, QueryEach(m_path, "", Append, nullptr));
    EXPECT_EQ(4, m_log.Count("[ERR] Invalid Parameter"));
}

TEST_F(UpdaterUtilsTest, ATransactionMakesNoFile) {
    EXPECT_EQ(-1, ExecInTransaction(m_dir / "none", "CREATE TABLE t (a);"));
    EXPECT_FALSE(std::filesystem::exists(m_dir / "none"));
}

TEST_F(UpdaterUtilsTest, EveryRowIsHandedOver) {
    RawDatabase(m_path).Run("INSERT INTO config_table VALUES ('a', 1), ('b', 2), ('c', 3);");
    std::string keys;
    EXPECT_EQ(0, QueryEach(m_path, "SELECT key FROM config_table ORDER BY key;", Append, &keys));
    EXPECT_EQ("a;b;c;", keys);
}

TEST_F(UpdaterUtilsTest, ACallbackEndsTheQuery) {
    RawDatabase(m_path).Run("INSERT INTO config_table VALUES ('a', 1), ('b', 2);");
    int calls = 0;
    EXPECT_EQ(-1, QueryEach(m_path, "SELECT key FROM config_table;", Refuse, &calls));
    EXPECT_EQ(1, calls);
}

TEST_F(UpdaterUtilsTest, AQueryThatFailsIsTold) {
    std::string keys;
    EXPECT_EQ(-1, QueryEach(m_path, "SELECT no FROM config_table;", Append, &keys));
    EXPECT_TRUE(m_log.Has("[ERR] sqlite3_prepare_v2: [1] no such column: no"));
    RawDatabase(m_path).Run("INSERT INTO config_table VALUES ('a', 1);");
    EXPECT_EQ(-1, QueryEach(m_path, "SELECT abs(-9223372036854775807 - 1) FROM config_table;",
                            Append, &keys));
    EXPECT_TRUE(m_log.Has("[ERR] sqlite3_step: [1] integer overflow"));
}

}  // namespace
