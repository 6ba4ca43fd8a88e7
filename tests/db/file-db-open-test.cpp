// Opening a file database: a fresh one, one of the older form, and those that must be refused.
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <thread>

#include "db/file-db-fixture.h"

namespace {

// As an older program made it.
const char* const OLD_FORM =
    "PRAGMA journal_mode = WAL;"
    "CREATE TABLE config_table ( key TEXT PRIMARY KEY, value TEXT NOT NULL );"
    "CREATE TABLE file_info_table ( id INTEGER PRIMARY KEY, source_path TEXT UNIQUE NOT NULL, "
    "destination_path TEXT NOT NULL, file_type INTEGER NOT NULL, size INTEGER NOT NULL, mtime "
    "INTEGER NOT NULL );"
    "CREATE INDEX file_info_table_src_path_idx on file_info_table(source_path);"
    "CREATE INDEX file_info_table_dst_path_idx on file_info_table(destination_path);"
    "INSERT into config_table VALUES ('version', 1);"
    "INSERT INTO file_info_table VALUES (1, '/a', '/x/a', 0, 5, 6);"
    "INSERT INTO file_info_table VALUES (2, '/d', '/d', 1, 0, 0);";

class FileDBOpenTest : public testing::Test {
protected:
    std::string Content() { return ReadWholeFile(m_path); }

    TempDir m_dir;
    const std::string m_path = m_dir / "file-db.sqlite";
    LogCapture m_log;
    FileDB m_db;
};

TEST_F(FileDBOpenTest, AFreshFileHasTheDocumentedTables) {
    ASSERT_EQ(0, m_db.Init(m_path));
    EXPECT_TRUE(
        m_log.Has("[INFO] File db is initialized successfully at location '" + m_path + "'"));
    RawDatabase raw(m_path);
    EXPECT_EQ("wal", raw.Read("PRAGMA journal_mode"));
    EXPECT_EQ("1", raw.Read("SELECT value FROM config_table WHERE key = 'version'"));
    EXPECT_EQ("key TEXT 0 1|value TEXT 1 0",
              raw.Read("SELECT name || ' ' || type || ' ' || \"notnull\" || ' ' || pk FROM "
                       "pragma_table_info('config_table')"));
    EXPECT_EQ(
        "id INTEGER 0 1|source_path TEXT 1 0|destination_path TEXT 1 0|file_type INTEGER 1 0|"
        "size INTEGER 1 0|mtime INTEGER 1 0",
        raw.Read("SELECT name || ' ' || type || ' ' || \"notnull\" || ' ' || pk FROM "
                 "pragma_table_info('file_info_table')"));
    EXPECT_EQ(
        "file_info_dst_path_idx destination_path|file_info_src_path_idx source_path",
        raw.Read("SELECT il.name || ' ' || ii.name FROM pragma_index_list('file_info_table') il, "
                 "pragma_index_info(il.name) ii WHERE il.origin = 'c' ORDER BY il.name"));
    struct stat info {};
    EXPECT_EQ(0, stat(m_path.c_str(), &info));
    EXPECT_EQ(0600U, info.st_mode & 07777);
}

TEST_F(FileDBOpenTest, OpeningTwiceKeepsTheFirstFile) {
    ASSERT_EQ(0, m_db.Init(m_path));
    EXPECT_EQ(0, m_db.Init(m_dir / "other.sqlite"));
    EXPECT_TRUE(m_log.Has("[INFO] File DB has been inited"));
    EXPECT_NE(0, access((m_dir / "other.sqlite").c_str(), F_OK));
}

TEST_F(FileDBOpenTest, AFolderThatIsNotThereIsRefused) {
    const std::string path = m_dir / "no/file-db.sqlite";
    EXPECT_EQ(-1, m_db.Init(path));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to create file db at '" + path +
                          "'. [14] unable to open database file"));
    EXPECT_EQ(0, m_db.Init(m_path)) << "and may be tried again";
}

