// Whole runs of an incremental task: what is copied again, what is not, and what becomes of a
// destination that was changed by hand.
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "db/task-info.h"
#include "inc-backup-fixture.h"
#include "platform/unproven-run.h"
#include "utils/error-code.h"

namespace fs = std::filesystem;

namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;
using testing::SizeIs;

class IncBackupRunTest : public IncBackupFixture {
protected:
    // A copied file /a with its record, and the source changed since: the next run copies it.
    void ChangeSourceAfterRun() {
        WriteSrc("/a", "first", 1000);
        RunWell();
        WriteSrc("/a", "second", 2000);
    }
    // The files of the destination by name that are no plain "/a".
    std::vector<std::string> Aside() {
        std::vector<std::string> names = NamesOf(Dst());
        std::erase_if(names, [](const std::string& name) { return name.starts_with("/a="); });
        return names;
    }
    std::string ContentOfA() { return ReadWholeFile(Dst("/a")); }
    // An earlier run was ended by a power cut, and the clock counts for nothing in the test.
    void LeaveUnprovenRun() {
        m_dir.Write("volume1/@Ferrix/task/7/unproven-run", "1 9000000000 1\n");
    }
};

TEST_F(IncBackupRunTest, ASecondRunCopiesNothing) {
    WriteSrc("/a", "1");
    WriteSrc("/d/b", "2");
    WriteSrc("/d/e/c", "3");
    RunWell();
    EXPECT_EQ(3, TakeCopies());
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/a=1", "/d/", "/d/b=2", "/d/e/", "/d/e/c=3"));
    RunWell();
    EXPECT_EQ(0, TakeCopies());
    ReopenFileDB();
    RunWell();
    EXPECT_EQ(0, TakeCopies());
}

TEST_F(IncBackupRunTest, ItNeverRotates) {
    m_task.enable_rotation = true;
    m_task.max_version_count = 1;
    m_task.rotation_policy = ROTATION_POLICY_OLDEST;
    for (const char* name : {"/Ferrix Copy_2020-01-01_000000/a", "/Ferrix Copy_2021-01-01_000000/a",
                             "/Ferrix Copy_2022-01-01_000000.Bad/a"}) {
        WriteSrc(name, name);
    }
    const std::vector<std::string> names = NamesOf(Src());
    RunWell();
    RunWell();
    EXPECT_EQ(names, NamesOf(Dst()));
}

TEST_F(IncBackupRunTest, WhatIsMovedOrRemovedAtTheDestinationIsStillDone) {
    WriteSrc("/a", "1");
    WriteSrc("/b", "2");
    RunWell();
    TakeCopies();
    fs::rename(Dst("/a"), Dst("/sorted"));
    fs::remove(Dst("/b"));
    RunWell();
    EXPECT_EQ(0, TakeCopies());
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/sorted=1"));
}

TEST_F(IncBackupRunTest, AChangedFileIsCopiedOverTheOldOne) {
    ChangeSourceAfterRun();
    RunWell();
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/a=second@2000"));
    EXPECT_THAT(m_fake.Recycled(), IsEmpty());
}

TEST_F(IncBackupRunTest, AnOlderTimeCountsAsAChange) {
    WriteSrc("/a", "first", 2000);
    RunWell();
    WriteSrc("/a", "older", 1000);
    RunWell();
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/a=older@1000"));
}

TEST_F(IncBackupRunTest, AFileThatIsDeletedOnTheSourceIsForgottenAndKept) {
    WriteSrc("/a", "1");
    WriteSrc("/d/b", "2");
    WriteSrc("/d/e/c", "3");
    RunWell();
    const auto before = TreeOf(Dst());
    fs::remove_all(Src("/d"));
    fs::remove(Src("/a"));
    RunWell();
    EXPECT_EQ(before, TreeOf(Dst()));
    for (const char* path : {"/a", "/d", "/d/b", "/d/e", "/d/e/c"}) EXPECT_EQ("-", Recorded(path));
    TakeCopies();
    WriteSrc("/a", "again", 3000);
    RunWell();
    EXPECT_EQ(1, TakeCopies()) << "and copied as new when it comes back";
}

TEST_F(IncBackupRunTest, ADeletedFolderIsOneRemoval) {
    WriteSrc("/d/b", "2");
    WriteSrc("/d/e/c", "3");
    RunWell();
    fs::remove_all(Src("/d"));
    m_log.Clear();
    RunWell();
    EXPECT_EQ(1, m_log.Count("[INFO] IncBackupRemoveHandler: remove db record '/d', [task: 7]"));
    int removals = 0;
    for (const std::string& line : m_log.Lines()) {
        removals += line.find("remove db record") != std::string::npos ? 1 : 0;
    }
    EXPECT_EQ(1, removals);
}

