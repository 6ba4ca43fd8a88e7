#include "updater/database-file.h"

#include <sys/stat.h>

#include <cerrno>
#include <memory>
#include <thread>

#include "updater/rename-faults.h"
#include "updater/updater-fixture.h"

namespace fs = std::filesystem;

namespace {

class DatabaseFileTest : public UpdaterTest {
protected:
    // A database whose last row lies in the write-ahead log alone, as a killed daemon leaves it.
    void MakeWithLog(const std::string& path) const {
        RawDatabase open(m_dir / "open.db");
        open.Run(
            "PRAGMA journal_mode = WAL; CREATE TABLE t (a); INSERT INTO t VALUES (1);"
            "PRAGMA wal_checkpoint(TRUNCATE); INSERT INTO t VALUES (2);");
        fs::copy_file(m_dir / "open.db", path);
        fs::copy_file(m_dir / "open.db-wal", path + "-wal");
    }
    // One whose transaction was broken off.
    void MakeWithJournal(const std::string& path) const {
        RawDatabase open(m_dir / "open.db");
        open.Run(
            "PRAGMA page_size = 1024; PRAGMA cache_size = 2; CREATE TABLE t (a);"
            "INSERT INTO t VALUES (1), (2); BEGIN; UPDATE t SET a = 3;"
            "CREATE TABLE big (a); WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 "
            "FROM n WHERE i < 100) INSERT INTO big SELECT randomblob(500) FROM n;");
        fs::copy_file(m_dir / "open.db", path);
        fs::copy_file(m_dir / "open.db-journal", path + "-journal");
        open.Run("ROLLBACK;");
    }
    static std::string Rows(const std::string& path) {
        return RawDatabase(path).Read("SELECT a FROM t ORDER BY a;");
    }

