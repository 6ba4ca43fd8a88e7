// Records that cannot be kept: nothing is believed that is not sure, and the run is no good one.
#include <memory>

#include "db/file-db.h"
#include "db/raw-database.h"
#include "db/sqlite-faults.h"
#include "record-proof-fixture.h"
#include "strategy/record-proof.h"
#include "utils/error-code.h"

namespace {

using testing::IsEmpty;

class RecordLossTest : public RecordProofTest {
protected:
    void Sql(const std::string& sql) { RawDatabase(FileDBPath()).Run(sql); }
    // From the nth copy of the run on the database cannot be written to.
    void FillDiskAtCopy(int nth) {
        m_fake.OnCall("KELDFileCopy_r", [this, nth] {
            if (m_fake.CallCount("KELDFileCopy_r") == nth) {
                m_full_disk = std::make_unique<FailSqliteWrites>();
            }
        });
    }
    void EmptyDisk() {
        m_fake.OnCall("KELDFileCopy_r", [] {});
        m_full_disk.reset();
        TakeCopies();
    }

    std::unique_ptr<FailSqliteWrites> m_full_disk;
};

// --- A flush that fails

// The file of the event after which the flush was due would be found in its place when the event
// ran again, and be taken for good.
TEST_F(RecordLossTest, TheFileInHandIsNotTriedAgainWhenItsFlushFails) {
    SetRenamePolicy();
    WriteFiles(1000);
    m_first_failure = m_last_failure = 1;
    EXPECT_EQ(ERR_IO, RunTask());
    EXPECT_THAT(m_failures, IsEmpty());
    EXPECT_EQ(0, Records(1000));
    EXPECT_EQ(1000, TakeCopies());
    for (const std::string& name : NamesOf(Dst())) {
        WriteDst(name.substr(0, name.find('=')), "?");  // no byte has reached the disk
    }
    RunWell();
    EXPECT_EQ(1000, TakeCopies());
    EXPECT_EQ(TreeOf(Src()), TreeOf(Dst()));
}

TEST_F(RecordLossTest, RecordsOfAFailedFlushThatCannotBeRemovedAreNotBelievedLater) {
    WriteFiles(5);
    m_first_failure = m_last_failure = 1;
    Sql("CREATE TRIGGER no BEFORE DELETE ON file_info_table BEGIN SELECT RAISE(FAIL, 'no'); END;");
    EXPECT_EQ(ERR_IO, RunTask());
    EXPECT_EQ(5, Records(5)) << "they are still there";
    TakeCopies();
    EXPECT_EQ(ERR_SYSTEM, RunTask()) << "while they stay nothing can be compared with them";
    Sql("DROP TRIGGER no;");
    RunWell();
    EXPECT_EQ(5, TakeCopies());
}

// --- Records that are lost

TEST_F(RecordLossTest, RecordsThatAreLostAtTheEndFailTheRun) {
    WriteFiles(10);
    FillDiskAtCopy(10);
    EXPECT_EQ(ERR_SYSTEM, RunTask());
    EXPECT_THAT(m_failures, IsEmpty());
    EXPECT_TRUE(m_log.Has("[WARN] Copies of task '7' will be made again"));
    EmptyDisk();
    EXPECT_EQ(0, Records(10));
    RunWell();
    EXPECT_EQ(10, TakeCopies());
    ReopenFileDB();
    EXPECT_EQ(10, Records(10));
}

TEST_F(RecordLossTest, RecordsThatAreLostInTheMiddleFailTheRun) {
    for (int n = 0; n < 999; ++n) {
        const std::string path = "/f" + std::to_string(n);
        EXPECT_EQ(0, m_task.file_db->SetFileInfoBySourcePath({path, path, FILE_INFO_FILE, 1, 1}));
    }
    EXPECT_EQ(0, m_task.file_db->SetFileInfoInBatch({"/f999", "/f999", FILE_INFO_FILE, 1, 1}));
    {
        const FailSqliteWrites full;
        EXPECT_EQ(ERR_SYSTEM, FlushRecordsIfDue(m_task));
    }
    EXPECT_EQ("-", Recorded("/f999"));
    EXPECT_FALSE(TakeFlushFailure(m_task));
}

TEST_F(RecordLossTest, ALossThatWasNoticedBeforeTheFlushIsToldToo) {
    WriteFiles(3);
    Sql("CREATE TRIGGER no BEFORE DELETE ON file_info_table BEGIN SELECT RAISE(ROLLBACK, 'full'); "
        "END;");
    m_fake.OnCall("KELDFileCopy_r", [this] {
        if (m_fake.CallCount("KELDFileCopy_r") != 3) return;
        // Within the transaction of the first two files.
        EXPECT_EQ(
            -1, m_task.file_db->RemoveFileInfoBySourcePath(Recorded("/f0") == "-" ? "/f1" : "/f0"));
    });
    EXPECT_EQ(ERR_SYSTEM, RunTask());
    EXPECT_EQ(1, Records(3));
    m_fake.OnCall("KELDFileCopy_r", [] {});
    Sql("DROP TRIGGER no;");
    TakeCopies();
    RunWell();
    EXPECT_EQ(2, TakeCopies()) << "the third is proven";
}

// --- A proof that cannot be written

TEST_F(RecordLossTest, RecordsThatCannotBeProvenFailTheRunAndAreProvenByTheNext) {
    WriteFiles(5);
    Sql("CREATE TRIGGER no BEFORE DELETE ON unproven_table BEGIN SELECT RAISE(FAIL, 'no'); END;");
    EXPECT_EQ(ERR_SYSTEM, RunTask());
    EXPECT_THAT(m_failures, IsEmpty());
    Sql("DROP TRIGGER no;");
    TakeCopies();
    RunWell();
    EXPECT_EQ(0, TakeCopies());
    ReopenFileDB();
    EXPECT_EQ(5, Records(5));
}

}  // namespace