TEST_F(IncBackupRunTest, AFileThatBecomesAFolderAndBack) {
    WriteSrc("/a", "file");
    RunWell();
    fs::remove(Src("/a"));
    WriteSrc("/a/b", "below");
    RunTask();
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/a/", "/a/b=below"));
    EXPECT_EQ("/a/b", Recorded("/a/b"));
    fs::remove_all(Src("/a"));
    WriteSrc("/a", "file again", 3000);
    RunTask();
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/a=file again"));
    EXPECT_EQ("-", Recorded("/a/b"));
    EXPECT_EQ("/a", Recorded("/a"));
}

TEST_F(IncBackupRunTest, SortedPhotosComeOnceAndOnlyOnce) {
    SetNaming(false, true, true);
    constexpr time_t MAY_6 = 1683356889;
    WriteSrc("/DCIM/100/IMG_1.JPG", "one", MAY_6);
    WriteSrc("/DCIM/101/IMG_1.JPG", "two", MAY_6);
    WriteSrc("/DCIM/notes.txt", "text", MAY_6);
    RunWell();
    const auto tree = NamesOf(Dst());
    EXPECT_THAT(tree, SizeIs(4));
    EXPECT_THAT(tree, Contains("/2023-05-06/notes.txt=text"));
    RunWell();
    EXPECT_EQ(tree, NamesOf(Dst()));
    EXPECT_EQ(3, TakeCopies());
}

TEST_F(IncBackupRunTest, WhatTheTaskFilterRefusesIsNotCopied) {
    SetTaskFilterNames({"secret"});
    WriteSrc("/secret", "1");
    WriteSrc("/plain", "2");
    RunTask();
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/plain=2"));
    EXPECT_EQ("-", Recorded("/secret"));
}

TEST_F(IncBackupRunTest, OneBadFileIsCopiedByTheNextRun) {
    for (const char* name : {"/a", "/b", "/c"}) WriteSrc(name, "s");
    m_fake.FailCall("KELDFileCopy_r", KELDERR_NO_PERMISSION);
    EXPECT_EQ(ERR_NO_PERMISSION, RunTask());
    TakeCopies();
    RunWell();
    EXPECT_EQ(1, TakeCopies());
    EXPECT_EQ(TreeOf(Src()), TreeOf(Dst()));
}

TEST_F(IncBackupRunTest, AnExportGoesToTheDevice) {
    MakeExport();
    WriteSrc("/d/a", "1");
    RunWell();
    EXPECT_EQ(TreeOf(Src()), TreeOf(Dst()));
    RunWell();
    EXPECT_EQ(1, TakeCopies());
}

// --- A destination that was changed by hand ---

TEST_F(IncBackupRunTest, OverwriteReplacesAnEditedCopy) {
    ChangeSourceAfterRun();
    WriteDst("/a", "edited by hand", 1500);
    RunWell();
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/a=second@2000"));
}

TEST_F(IncBackupRunTest, RenameMovesAnEditedCopyAside) {
    SetRenamePolicy();
    ChangeSourceAfterRun();
    WriteDst("/a", "edited by hand", 1500);
    RunTask();
    EXPECT_EQ("second", ContentOfA());
    EXPECT_THAT(Aside(), ElementsAre(MatchesRegex("/a_Ferrix_.*_Conflict=edited by hand")));
    EXPECT_EQ("/a", Recorded("/a"));
}

TEST_F(IncBackupRunTest, RenameReplacesAnUntouchedCopy) {
    SetRenamePolicy();
    ChangeSourceAfterRun();
    RunWell();
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/a=second@2000"));
}

TEST_F(IncBackupRunTest, ARemovedCopyIsMadeAgainWhenTheSourceChanges) {
    for (const int policy : {CONFLICT_POLICY_OVERWRITE, CONFLICT_POLICY_RENAME}) {
        m_task.conflict_policy = policy;
        fs::remove(Src("/a"));
        RunWell();
        fs::remove(Dst("/a"));
        ChangeSourceAfterRun();
        fs::remove(Dst("/a"));
        RunWell();
        EXPECT_THAT(TreeOf(Dst()), ElementsAre("/a=second@2000")) << policy;
    }
}

TEST_F(IncBackupRunTest, OverwriteReplacesAFolderInTheWayThroughTheRecycleBin) {
    m_fake.AddShare({.name = "photos", .path = m_share, .recycle_bin = true});
    ChangeSourceAfterRun();
    fs::remove(Dst("/a"));
    WriteDst("/a/precious", "inside");
    RunTask();
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/a=second@2000"));
    EXPECT_THAT(m_fake.Recycled(), SizeIs(1));
}

TEST_F(IncBackupRunTest, RenameMovesAFolderInTheWayAside) {
    SetRenamePolicy();
    ChangeSourceAfterRun();
    fs::remove(Dst("/a"));
    WriteDst("/a/precious", "inside");
    RunTask();
    EXPECT_EQ("second", ContentOfA());
    EXPECT_THAT(Aside(), ElementsAre(MatchesRegex("/a_Ferrix_.*_TypeConflict/"),
                                     MatchesRegex("/a_Ferrix_.*_TypeConflict/precious=inside")));
}