    std::string m_path = m_dir / "task.db";
};

TEST_F(DatabaseFileTest, AWriteAheadLogIsTakenIn) {
    MakeWithLog(m_path);
    EXPECT_EQ(0, MakeSingleFile(m_path));
    EXPECT_EQ(std::vector<std::string>{}, Leftovers());
    EXPECT_FALSE(fs::exists(m_path + "-wal"));
    EXPECT_FALSE(fs::exists(m_path + "-shm"));
    EXPECT_EQ("1|2", Rows(m_path));
}

TEST_F(DatabaseFileTest, AJournalIsRolledBack) {
    MakeWithJournal(m_path);
    EXPECT_EQ(0, MakeSingleFile(m_path));
    EXPECT_FALSE(fs::exists(m_path + "-journal"));
    EXPECT_EQ("1|2", Rows(m_path));
}

TEST_F(DatabaseFileTest, AFileThatIsNoDatabaseIsRefused) {
    m_dir.Write("task.db", std::string(4096, 'x'));
    EXPECT_EQ(-1, MakeSingleFile(m_path));
    EXPECT_EQ(-1, MakeSingleFile(m_dir / "none"));
    EXPECT_FALSE(fs::exists(m_dir / "none"));
}

// sqlite itself does not wait when a database leaves the WAL mode.
TEST_F(DatabaseFileTest, AProgramThatHasItOpenForAMomentIsWaitedFor) {
    auto other = std::make_unique<RawDatabase>(m_path);
    other->Run("PRAGMA journal_mode = WAL; CREATE TABLE t (a); INSERT INTO t VALUES (1);");
    std::thread program([&] {
        LetOtherThreadMeetTheLock();
        other.reset();
    });
    EXPECT_EQ(0, MakeSingleFile(m_path));
    program.join();
    EXPECT_EQ("1", Rows(m_path));
}

TEST_F(DatabaseFileTest, NothingIsPutBesideAJournal) {
    const std::string from = m_dir.Write("new.db", "new");
    m_dir.Write("task.db", "old");
    bool is_moved = true;
    for (const std::string& path : {m_path, from}) {
        for (const char* part : {"-wal", "-shm", "-journal"}) {
            const TempDir keeper;
            fs::copy_file(from, path + part);
            EXPECT_EQ(-1, PutInPlace(from, m_path, Place::TAKEN, is_moved)) << path << part;
            EXPECT_FALSE(is_moved);
            fs::remove(path + part);
        }
    }
    EXPECT_EQ("old", ReadWholeFile(m_path));
    EXPECT_EQ(0, PutInPlace(from, m_path, Place::TAKEN, is_moved));
    EXPECT_TRUE(is_moved);
    EXPECT_EQ("new", ReadWholeFile(m_path));
    EXPECT_FALSE(fs::exists(from));
}

TEST_F(DatabaseFileTest, NothingIsReplacedInAPlaceThatWasToBeFree) {
    const std::string from = m_dir.Write("new.db", "new");
    m_dir.Write("task.db", "old");
    bool is_moved = true;
    EXPECT_EQ(-1, PutInPlace(from, m_path, Place::FREE, is_moved));
    EXPECT_FALSE(is_moved);
    EXPECT_EQ("old", ReadWholeFile(m_path));
    fs::remove(m_path);
    EXPECT_EQ(0, PutInPlace(from, m_path, Place::FREE, is_moved));
    EXPECT_TRUE(is_moved);
    EXPECT_EQ("new", ReadWholeFile(m_path));
}

TEST_F(DatabaseFileTest, ASystemThatCannotKeepWhatIsThereIsAskedFirst) {
    for (const int error : {ENOSYS, EINVAL}) {
        const FailRename no_flags("task.db", error, FailRename::WITH_FLAGS);
        const std::string from = m_dir.Write("new.db", "new");
        m_dir.Write("task.db", "old");
        bool is_moved = true;
        EXPECT_EQ(-1, PutInPlace(from, m_path, Place::FREE, is_moved)) << error;
        EXPECT_EQ("old", ReadWholeFile(m_path));
        fs::remove(m_path);
        EXPECT_EQ(0, PutInPlace(from, m_path, Place::FREE, is_moved)) << error;
        EXPECT_TRUE(is_moved);
        EXPECT_EQ("new", ReadWholeFile(m_path));
    }
}

TEST_F(DatabaseFileTest, APlaceThatMayNotLastIsTold) {
    for (const Place place : {Place::FREE, Place::TAKEN}) {
        const FailFlushAfterRename power_cut("task.db");
        fs::remove(m_path);
        bool is_moved = false;
        EXPECT_EQ(-1, PutInPlace(m_dir.Write("new.db", "new"), m_path, place, is_moved));
        EXPECT_TRUE(is_moved);
        EXPECT_EQ("new", ReadWholeFile(m_path));
    }
}

TEST_F(DatabaseFileTest, ACopyHoldsWhatTheLogHeldAndGoesAtTheEnd) {
    MakeWithLog(m_path);
    chmod(m_path.c_str(), 0640);
    {
        DatabaseCopy copy(m_path, 1);
        ASSERT_EQ(0, copy.Make());
        EXPECT_EQ(m_path + ".bkp_v1", copy.Path());
        EXPECT_EQ("1|2", Rows(copy.Path()));
        struct stat info {};
        ASSERT_EQ(0, stat(copy.Path().c_str(), &info));
        EXPECT_EQ(0640U, info.st_mode & 07777);
        m_dir.Write("task.db.bkp_v1-journal", "left by sqlite");
    }
    EXPECT_FALSE(fs::exists(m_path + ".bkp_v1"));
    EXPECT_FALSE(fs::exists(m_path + ".bkp_v1-journal"));
    EXPECT_EQ("1|2", Rows(m_path));
}

TEST_F(DatabaseFileTest, ACopyThatWasLeftOverIsNotMixedWithTheNewOne) {
    MakeWithLog(m_path);
    fs::copy_file(m_path + "-wal", m_path + ".bkp_v1-wal");
    m_dir.Write("task.db.bkp_v1", std::string(100000, 'x'));
    DatabaseCopy copy(m_path, 1);
    ASSERT_EQ(0, copy.Make());
    EXPECT_FALSE(fs::exists(copy.Path() + "-wal"));
    EXPECT_EQ("1|2", Rows(copy.Path()));
}

TEST_F(DatabaseFileTest, ACopyTakesThePlaceOfTheOriginal) {
    MakeWithLog(m_path);
    {
        DatabaseCopy copy(m_path, 1);
        ASSERT_EQ(0, copy.Make());
        RawDatabase(copy.Path()).Run("PRAGMA journal_mode = WAL; INSERT INTO t VALUES (3);");
        EXPECT_EQ("1|2", Rows(m_path));
        EXPECT_FALSE(copy.HasReplacedOriginal());
        ASSERT_EQ(0, copy.ReplaceOriginal());
        EXPECT_TRUE(copy.HasReplacedOriginal());
    }
    EXPECT_EQ("1|2|3", Rows(m_path));
    EXPECT_FALSE(fs::exists(m_path + ".bkp_v1"));
}

}  // namespace
