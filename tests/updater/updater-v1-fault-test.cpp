// The way from version 1 when something comes between: other programs, broken-off writes, renames
// and flushes that fail.
#include <cerrno>
#include <memory>
#include <thread>

#include "updater/rename-faults.h"
#include "updater/updater-fixture.h"

namespace fs = std::filesystem;

namespace {

class UpdaterV1FaultTest : public UpdaterTest {
protected:
    UpdaterV1FaultTest() { MakeOldRepository(m_repository); }

    std::string Version(const std::string& path) const {
        return RawDatabase(path).Read("SELECT value FROM config_table WHERE key = 'version';");
    }
    bool HasMoveFailure(const std::string& path) const {
        return m_log.Has("[ERR] UpdaterV1: Failed to move DB back '" + path + ".bkp_v1' -> '" +
                         path + "'.");
    }
    int AddOwnEntry() const {
        FakeSchedEntry left;
        left.app = "KELD.KDS.Ferrix.Application";
        return m_fake.AddSchedEntry(left);
    }

    std::string m_file_db = InRepository("task/4/file-db.sqlite");
};

TEST_F(UpdaterV1FaultTest, AFileDatabaseThatCannotBePutBackStaysAsItWas) {
    const std::string before = DumpDatabase(m_file_db);
    {
        const FailRename refuse("/task/4/file-db.sqlite", EIO);
        EXPECT_EQ(-1, Run());
    }
    EXPECT_TRUE(HasMoveFailure(m_file_db));
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to update file db for task '4'"));
    EXPECT_EQ(before, DumpDatabase(m_file_db));
    EXPECT_EQ("1", Version(m_task_db));
    EXPECT_EQ("2", Version(InRepository("task/2/file-db.sqlite")));
    EXPECT_EQ(std::vector<std::string>{}, Leftovers());
    EXPECT_TRUE(m_fake.SchedEntries().empty());
    EXPECT_EQ(0, Run());
    EXPECT_EQ("2", Version(m_file_db));
    EXPECT_EQ("2", Version(m_task_db));
}

TEST_F(UpdaterV1FaultTest, ATaskDatabaseThatCannotBePutBackStaysAsItWas) {
    const std::string before = DumpDatabase(m_task_db);
    {
        const FailRename refuse("/task-db.sqlite", EIO);
        EXPECT_EQ(-1, Run());
    }
    EXPECT_TRUE(HasMoveFailure(m_task_db));
    EXPECT_TRUE(m_log.Has("[ERR] UpdaterV1: Failed to update task db '" + m_task_db + "'"));
    EXPECT_EQ(before, DumpDatabase(m_task_db));
    EXPECT_EQ(std::vector<std::string>{}, Leftovers());
    EXPECT_TRUE(m_fake.SchedEntries().empty());
    EXPECT_EQ(0, Run());
    EXPECT_EQ("2", Version(m_task_db));
    EXPECT_EQ(3U, m_fake.SchedEntries().size());
}

// The new database names them.
TEST_F(UpdaterV1FaultTest, TimetablesStayWhenTheNewDatabaseIsInPlaceAndMayNotLast) {
    {
        const FailFlushAfterRename power_cut("/task-db.sqlite");
        EXPECT_EQ(-1, Run());
    }
    EXPECT_TRUE(HasMoveFailure(m_task_db));
    EXPECT_EQ("2", Version(m_task_db));
    EXPECT_EQ("1|2|3", Read("SELECT schedule_id FROM task_info_table;"));
    EXPECT_EQ(3U, m_fake.SchedEntries().size());
    EXPECT_EQ(0, Run());
    EXPECT_EQ(3U, m_fake.SchedEntries().size());
}

TEST_F(UpdaterV1FaultTest, AJournalThatTurnsUpMeanwhileKeepsTheNewDatabaseOut) {
    m_fake.OnCall("KELDSchedTaskSave",
                  [this] { m_dir.Write("v1/@Ferrix/db/task-db.sqlite-journal", "x"); });
    EXPECT_EQ(-1, Run());
    m_fake.OnCall("KELDSchedTaskSave", {});
    EXPECT_TRUE(HasMoveFailure(m_task_db));
    EXPECT_TRUE(m_fake.SchedEntries().empty());
    fs::remove(m_task_db + "-journal");
    EXPECT_EQ("1", Version(m_task_db));
}

TEST_F(UpdaterV1FaultTest, AProgramThatHasADatabaseOpenForAMomentIsWaitedFor) {
    for (const std::string& path : {m_task_db, m_file_db}) {
        fs::remove_all(m_repository);
        MakeOldRepository(m_repository);
        auto other = std::make_unique<RawDatabase>(path);
        ASSERT_EQ("1", other->Read("SELECT value FROM config_table WHERE key = 'version';"));
        std::thread program([&] {
            LetOtherThreadMeetTheLock();
            other.reset();
        });
        EXPECT_EQ(0, Run()) << path;
        program.join();
        EXPECT_EQ("2", Version(path));
        EXPECT_EQ("2", Version(m_task_db));
        EXPECT_EQ(std::vector<std::string>{}, Leftovers());
    }
}

// As a program that was killed in the middle of a change leaves it.
TEST_F(UpdaterV1FaultTest, ABrokenOffChangeOfTheTaskDatabaseIsRolledBackFirst) {
    {
        RawDatabase open(m_task_db);
        open.Run(
            "PRAGMA journal_mode = DELETE; PRAGMA cache_size = 2; BEGIN;"
            "UPDATE config_table SET value = 2 WHERE key = 'version';"
            "UPDATE task_info_table SET task_name = 'Half done';"
            "CREATE TABLE big (a); WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 "
            "FROM n WHERE i < 100) INSERT INTO big SELECT randomblob(500) FROM n;");
        for (const char* part : {"", "-journal"}) {
            fs::copy_file(m_task_db + part, (m_dir / "hot") + part);
        }
        open.Run("ROLLBACK;");
    }
    fs::rename(m_dir / "hot", m_task_db);
    fs::rename(m_dir / "hot-journal", m_task_db + "-journal");
    ASSERT_EQ(0, Run());
    EXPECT_TRUE(m_log.Has("[INFO] UpdaterV1: task_db_version (1) "));
    EXPECT_EQ("Mirror|It's 100%|Photos", Read("SELECT task_name FROM task_info_table;"));
    EXPECT_EQ("0", Read("SELECT COUNT(*) FROM sqlite_master WHERE name = 'big';"));
    EXPECT_EQ("2", Version(m_task_db));
    EXPECT_EQ("2", Version(m_file_db));
    EXPECT_EQ(std::vector<std::string>{}, Leftovers());
    EXPECT_EQ(3U, m_fake.SchedEntries().size());
}

TEST_F(UpdaterV1FaultTest, ALeftTimetableThatCannotBeRemovedDoesNotStopTheLift) {
    const int left = AddOwnEntry();
    m_fake.FailCall("KELDSchedTaskRemove");
    EXPECT_EQ(0, Run());
    EXPECT_TRUE(m_log.Has("[ERR] KELDSchedTaskRemove() failed, id[" + std::to_string(left) + "]"));
    EXPECT_EQ(0, m_fake.SchedEntries().at(left).state) << "it never runs";
    EXPECT_EQ(4U, m_fake.SchedEntries().size());
    EXPECT_EQ("2|3|4", Read("SELECT schedule_id FROM task_info_table;"));
}

TEST_F(UpdaterV1FaultTest, TimetablesThatCannotBeListedDoNotStopTheLift) {
    AddOwnEntry();
    m_fake.FailCall("KELDSchedTaskListGet");
    EXPECT_EQ(0, Run());
    EXPECT_TRUE(m_log.Has("[ERR] KELDSchedTaskListGet() failed"));
    EXPECT_EQ("2", Version(m_task_db));
    EXPECT_EQ("2|3|4", Read("SELECT schedule_id FROM task_info_table;"));
}

// It came from a default task of that release, which lives on.
TEST_F(UpdaterV1FaultTest, AnOldKeyThatWasLeftGoesWithTheLift) {
    SetSettings("ferrixfolder=\"photos/in\"\nsdferrixfolder=\"cards\"\n");
    RawDatabase(m_task_db).Run(
        "UPDATE usb_info_table SET uuid = 'FERRIX_DEFAULT_USB_UUID' WHERE id = 1;");
    EXPECT_EQ(0, Run());
    EXPECT_EQ("sdferrixfolder=\"cards\"\n", Settings());
}

}  // namespace
