// What counts as a new repository, and that nothing is replaced in one that is not.
#include <system_error>

#include "db/task-db.h"
#include "updater/rename-faults.h"
#include "updater/updater-fixture.h"

namespace fs = std::filesystem;

namespace {

class NewInstallPlaceTest : public UpdaterTest {
protected:
    NewInstallPlaceTest() {
        SetCapabilities("ferrix=\"yes\"\n");
        SetSettings("ferrixfolder=\"photos\"\n");
    }
    // Neither a new install nor a version that could be read.
    void ExpectUnknown() {
        EXPECT_EQ(-1, Run());
        EXPECT_TRUE(
            m_log.Has("[ERR] UpdaterCore: Failed to get task db version '" + m_task_db + "'"));
        EXPECT_FALSE(m_log.Has("[WARN] UpdaterCore: new install"));
        EXPECT_EQ("ferrixfolder=\"photos\"\n", Settings());
        std::error_code unreachable;
        EXPECT_FALSE(fs::exists(m_task_db + ".new", unreachable));
    }
    // A repository in use, with one task.
    void MakeInUse(const std::string& path) const {
        TaskDB db;
        ASSERT_EQ(0, db.Init(path));
        uint64_t id = 0;
        ASSERT_EQ(0, db.AddUSBInfo({0, "uuid", false, false, "", ""}, id));
        TaskInfo task;
        task.usb_id = id;
        task.task_name = "In use";
        ASSERT_EQ(0, db.AddTaskInfo(task, id));
    }
};

TEST_F(NewInstallPlaceTest, APathThatLeadsInACircleIsNoNewInstall) {
    fs::create_symlink("task-db.sqlite", m_task_db);
    ExpectUnknown();
    EXPECT_TRUE(fs::is_symlink(m_task_db));
}

TEST_F(NewInstallPlaceTest, AFolderOfDatabasesThatCannotBeEnteredIsNoNewInstall) {
    fs::remove(InRepository("db"));
    fs::create_symlink("db", InRepository("db"));
    ExpectUnknown();
    fs::remove(InRepository("db"));
    m_dir.Write("v1/@Ferrix/db", "a file");
    m_log.Clear();
    ExpectUnknown();
    EXPECT_EQ("a file", ReadWholeFile(InRepository("db")));
}

TEST_F(NewInstallPlaceTest, ADatabaseThatIsElsewhereForAWhileIsNotReplaced) {
    m_dir.MakeDir("away");
    MakeInUse(m_dir / "away/task-db.sqlite");
    fs::create_symlink(m_dir / "elsewhere/task-db.sqlite", m_task_db);
    ExpectUnknown();
    fs::rename(m_dir / "away", m_dir / "elsewhere");
    EXPECT_EQ(0, Run());
    EXPECT_EQ("In use", Read("SELECT task_name FROM task_info_table;"));
}

TEST_F(NewInstallPlaceTest, ADatabaseThatTurnsUpMeanwhileIsKept) {
    m_fake.OnCall("KLIBCFileGetKeyValue", [this] { MakeInUse(m_task_db); });
    EXPECT_EQ(-1, Run());
    m_fake.OnCall("KLIBCFileGetKeyValue", {});
    EXPECT_TRUE(m_log.Has("[ERR] Failed to put '" + m_task_db + "' in its place"));
    EXPECT_EQ("In use", Read("SELECT task_name FROM task_info_table;"));
    EXPECT_EQ("ferrixfolder=\"photos\"\n", Settings());
    EXPECT_FALSE(fs::exists(m_task_db + ".new"));
    EXPECT_EQ(0, Run());
    EXPECT_EQ("In use", Read("SELECT task_name FROM task_info_table;"));
}

// Its rows may lie there alone.
TEST_F(NewInstallPlaceTest, TheLogOfADatabaseThatTurnsUpMeanwhileIsKept) {
    m_fake.OnCall("KLIBCFileGetKeyValue", [this] {
        m_dir.Write("v1/@Ferrix/db/task-db.sqlite", "database");
        m_dir.Write("v1/@Ferrix/db/task-db.sqlite-wal", "rows");
    });
    EXPECT_EQ(-1, Run());
    EXPECT_EQ("database", ReadWholeFile(m_task_db));
    EXPECT_EQ("rows", ReadWholeFile(m_task_db + "-wal"));
}

TEST_F(NewInstallPlaceTest, ADatabaseWithoutTablesIsReplacedWithItsLog) {
    {
        RawDatabase open(m_task_db);
        open.Run("PRAGMA journal_mode = WAL; CREATE TABLE t (a); DROP TABLE t;");
        for (const char* part : {"", "-wal"}) {
            fs::copy_file(m_task_db + part, (m_dir / "kept") + part);
        }
    }
    for (const char* part : {"", "-wal"}) {
        fs::copy_file((m_dir / "kept") + part, m_task_db + part,
                      fs::copy_options::overwrite_existing);
    }
    ASSERT_EQ(0, Run());
    EXPECT_EQ("photos", Read("SELECT hub_share_name FROM task_info_table;"));
    EXPECT_EQ("", Settings());
}

TEST_F(NewInstallPlaceTest, AJournalThatCannotBeRemovedKeepsTheDatabaseOut) {
    m_dir.MakeDir("v1/@Ferrix/db/task-db.sqlite-journal");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to put '" + m_task_db + "' in its place"));
    EXPECT_FALSE(fs::exists(m_task_db));
    EXPECT_EQ("ferrixfolder=\"photos\"\n", Settings());
}

// Its tasks may be missing.
TEST_F(NewInstallPlaceTest, WhatAnEarlierAttemptHasLeftIsNotGoneOnWith) {
    {
        TaskDB left;
        uint64_t id = 0;
        ASSERT_EQ(0, left.Init(m_task_db + ".new"));
        ASSERT_EQ(0, left.AddUSBInfo({0, "FERRIX_DEFAULT_USB_UUID", false, true, "", ""}, id));
    }
    {
        const FailUnlink keep(".sqlite.new");
        EXPECT_EQ(-1, Run());
    }
    EXPECT_TRUE(m_log.Has("[ERR] Failed to init task db at '" + m_task_db + ".new'"));
    EXPECT_FALSE(fs::exists(m_task_db));
    EXPECT_EQ(0, Run());
    EXPECT_EQ("photos", Read("SELECT hub_share_name FROM task_info_table;"));
}

TEST_F(NewInstallPlaceTest, WhatAnEarlierAttemptHasLeftIsNotPutInPlace) {
    m_dir.MakeDir("v1/@Ferrix/db/task-db.sqlite.new/in-the-way");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to init task db at '" + m_task_db + ".new'"));
    SetCapabilities("");
    m_log.Clear();
    EXPECT_EQ(0, Run());
    EXPECT_FALSE(m_log.Contains("in its place"));
    EXPECT_FALSE(fs::exists(m_task_db));
}

}  // namespace