TEST_F(IncBackupRunTest, ALinkInTheWayIsNeverFollowed) {
    m_dir.Write("outside", "not ours");
    for (const int policy : {CONFLICT_POLICY_OVERWRITE, CONFLICT_POLICY_RENAME}) {
        m_task.conflict_policy = policy;
        fs::remove(Src("/a"));
        RunWell();
        fs::remove(Dst("/a"));
        ChangeSourceAfterRun();
        fs::remove(Dst("/a"));
        fs::create_symlink(m_dir / "outside", Dst("/a"));
        RunTask();
        EXPECT_TRUE(fs::is_regular_file(fs::symlink_status(Dst("/a")))) << policy;
        EXPECT_EQ("second", ContentOfA());
        EXPECT_EQ("not ours", ReadWholeFile(m_dir / "outside"));
    }
}

// --- Files at the destination that no record knows ---

TEST_F(IncBackupRunTest, RenameMovesAnUnknownFileAside) {
    SetRenamePolicy();
    WriteSrc("/a", "from the card", 1000);
    WriteDst("/a", "somebody's", 500);
    RunTask();
    EXPECT_EQ("from the card", ContentOfA());
    EXPECT_THAT(Aside(), ElementsAre(MatchesRegex("/a_Ferrix_.*_Conflict=somebody's")));
}

TEST_F(IncBackupRunTest, RenameMergesAnUnknownFileThatIsEqual) {
    SetRenamePolicy();
    WriteSrc("/a", "bytes", 1000);
    WriteDst("/a", "bytes", 1000);
    RunWell();
    EXPECT_THAT(Aside(), IsEmpty());
    EXPECT_EQ("/a", Recorded("/a"));
}

TEST_F(IncBackupRunTest, OverwriteReplacesAnUnknownFile) {
    WriteSrc("/a", "from the card", 1000);
    WriteDst("/a", "somebody's", 500);
    RunWell();
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/a=from the card"));
}

TEST_F(IncBackupRunTest, ACopyThatAPowerCutLeftIsNotTakenForAGoodOne) {
    SetRenamePolicy();
    const char* const left[] = {"right length", "", "righ"};
    for (const char* content : left) {
        LeaveUnprovenRun();
        WriteSrc("/a", "right bytes!", 1000);
        WriteDst("/a", content, 1000);
        RunWell();
        EXPECT_EQ("right bytes!", ContentOfA()) << content;
        EXPECT_THAT(Aside(), IsEmpty()) << content;
        EXPECT_EQ(0, m_task.file_db->RemoveFileInfoBySourcePath("/"));
    }
}

TEST_F(IncBackupRunTest, ANewVersionThatAPowerCutLeftIsNotTakenForAGoodOne) {
    SetRenamePolicy();
    ChangeSourceAfterRun();
    LeaveUnprovenRun();
    WriteDst("/a", "secoXX", 2000);  // the row of the first version is still there
    RunWell();
    EXPECT_EQ("second", ContentOfA());
    EXPECT_THAT(Aside(), IsEmpty());
}

TEST_F(IncBackupRunTest, SomebodysFileIsNoLeftoverOfAPowerCut) {
    SetRenamePolicy();
    LeaveUnprovenRun();
    WriteSrc("/a", "right bytes!", 1000);
    WriteDst("/a", "somebody's", 999);
    RunTask();
    EXPECT_EQ("right bytes!", ContentOfA());
    EXPECT_THAT(Aside(), ElementsAre(MatchesRegex("/a_Ferrix_.*_Conflict=somebody's")));
}

TEST_F(IncBackupRunTest, AnEmptyFileOfSomebodyIsMovedAsideWithoutAPowerCut) {
    SetRenamePolicy();
    WriteSrc("/a", "bytes", 1000);
    WriteDst("/a", "", 999);
    RunTask();
    EXPECT_EQ("bytes", ContentOfA());
    EXPECT_THAT(Aside(), SizeIs(1));
}

// --- A device that is pulled ---

TEST_F(IncBackupRunTest, WheneverTheCardIsPulledTheNextRunCompletes) {
    for (const char* name : {"/a", "/d/b", "/d/c", "/e/f/g"}) WriteSrc(name, name, 1000);
    RunWell();
    const auto undisturbed = TreeOf(Dst());
    for (const int policy : {CONFLICT_POLICY_OVERWRITE, CONFLICT_POLICY_RENAME}) {
        m_task.conflict_policy = policy;
        for (int copies = 1; copies <= 4; ++copies) {
            fs::remove_all(Dst());
            fs::create_directory(Dst());
            EXPECT_EQ(0, m_task.file_db->RemoveFileInfoBySourcePath("/"));
            int left = copies;
            m_fake.OnCall("KELDFileCopy_r", [&] {
                if (--left == 0) m_fake.Pull(m_usb);
            });
            RunTask();
            m_fake.OnCall("KELDFileCopy_r", [] {});
            m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdb1"});
            ReopenFileDB();
            RunTask();
            EXPECT_EQ(undisturbed, TreeOf(Dst())) << "copy " << copies << ", policy " << policy;
        }
    }
}

}  // namespace
