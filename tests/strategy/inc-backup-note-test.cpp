// What is noted of a moved file before its source goes, and how long its name stays taken.
#include <algorithm>
#include <filesystem>

#include "db/file-db.h"
#include "db/raw-database.h"
#include "flush-faults.h"
#include "inc-backup-fixture.h"
#include "utils/error-code.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;

class IncBackupNoteTest : public IncBackupFixture {
protected:
    IncBackupNoteTest() { m_task.remove_src_file = true; }

    void Sql(const std::string& sql) { RawDatabase(FileDBPath()).Run(sql); }
    // The files of the destination that have not the plain name "/a".
    std::vector<std::string> Aside() {
        std::vector<std::string> names = NamesOf(Dst());
        std::erase_if(names, [](const std::string& name) { return name.starts_with("/a="); });
        return names;
    }
    // An earlier run was ended by a power cut, and the clock counts for nothing in the test.
    void LeaveUnprovenRun() {
        m_dir.Write("volume1/@Ferrix/task/7/unproven-run", "1 9000000000 1\n");
    }
    void RefuseRemovalOfSources(bool is_refused) {
        m_fake.AddShare({.name = "usb", .path = m_usb, .recycle_bin = true});
        m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdb1", .recycle_bin = true});
        m_fake.FailCall("KELDRecycleUnlinkFileWithSharePath", KELDERR_NO_PERMISSION,
                        is_refused ? FakeKeld::ALWAYS : 0);
    }
};

// --- The note is there before the source goes

TEST_F(IncBackupNoteTest, TheNoteIsOnTheDiskBeforeTheSourceGoes) {
    SetNaming(false, false, true);
    WriteSrc("/1.JPG", "one", 1683356889);
    std::vector<std::string> flushed;
    {
        const OnFlush faults([&](const std::string& what) {
            if (IsThere(Src("/1.JPG"))) flushed.push_back(what);
            return 0;
        });
        EXPECT_EQ(0, HandleCopy("/1.JPG"));
    }
    EXPECT_FALSE(IsThere(Src("/1.JPG")));
    const auto copy = std::find(flushed.begin(), flushed.end(), Dst("/2023-05-06_070809.JPG"));
    const auto note = std::find(flushed.begin(), flushed.end(), FileDBPath() + "-wal");
    EXPECT_LT(copy, note);
    EXPECT_NE(flushed.end(), note);
    EXPECT_EQ(1, m_task.file_db->IsDestinationTaken("/2023-05-06_070809.JPG"));
}

TEST_F(IncBackupNoteTest, ANoteThatDoesNotReachTheDiskLeavesTheSource) {
    SetNaming(false, false, true);
    WriteSrc("/1.JPG", "one", 1683356889);
    {
        const OnFlush faults(
            [this](const std::string& what) { return what == FileDBPath() + "-wal" ? EIO : 0; });
        EXPECT_EQ(ERR_SYSTEM, HandleCopy("/1.JPG"));
    }
    EXPECT_TRUE(m_log.Has("[ERR] Failed to note the name of moved file '/1.JPG'"));
    EXPECT_TRUE(IsThere(Src("/1.JPG")));
}