TEST_F(FileDBOpenTest, AFileOfTheOlderFormKeepsItsRowsAndItsVersion) {
    RawDatabase(m_path).Run(OLD_FORM);
    ASSERT_EQ(0, m_db.Init(m_path));
    FileInfo info;
    EXPECT_EQ(1, m_db.GetFileInfoBySourcePath("/a", info));
    EXPECT_EQ("/x/a", info.destination_path);
    EXPECT_EQ(0, m_db.SetFileInfoBySourcePath({"/b", "/b", FILE_INFO_FILE, 1, 1}));
    RawDatabase raw(m_path);
    EXPECT_EQ("1", raw.Read("SELECT value FROM config_table WHERE key = 'version'"));
    EXPECT_EQ(
        "file_info_dst_path_idx|file_info_src_path_idx|file_info_table_dst_path_idx|"
        "file_info_table_src_path_idx",
        raw.Read("SELECT name FROM pragma_index_list('file_info_table') WHERE origin = 'c' "
                 "ORDER BY name"));
    EXPECT_EQ("3", raw.Read("SELECT COUNT(*) FROM file_info_table"));
}

TEST_F(FileDBOpenTest, AFileThatWasBroughtToVersionTwoStaysThere) {
    RawDatabase(m_path).Run(std::string(OLD_FORM) +
                            "DROP INDEX file_info_table_src_path_idx; DROP INDEX "
                            "file_info_table_dst_path_idx; UPDATE config_table SET value = 2;");
    ASSERT_EQ(0, m_db.Init(m_path));
    EXPECT_EQ("2", RawDatabase(m_path).Read("SELECT value FROM config_table"));
    FileInfo info;
    EXPECT_EQ(1, m_db.GetFileInfoBySourcePath("/d", info));
}

TEST_F(FileDBOpenTest, TriggersOfAnEarlierProgramAreMadeAnew) {
    RawDatabase(m_path).Run(
        std::string(OLD_FORM) +
        "CREATE TABLE unproven_table ( id INTEGER PRIMARY KEY, flush INTEGER NOT NULL );"
        "CREATE TABLE flush_table ( id INTEGER PRIMARY KEY, flush INTEGER NOT NULL );"
        "INSERT INTO flush_table VALUES (1, 7);"
        "CREATE TRIGGER file_info_insert_trigger AFTER INSERT ON file_info_table"
        " WHEN NEW.file_type = 0 BEGIN DELETE FROM unproven_table WHERE id = NEW.id;"
        "  INSERT INTO unproven_table SELECT NEW.id, flush FROM flush_table; END;"
        "CREATE TRIGGER file_info_update_trigger AFTER UPDATE ON file_info_table"
        " WHEN NEW.file_type = 0 BEGIN DELETE FROM unproven_table WHERE id = NEW.id;"
        "  INSERT INTO unproven_table SELECT NEW.id, flush FROM flush_table; END;");
    ASSERT_EQ(0, m_db.Init(m_path));
    EXPECT_EQ(0, m_db.SetFileInfoBySourcePath({"/new", "/new", FILE_INFO_DIR, 0, 0}));
    EXPECT_EQ(0, m_db.SetFileInfoBySourcePath({"/d", "/elsewhere", FILE_INFO_DIR, 0, 0}));
    RawDatabase raw(m_path);
    EXPECT_EQ("/d|/new", raw.Read("SELECT source_path FROM file_info_table JOIN unproven_table "
                                  "USING (id) ORDER BY source_path"));
    EXPECT_EQ("2", raw.Read("SELECT COUNT(*) FROM sqlite_master WHERE type = 'trigger'"));
}

TEST_F(FileDBOpenTest, OpeningAgainChangesNoTable) {
    ASSERT_EQ(0, m_db.Init(m_path));
    m_db.Close();
    const std::string before = RawDatabase(m_path).Read("PRAGMA schema_version");
    ASSERT_EQ(0, m_db.Init(m_path));
    EXPECT_EQ(before, RawDatabase(m_path).Read("PRAGMA schema_version"));
}

TEST_F(FileDBOpenTest, WhatIsNoDatabaseIsRefusedAndLeftAsItIs) {
    m_dir.Write("file-db.sqlite", std::string(5000, 'x'));
    EXPECT_EQ(-1, m_db.Init(m_path));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to create file db table at '" + m_path +
                          "'. [26] file is not a database"));
    EXPECT_EQ(std::string(5000, 'x'), Content());
}

TEST_F(FileDBOpenTest, ADamagedTableIsRefusedOrFailsAndLosesNothing) {
    {
        RawDatabase raw(m_path);
        raw.Run(OLD_FORM);
        raw.Run("PRAGMA wal_checkpoint(TRUNCATE); PRAGMA journal_mode = DELETE;");
    }
    std::string damaged = Content();
    ASSERT_LT(8192U, damaged.size());
    for (size_t at = 4096; at < damaged.size(); ++at)
        damaged[at] = '\x5a';  // all but the first page
    m_dir.Write("file-db.sqlite", damaged);
    EXPECT_EQ(-1, m_db.Init(m_path));
    EXPECT_TRUE(m_log.Contains("malformed"));
    EXPECT_EQ(damaged.substr(4096), Content().substr(4096));
}

