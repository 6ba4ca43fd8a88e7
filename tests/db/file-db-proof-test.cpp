// Rows are unproven until a flush, and an opened database knows none that is.
#include "db/file-db-fixture.h"

namespace {

TEST_F(FileDBTest, OpeningForgetsWhatIsUnproven) {
    Set("/a", "/a");
    Reopen();
    EXPECT_EQ("", BySource("/a"));
}

TEST_F(FileDBTest, WhatIsProvenStays) {
    Set("/a", "/a");
    EXPECT_EQ(1U, m_db.UnprovenCount());
    ProveAll();
    EXPECT_EQ(0U, m_db.UnprovenCount());
    Reopen();
    EXPECT_NE("", BySource("/a"));
}

TEST_F(FileDBTest, AFolderThatWasMadeIsProvenLikeAFile) {
    SetDir("/a");
    Reopen();
    EXPECT_EQ("", BySource("/a"));
    SetDir("/a");
    EXPECT_EQ(0U, m_db.UnprovenCount()) << "no reason to flush";
    ProveAll();
    Reopen();
    EXPECT_NE("", BySource("/a"));
}

TEST_F(FileDBTest, AFolderThatWasNotMadeNeedsNoProof) {
    EXPECT_EQ(0, m_db.SetFileInfoBySourcePath({"/a", "", FILE_INFO_DIR, 0, 0}));
    Reopen();
    EXPECT_NE("", BySource("/a"));
}

TEST_F(FileDBTest, ARowDoesNotInheritTheDoubtOfOneThatHadItsId) {
    Set("/a", "/a");
    EXPECT_EQ(0, m_db.DoubtFileInfo("/a"));
    EXPECT_EQ(0, m_db.RemoveFileInfoBySourcePath("/a"));
    EXPECT_EQ(0, m_db.SetFileInfoBySourcePath({"/b", "", FILE_INFO_DIR, 0, 0}));
    Reopen();
    EXPECT_NE("", BySource("/b"));
}

TEST_F(FileDBTest, AChangedRowIsUnprovenAgain) {
    Set("/a", "/a", 1);
    ProveAll();
    Set("/a", "/a", 2);
    Reopen();
    EXPECT_EQ("", BySource("/a"));
}

TEST_F(FileDBTest, WhatIsWrittenDuringAFlushStaysUnproven) {
    Set("/before", "/before");
    Set("/again", "/again");
    int64_t mark = 0;
    EXPECT_EQ(0, m_db.GetUnprovenMark(mark));
    Set("/during", "/during");
    Set("/again", "/again", 2);
    EXPECT_EQ(0, m_db.ProveFileInfo(mark));
    EXPECT_EQ(2U, m_db.UnprovenCount());
    Reopen();
    EXPECT_EQ("/before", Sources());
}

TEST_F(FileDBTest, ARowThatIsRemovedAndWrittenAgainDuringAFlushStaysUnproven) {
    Set("/a", "/a");
    int64_t mark = 0;
    EXPECT_EQ(0, m_db.GetUnprovenMark(mark));
    EXPECT_EQ(0, m_db.RemoveFileInfoBySourcePath("/a"));
    Set("/b", "/b");  // takes over the id of the row that went
    EXPECT_EQ(0, m_db.ProveFileInfo(mark));
    Reopen();
    EXPECT_EQ("", Sources());
}

TEST_F(FileDBTest, AMarkOfAnEarlierFlushProvesNothingLater) {
    Set("/a", "/a");
    int64_t mark = 0;
    EXPECT_EQ(0, m_db.GetUnprovenMark(mark));
    EXPECT_EQ(0, m_db.ProveFileInfo(mark));
    Set("/b", "/b");
    EXPECT_EQ(0, m_db.ProveFileInfo(mark));
    Reopen();
    EXPECT_EQ("/a", Sources());
}

TEST_F(FileDBTest, WithoutAnythingUnprovenTheMarkIsZero) {
    int64_t mark = 5;
    EXPECT_EQ(0, m_db.GetUnprovenMark(mark));
    EXPECT_EQ(0, mark);
}

TEST_F(FileDBTest, AFailedFlushForgetsAllThatIsUnproven) {
    Set("/a", "/a");
    ProveAll();
    Set("/b", "/b");
    EXPECT_EQ(0, m_db.ForgetUnproven());
    EXPECT_EQ("/a", Sources());
    EXPECT_EQ(0U, m_db.UnprovenCount());
}

TEST_F(FileDBTest, ADoubtedRowIsUnproven) {
    Set("/a", "/a");
    Set("/b", "/b");
    ProveAll();
    EXPECT_EQ(0, m_db.DoubtFileInfo("/a"));
    EXPECT_EQ(0, m_db.DoubtFileInfo("/a"));
    EXPECT_EQ(0, m_db.DoubtFileInfo("/unknown"));
    Reopen();
    EXPECT_EQ("/b", Sources());
}

TEST_F(FileDBTest, ADoubtDuringAFlushOutlivesIt) {
    Set("/a", "/a");
    int64_t mark = 0;
    EXPECT_EQ(0, m_db.GetUnprovenMark(mark));
    EXPECT_EQ(0, m_db.DoubtFileInfo("/a"));
    EXPECT_EQ(0, m_db.ProveFileInfo(mark));
    Reopen();
    EXPECT_EQ("", Sources());
}

TEST_F(FileDBTest, ADoubtOutlivesEveryFlush) {
    Set("/a", "/a");
    ProveAll();
    EXPECT_EQ(0, m_db.DoubtFileInfo("/a"));
    Set("/b", "/b");
    ProveAll();
    ProveAll();
    Reopen();
    EXPECT_EQ("/b", Sources());
}

TEST_F(FileDBTest, ADoubtEndsWithTheProofOfTheRowThatIsWrittenAnew) {
    Set("/a", "/a", 1);
    EXPECT_EQ(0, m_db.DoubtFileInfo("/a"));
    Set("/a", "/a", 2);
    ProveAll();
    Reopen();
    EXPECT_EQ("/a /a 0 2 1000", BySource("/a"));
}

TEST_F(FileDBTest, ADoubtAloneIsNothingToFlush) {
    Set("/a", "/a");
    ProveAll();
    EXPECT_EQ(0, m_db.DoubtFileInfo("/a"));
    int64_t mark = 5;
    EXPECT_EQ(0, m_db.GetUnprovenMark(mark));
    EXPECT_EQ(0, mark);
    Set("/b", "/b");
    ProveAll();
    EXPECT_EQ(0U, m_db.UnprovenCount());
}

TEST_F(FileDBTest, ARowOfAnotherProgramIsUnprovenToo) {
    RawDatabase(m_path).Run("INSERT INTO file_info_table VALUES (77, '/a', '/a', 0, 1, 1);");
    Reopen();
    EXPECT_EQ("", Sources());
}

TEST_F(FileDBTest, TheNoteAndTheRowAreOneTransaction) {
    Set("/a", "/a");
    EXPECT_EQ("1", Raw("SELECT COUNT(*) FROM unproven_table JOIN file_info_table USING (id)"));
    // Without the note there is no row either.
    RawDatabase(m_path).Run(
        "CREATE TRIGGER no BEFORE INSERT ON unproven_table BEGIN SELECT RAISE(FAIL, 'no'); END;");
    EXPECT_EQ(-1, m_db.SetFileInfoBySourcePath({"/b", "/b", FILE_INFO_FILE, 1, 1}));
    EXPECT_EQ("/a", Sources());
}

// --- Rows in one transaction

class FileDBBatchTest : public FileDBTest {
protected:
    void SetInBatch(const std::string& path) {
        EXPECT_EQ(0, m_db.SetFileInfoInBatch({path, path, FILE_INFO_FILE, 1, 1}));
    }
    std::string CountOfOther() { return Raw("SELECT COUNT(*) FROM file_info_table"); }
};

TEST_F(FileDBBatchTest, RowsOfABatchAreSeenAtOnceHereAndLaterElsewhere) {
    SetInBatch("/a");
    EXPECT_NE("", BySource("/a"));
    EXPECT_EQ("0", CountOfOther());
    EXPECT_EQ(0, m_db.EndBatch());
    EXPECT_EQ("1", CountOfOther());
    EXPECT_EQ(0, m_db.EndBatch()) << "nothing is left to end";
}

TEST_F(FileDBBatchTest, ABatchEndsAfterSomeRows) {
    for (int n = 0; n < 100; ++n) SetInBatch("/" + std::to_string(n));
    EXPECT_EQ("100", CountOfOther());
    EXPECT_EQ(100U, m_db.UnprovenCount());
}

TEST_F(FileDBBatchTest, EveryOtherWriteAndAProofEndTheBatch) {
    int rows = 0;
    const auto expect_end = [&](const char* what) {
        EXPECT_EQ(std::to_string(rows), CountOfOther()) << what;
    };
    SetInBatch("/" + std::to_string(++rows));
    Set("/" + std::to_string(++rows), "/x");
    expect_end("a row of its own");
    SetInBatch("/" + std::to_string(++rows));
    EXPECT_EQ(0, m_db.DoubtFileInfo("/1"));
    expect_end("a doubt");
    SetInBatch("/" + std::to_string(++rows));
    EXPECT_EQ(0, m_db.AddMovedFile({"/s", "/d", FILE_INFO_FILE, 1, 1}));
    expect_end("a moved file");
    SetInBatch("/" + std::to_string(++rows));
    ProveAll();
    expect_end("a proof");
    SetInBatch("/" + std::to_string(++rows));
    m_db.Close();
    expect_end("the end");
}

TEST_F(FileDBBatchTest, ARemovalInABatchCounts) {
    SetInBatch("/a");
    EXPECT_EQ(0, m_db.RemoveFileInfoBySourcePath("/a"));
    EXPECT_EQ(0, m_db.EndBatch());
    EXPECT_EQ("0", CountOfOther());
}

TEST_F(FileDBBatchTest, AFailureLosesTheBatchAndTheNextOneWorks) {
    Set("/old", "/old");
    RawDatabase(m_path).Run(
        "CREATE TRIGGER no BEFORE INSERT ON file_info_table WHEN NEW.source_path = '/bad' BEGIN "
        "SELECT RAISE(FAIL, 'no'); END;");
    SetInBatch("/a");
    EXPECT_EQ(-1, m_db.SetFileInfoInBatch({"/bad", "/bad", FILE_INFO_FILE, 1, 1}));
    EXPECT_EQ("", BySource("/a"));
    SetInBatch("/b");
    EXPECT_EQ(0, m_db.EndBatch());
    EXPECT_EQ("/b|/old", Sources());
}

TEST_F(FileDBBatchTest, ATransactionThatTheDatabaseEndedIsBegunAnew) {
    RawDatabase(m_path).Run(
        "CREATE TRIGGER no BEFORE DELETE ON file_info_table BEGIN SELECT RAISE(ROLLBACK, 'full'); "
        "END;");
    SetInBatch("/a");
    EXPECT_EQ(-1, m_db.RemoveFileInfoBySourcePath("/a"));
    SetInBatch("/b");
    EXPECT_TRUE(m_db.TakeRowLoss()) << "/a is told";
    EXPECT_EQ("0", CountOfOther()) << "within a batch again";
    EXPECT_EQ(0, m_db.EndBatch());
    EXPECT_EQ("/b", Sources());
}

TEST_F(FileDBTest, TheWaitOfTheFirstFileIsCounted) {
    EXPECT_EQ(0, m_db.UnprovenSeconds());
    Set("/a", "/a");
    EXPECT_LE(0, m_db.UnprovenSeconds());
}

}  // namespace