TEST_F(IncBackupNoteTest, ANoteThatCannotBeWrittenLeavesTheSource) {
    SetNaming(false, false, true);
    WriteSrc("/1.JPG", "one", 1683356889);
    Sql("CREATE TRIGGER no BEFORE INSERT ON moved_table BEGIN SELECT RAISE(FAIL, 'no'); END;");
    EXPECT_EQ(ERR_SYSTEM, HandleCopy("/1.JPG"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to note the name of moved file '/1.JPG'"));
    EXPECT_EQ("one", ReadWholeFile(Src("/1.JPG")));
}

TEST_F(IncBackupNoteTest, WhereSourcesStayNothingWaitsForTheDatabase) {
    m_task.remove_src_file = false;
    for (int n = 0; n < 20; ++n) WriteSrc("/" + std::to_string(n), "s");
    int flushes = 0;
    const OnFlush faults([&](const std::string& what) {
        flushes += what.find("file-db") != std::string::npos ? 1 : 0;
        return 0;
    });
    RunWell();
    EXPECT_EQ(0, flushes);
}

// --- A file that had a record

TEST_F(IncBackupNoteTest, AMovedFileLosesTheRecordOfAnEarlierRun) {
    for (const bool keep_dir_structure : {true, false}) {
        SetNaming(keep_dir_structure, false, false);
        m_task.remove_src_file = false;
        WriteSrc("/a", "first", 1000);
        WriteSrc("/b", "stays", 1000);
        RunWell();
        m_task.remove_src_file = true;
        WriteSrc("/a", "second", 2000);
        EXPECT_EQ(0, HandleCopy("/a"));
        EXPECT_FALSE(IsThere(Src("/a")));
        EXPECT_EQ("second", ReadWholeFile(Dst("/a")));
        EXPECT_EQ("-", Recorded("/a")) << keep_dir_structure;
        EXPECT_EQ("/b", Recorded("/b"));
    }
}

TEST_F(IncBackupNoteTest, ARecordThatCannotBeRemovedLeavesTheSource) {
    m_task.remove_src_file = false;
    WriteSrc("/a", "first", 1000);
    RunWell();
    m_task.remove_src_file = true;
    WriteSrc("/a", "second", 2000);
    Sql("CREATE TRIGGER no BEFORE DELETE ON file_info_table BEGIN SELECT RAISE(FAIL, 'no'); END;");
    EXPECT_EQ(ERR_SYSTEM, HandleCopy("/a"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to RemoveFileInfoBySourcePath from DB '/a'"));
    EXPECT_TRUE(IsThere(Src("/a")));
}

// The row of the old copy is doubted; the new copy fails behind it, and the run goes on well.
TEST_F(IncBackupNoteTest, ARecordWhoseCopyWasLostIsNotProvenByTheNextFlush) {
    m_task.remove_src_file = false;
    WriteSrc("/a", "first", 1000);
    RunWell();
    WriteSrc("/a", "second", 2000);
    m_fake.FailCall("KELDFileCopy_r", KELDERR_NO_PERMISSION);
    m_fake.OnCall("KELDFileCopy_r", [this] { fs::remove(Dst("/a")); });
    EXPECT_EQ(ERR_NO_PERMISSION, RunTask());
    m_fake.OnCall("KELDFileCopy_r", [] {});
    ReopenFileDB();
    EXPECT_EQ("-", Recorded("/a"));
    WriteSrc("/a", "first", 1000);  // as the record tells it
    RunWell();
    EXPECT_EQ("first", ReadWholeFile(Dst("/a")));
}

// --- How long a name stays taken

TEST_F(IncBackupNoteTest, ANotedNameIsUsedAgainAlsoWhenSourcesStayFromNowOn) {
    SetNaming(false, false, true);
    WriteSrc("/1.JPG", "one", 1683356889);
    RefuseRemovalOfSources(true);
    EXPECT_EQ(ERR_FILE_OPERATION, RunTask());
    RefuseRemovalOfSources(false);
    m_task.remove_src_file = false;
    RunWell();
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/2023-05-06_070809.JPG=one"));
    EXPECT_EQ("/2023-05-06_070809.JPG", Recorded("/1.JPG"));
}

TEST_F(IncBackupNoteTest, NotedNamesThatCannotBeReadFailTheCopy) {
    SetNaming(false, false, true);
    WriteSrc("/1.JPG", "one", 1683356889);
    EXPECT_EQ(0, m_task.file_db->AddMovedFile({"/s", "/d", FILE_INFO_FILE, 1, 1}));
    Sql("ALTER TABLE moved_table RENAME COLUMN mtime TO time;");
    EXPECT_EQ(ERR_SYSTEM, HandleCopy("/1.JPG"));
    EXPECT_TRUE(m_log.Has(
        "[ERR] Failed to get mapped dst event path, dst_ev_path = '/2023-05-06_070809.JPG'"));
    EXPECT_THAT(NamesOf(Dst()), IsEmpty());
}

TEST_F(IncBackupNoteTest, NamesStayTakenAsLongAsTheRecordOfTheRun) {
    SetNaming(false, false, true);
    WriteSrc("/1.JPG", "one", 1683356889);
    m_dir.MakeDir("volume1/@Ferrix/task/7/unproven-run/full");  // cannot be removed
    RunTask();
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/2023-05-06_070809.JPG=one"));
    EXPECT_EQ(1, m_task.file_db->IsDestinationTaken("/2023-05-06_070809.JPG"));
    fs::remove_all(m_dir / "volume1/@Ferrix/task/7/unproven-run");
    RunWell();
    EXPECT_EQ(0, m_task.file_db->IsDestinationTaken("/2023-05-06_070809.JPG"));
}

// --- After a power cut

// A good copy whose source is gone has the time of a picture of another card.
TEST_F(IncBackupNoteTest, AGoodCopyIsNoLeftoverWhereSourcesAreRemoved) {
    SetRenamePolicy();
    for (const char* other : {"first", "first!"}) {  // shorter, and as long
        LeaveUnprovenRun();
        WriteDst("/a", other, 1000);
        WriteSrc("/a", "second", 1000);
        RunTask();
        EXPECT_EQ("second", ReadWholeFile(Dst("/a")));
        EXPECT_THAT(Aside(),
                    ElementsAre(MatchesRegex("/a_Ferrix_.*_Conflict=" + std::string(other))));
        fs::remove_all(Dst());
        fs::create_directory(Dst());
    }
}

TEST_F(IncBackupNoteTest, AFileThatLostAllItsBytesIsOne) {
    SetRenamePolicy();
    LeaveUnprovenRun();
    WriteDst("/a", "", 1000);
    WriteSrc("/a", "second", 1000);
    RunWell();
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/a=second"));
}

}  // namespace
