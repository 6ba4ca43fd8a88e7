// What the copy of a file does when its name cannot be found out, and which line tells it.
#include <filesystem>

#include "db/file-db.h"
#include "db/raw-database.h"
#include "inc-backup-fixture.h"
#include "time-faults.h"
#include "utils/error-code.h"

namespace fs = std::filesystem;

namespace {

using testing::IsEmpty;

class IncBackupFailureTest : public IncBackupFixture {
protected:
    void Sql(const std::string& sql) { RawDatabase(FileDBPath()).Run(sql); }
    void ExpectFailure(const std::string& path, const std::string& line) {
        m_log.Clear();
        TakeCopies();
        EXPECT_EQ(ERR_SYSTEM, HandleCopy(path));
        EXPECT_TRUE(m_log.Has("[ERR] " + line)) << line;
        EXPECT_EQ(0, TakeCopies()) << line;
    }
};

TEST_F(IncBackupFailureTest, ATimeThatCannotBeTold) {
    WriteSrc("/a.jpg", "bytes", 1000);
    const NoLocalTime none;
    for (const bool date_dir : {true, false}) {
        SetNaming(false, date_dir, !date_dir);
        ExpectFailure("/a.jpg", "Failed to GetRenamedDstEventPath for task '7'");
        EXPECT_TRUE(m_log.Has("[ERR] Failed to get time string for '1000'"));
    }
}

TEST_F(IncBackupFailureTest, ARecordThatCannotBeDoubted) {
    WriteSrc("/a", "first", 1000);
    RunWell();
    WriteSrc("/a", "second", 2000);
    Sql("CREATE TRIGGER no BEFORE INSERT ON unproven_table BEGIN SELECT RAISE(FAIL, 'no'); END;");
    ExpectFailure("/a", "Failed to get file info by src_ev_path = '/a'");
    EXPECT_EQ("first", ReadWholeFile(Dst("/a")));
}

TEST_F(IncBackupFailureTest, NamesThatCannotBeAskedFor) {
    WriteSrc("/a", "bytes");
    Sql("DROP TABLE moved_table;");
    ExpectFailure("/a", "Failed to get mapped dst event path, dst_ev_path = '/a'");
    EXPECT_TRUE(m_log.Has("[ERR] File DB is NULL [task: 7]"));
}

TEST_F(IncBackupFailureTest, NumbersThatCannotBeAskedFor) {
    SetNaming(false, false, false);
    WriteSrc("/d/a.txt", "bytes");
    EXPECT_EQ(0, m_task.file_db->SetFileInfoBySourcePath({"/b", "/a.txt", FILE_INFO_FILE, 1, 1}));
    // The name itself is found among the records; a look at the moved files fails.
    Sql("DROP TABLE moved_table;"
        "CREATE VIEW moved_table AS SELECT abs(-9223372036854775807 - length(key) / length(key))"
        " AS destination_path, key AS source_path, 1 AS size, 1 AS mtime FROM config_table;");
    ExpectFailure("/d/a.txt", "Failed to get file info by mapped_dst_ev_path = '/a.txt'");
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get mapped dst event path, dst_ev_path = '/a.txt'"));
}

// While the copy of a large file takes its time nobody else shall wait for the database.
TEST_F(IncBackupFailureTest, BeforeALargeFileTheRecordsOfTheOthersAreWritten) {
    constexpr uintmax_t LARGE = 16 << 20;
    const auto records = [this] {
        return RawDatabase(FileDBPath()).Read("SELECT COUNT(*) FROM file_info_table");
    };
    WriteSrc("/a", "s");
    EXPECT_EQ(0, HandleCopy("/a"));
    std::string seen;
    m_fake.OnCall("KELDFileCopy_r", [&] { seen = records(); });
    for (const auto& [size, wanted] : {std::pair(LARGE - 1, "0"), std::pair(LARGE, "2")}) {
        const std::string path = "/" + std::to_string(size);
        WriteSrc(path, "");
        fs::resize_file(Src(path), size);
        EXPECT_EQ(0, HandleCopy(path));
        EXPECT_EQ(wanted, seen) << size;
    }
}

}  // namespace