TEST_F(FileDBOpenTest, ATableWithOtherColumnsIsRefusedWithItsRows) {
    RawDatabase(m_path).Run(
        "CREATE TABLE file_info_table ( id INTEGER PRIMARY KEY, source_path TEXT "
        "UNIQUE NOT NULL, destination_path TEXT, file_type INTEGER );"
        "INSERT INTO file_info_table VALUES (1, '/a', '/b', 0);");
    EXPECT_EQ(-1, m_db.Init(m_path));
    EXPECT_TRUE(m_log.Contains("Failed to create file db table at '" + m_path + "'. [1] "));
    EXPECT_EQ("/a", RawDatabase(m_path).Read("SELECT source_path FROM file_info_table"));
    FileInfo info;
    EXPECT_EQ(-1, m_db.GetFileInfoBySourcePath("/a", info)) << "closed";
}

TEST_F(FileDBOpenTest, AReadOnlyFileIsRefused) {
    RawDatabase(m_path).Run(std::string(OLD_FORM) + "PRAGMA journal_mode = DELETE;");
    const std::string before = Content();
    ASSERT_EQ(0, chmod(m_path.c_str(), 0444));
    ASSERT_EQ(0, chmod(m_dir.Path().c_str(), 0555));
    const pid_t child = fork();
    if (child == 0) {
        // Root may write to everything.
        if (geteuid() == 0 && seteuid(65534) != 0) _exit(9);
        _exit(m_db.Init(m_path) == -1 && m_log.Contains("readonly") ? 0 : 1);
    }
    int status = -1;
    EXPECT_EQ(child, waitpid(child, &status, 0));
    EXPECT_TRUE(WIFEXITED(status));
    EXPECT_EQ(0, WEXITSTATUS(status));
    chmod(m_dir.Path().c_str(), 0755);
    EXPECT_EQ(before, Content());
}

TEST_F(FileDBOpenTest, ALockedFileIsWaitedFor) {
    RawDatabase other(m_path);
    other.Run(OLD_FORM);
    other.Run("BEGIN IMMEDIATE;");
    int result = -1;
    std::thread opener([&] { result = m_db.Init(m_path); });
    LetOtherThreadMeetTheLock();
    other.Run("INSERT INTO file_info_table VALUES (3, '/c', '/c', 1, 0, 0); COMMIT;");
    opener.join();
    EXPECT_EQ(0, result);
    FileInfo info;
    EXPECT_EQ(1, m_db.GetFileInfoBySourcePath("/c", info));
}

TEST_F(FileDBOpenTest, ALockedFileIsWaitedForInAWrite) {
    ASSERT_EQ(0, m_db.Init(m_path));
    RawDatabase other(m_path);
    other.Run("BEGIN IMMEDIATE;");
    int result = -1;
    std::thread writer([&] {
        result = m_db.SetFileInfoBySourcePath({"/a", "/a", FILE_INFO_FILE, 1, 1});
    });
    LetOtherThreadMeetTheLock();
    other.Run("COMMIT;");
    writer.join();
    EXPECT_EQ(0, result);
}

TEST_F(FileDBOpenTest, WithoutMemoryNothingOpens) {
    RawDatabase(m_path).Run(OLD_FORM);
    {
        const NoSqliteMemory none;
        EXPECT_EQ(-1, m_db.Init(m_path));
    }
    EXPECT_EQ(0, m_db.Init(m_path));
}

TEST_F(FileDBOpenTest, ManyThreadsShareOneDatabase) {
    ASSERT_EQ(0, m_db.Init(m_path));
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([this, t] {
            for (int n = 0; n < 100; ++n) {
                const std::string path = "/" + std::to_string(t) + "/" + std::to_string(n);
                FileInfo info;
                EXPECT_EQ(0, m_db.SetFileInfoBySourcePath({path, path, FILE_INFO_FILE, 1, 1}));
                EXPECT_EQ(1, m_db.GetFileInfoByDestinationPath(path, info));
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ("400", RawDatabase(m_path).Read("SELECT COUNT(*) FROM file_info_table"));
}

}  // namespace
