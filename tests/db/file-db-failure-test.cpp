// Writes that fail: no row is believed that should have gone, and none goes unnoticed.
#include "db/file-db-fixture.h"
#include "db/sqlite-faults.h"

namespace {

class FileDBFailureTest : public FileDBTest {
protected:
    using FileDBTest::List;

    void SetInBatch(const std::string& source, const std::string& destination = "/d") {
        EXPECT_EQ(0, m_db.SetFileInfoInBatch({source, destination, FILE_INFO_FILE, 1, 1}));
    }
    int List() {
        NamePool pool;
        FileList list(pool);
        return m_db.GetFileListBySourcePath("/", false, list);
    }
    int Mark() {
        int64_t mark = 0;
        return m_db.GetUnprovenMark(mark);
    }
    void RefuseRemovals() {
        RawDatabase(m_path).Run(
            "CREATE TRIGGER no BEFORE DELETE ON file_info_table BEGIN SELECT RAISE(FAIL, 'no'); "
            "END;");
    }
    void AllowRemovals() { RawDatabase(m_path).Run("DROP TRIGGER no;"); }
};

// --- A failed flush whose rows cannot be removed

TEST_F(FileDBFailureTest, RowsOfAFailedFlushAreNeverProvenLater) {
    Set("/a", "/a");
    RefuseRemovals();
    EXPECT_EQ(-1, m_db.ForgetUnproven());
    EXPECT_TRUE(m_db.TakeFlushFailure()) << "the run has to know all the same";
    AllowRemovals();
    ProveAll();
    EXPECT_EQ("", Sources());
}

TEST_F(FileDBFailureTest, AMarkOfBeforeDoesNotProveThemEither) {
    Set("/a", "/a");
    int64_t mark = 0;
    EXPECT_EQ(0, m_db.GetUnprovenMark(mark));
    RefuseRemovals();
    EXPECT_EQ(-1, m_db.ForgetUnproven());
    EXPECT_EQ(-1, m_db.ProveFileInfo(mark));
    AllowRemovals();
    EXPECT_EQ(0, m_db.ProveFileInfo(mark));
    EXPECT_EQ("", Sources());
}

TEST_F(FileDBFailureTest, UntilTheyAreGoneNothingIsProvenOrListed) {
    Set("/proven", "/proven");
    ProveAll();
    Set("/a", "/a");
    RefuseRemovals();
    EXPECT_EQ(-1, m_db.ForgetUnproven());
    EXPECT_EQ(-1, Mark());
    EXPECT_EQ(-1, List());
    EXPECT_EQ(0U, m_db.UnprovenCount()) << "not flushed again for each file";
    AllowRemovals();
    EXPECT_THAT(List("/"), testing::ElementsAre("/proven=1@1000"));
    EXPECT_EQ("/proven", Sources());
}

TEST_F(FileDBFailureTest, TheBatchInHandGoesWithThem) {
    SetInBatch("/a");
    EXPECT_EQ(0, m_db.ForgetUnproven());
    EXPECT_EQ("", Sources());
    SetInBatch("/b");
    EXPECT_EQ(0, m_db.EndBatch());
    EXPECT_EQ("/b", Sources());
}

// --- A batch that is lost

TEST_F(FileDBFailureTest, ABatchThatCannotBeEndedIsTold) {
    Set("/old", "/old");
    SetInBatch("/a");
    {
        const FailSqliteWrites full;
        EXPECT_EQ(-1, m_db.EndBatch());
    }
    EXPECT_EQ("/old", Sources());
    EXPECT_TRUE(m_db.TakeRowLoss());
    EXPECT_FALSE(m_db.TakeRowLoss());
    SetInBatch("/b");
    EXPECT_EQ(0, m_db.EndBatch());
    EXPECT_EQ("/b|/old", Sources());
    EXPECT_FALSE(m_db.TakeRowLoss());
}

TEST_F(FileDBFailureTest, ABatchThatIsLostBeforeAFlushIsToldAndTheOthersAreProven) {
    Set("/old", "/old");
    RawDatabase(m_path).Run(
        "CREATE TRIGGER no BEFORE DELETE ON file_info_table BEGIN SELECT RAISE(ROLLBACK, 'full'); "
        "END;");
    SetInBatch("/a");
    EXPECT_EQ(-1, m_db.RemoveFileInfoBySourcePath("/old")) << "the database ends the transaction";
    RawDatabase(m_path).Run("DROP TRIGGER no;");
    ProveAll();
    EXPECT_TRUE(m_db.TakeRowLoss());
    Reopen();
    EXPECT_EQ("/old", Sources());
}

TEST_F(FileDBFailureTest, AMarkThatCannotBeMadeIsTold) {
    Set("/old", "/old");
    SetInBatch("/a");
    {
        const FailSqliteWrites full;
        EXPECT_EQ(-1, Mark());
    }
    EXPECT_TRUE(m_db.TakeRowLoss());
    EXPECT_EQ("/old", Sources());
}

TEST_F(FileDBFailureTest, ABatchThatTheDatabaseEndedIsToldAtItsEnd) {
    Set("/old", "/old");
    RawDatabase(m_path).Run(
        "CREATE TRIGGER no BEFORE DELETE ON file_info_table BEGIN SELECT RAISE(ROLLBACK, 'full'); "
        "END;");
    SetInBatch("/a");
    EXPECT_EQ(-1, m_db.RemoveFileInfoBySourcePath("/old"));
    EXPECT_EQ(-1, m_db.EndBatch());
    EXPECT_TRUE(m_db.TakeRowLoss());
    EXPECT_EQ(0, m_db.EndBatch());
}

TEST_F(FileDBFailureTest, NumbersOfALostBatchAreGivenAgain) {
    SetInBatch("/s1", "/a (1).jpg");
    EXPECT_EQ(2U, FreeNumber("/a", "jpg"));
    {
        const FailSqliteWrites full;
        EXPECT_EQ(-1, m_db.EndBatch());
    }
    EXPECT_EQ(1U, FreeNumber("/a", "jpg"));
}

TEST_F(FileDBFailureTest, ANoteThatCannotBeWrittenLeavesTheRow) {
    Set("/a", "/a");
    const FailSqliteWrites full;
    EXPECT_EQ(-1, m_db.AddMovedFile({"/a", "/a", FILE_INFO_FILE, 1, 1}));
    EXPECT_EQ(-1, m_db.DoubtFileInfo("/a"));
    EXPECT_NE("", BySource("/a"));
}

}  // namespace
