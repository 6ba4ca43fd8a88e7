// When the destination of an incremental task is flushed, and what becomes of its records then.
#include "strategy/record-proof.h"

#include "db/file-db.h"
#include "event/event-manager.h"
#include "record-proof-fixture.h"
#include "time-faults.h"
#include "utils/error-code.h"

namespace {

TEST_F(RecordProofTest, AShortRunIsFlushedOnceAtItsEnd) {
    WriteFiles(20);
    RunWell();
    EXPECT_EQ(1, m_flushes);
    ReopenFileDB();
    EXPECT_EQ(20, Records(20));
}

TEST_F(RecordProofTest, ALongRunIsFlushedEverySomeHundredFiles) {
    WriteFiles(2100);
    RunWell();
    EXPECT_EQ(3, m_flushes);
    ReopenFileDB();
    EXPECT_EQ(2100, Records(2100));
}

TEST_F(RecordProofTest, ASlowRunIsFlushedEveryHalfMinute) {
    for (const auto& [seconds, flushes] : {std::pair(20, 1), std::pair(30, 2)}) {
        MonotonicShift clock;
        WriteSrc("/f1", "s", 1000 + seconds);
        WriteSrc("/f2", "s", 1000 + seconds);
        WriteSrc("/f3", "s", 1000 + seconds);
        TakeCopies();
        m_flushes = 0;
        m_fake.OnCall("KELDFileCopy_r", [&, wait = seconds] {
            if (m_fake.CallCount("KELDFileCopy_r") == 2) clock.Advance(wait);
        });
        RunWell();
        EXPECT_EQ(flushes, m_flushes) << seconds;
        m_fake.OnCall("KELDFileCopy_r", [] {});
    }
}

TEST_F(RecordProofTest, ACrashLosesOnlyWhatWasNotFlushed) {
    WriteFiles(1200);
    m_fake.OnCall("KELDFileCopy_r", [this] {
        if (m_fake.CallCount("KELDFileCopy_r") < 1101) return;  // no transaction is open
        m_fake.OnCall("KELDFileCopy_r", [] {});
        FileDB crashed;  // forgets what the crash would take away
        EXPECT_EQ(0, crashed.Init(FileDBPath()));
        EXPECT_EQ(1000, Records(1200));
    });
    RunTask();
    TakeCopies();
    RunWell();
    EXPECT_LT(0, TakeCopies());
    ReopenFileDB();
    EXPECT_EQ(1200, Records(1200));
}

TEST_F(RecordProofTest, AFailedFlushInTheMiddleFailsTheRunAndForgetsWhatItCovered) {
    WriteFiles(1100);
    m_first_failure = m_last_failure = 1;
    EXPECT_EQ(ERR_IO, RunTask());
    EXPECT_GT(1100, Records(1100));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to flush file system of '" + Dst() + "' for task '7'"));
    TakeCopies();
    // The flushes are good again, but what the failed one covered is not believed to be there.
    RunWell();
    EXPECT_LE(999, TakeCopies());
    ReopenFileDB();
    EXPECT_EQ(1100, Records(1100));
}

TEST_F(RecordProofTest, UnderRenameACopyWhoseFlushFailedIsMadeAgainAndNotMerged) {
    SetRenamePolicy();
    WriteFiles(3);
    m_first_failure = m_last_failure = 1;
    EXPECT_EQ(ERR_IO, RunTask());
    EXPECT_EQ(0, Records(3));
    WriteDst("/f1", "?");  // equal size and time, but never on the disk
    TakeCopies();
    RunWell();
    EXPECT_EQ(3, TakeCopies());
    EXPECT_EQ(TreeOf(Src()), TreeOf(Dst()));
}

TEST_F(RecordProofTest, ARunThatIsBrokenOffKeepsTheRecordsOfWhatItFlushed) {
    WriteFiles(10);
    m_fake.OnCall("KELDFileCopy_r", [this] {
        if (m_fake.CallCount("KELDFileCopy_r") == 5) m_abort = 1;
    });
    EXPECT_EQ(ERR_INTERRUPTED, RunTask());
    m_abort = 0;
    EventManager::GetInstance().RemoveTask(TASK_ID);
    ReopenFileDB();
    EXPECT_EQ(4, Records(10));
    RunWell();
    EXPECT_EQ(10, Records(10));
}

TEST_F(RecordProofTest, ADestinationDeviceThatIsPulledLosesItsRecords) {
    MakeExport();
    WriteFiles(10);
    m_fake.OnCall("KELDFileCopy_r", [this] {
        if (m_fake.CallCount("KELDFileCopy_r") == 10) m_fake.Pull(m_usb);
    });
    EXPECT_EQ(ERR_DST_ROOT_MISS, RunTask());
    EXPECT_EQ(0, Records(10));
}

TEST_F(RecordProofTest, ADestinationShareThatGoesWithTheDeviceLosesItsRecords) {
    WriteFiles(10);
    m_fake.OnCall("KELDFileCopy_r", [this] {
        if (m_fake.CallCount("KELDFileCopy_r") < 10) return;
        m_fake.Pull(m_usb);
        m_fake.LockShare("photos");
    });
    EXPECT_EQ(ERR_SRC_ROOT_MISS, RunTask());
    EXPECT_EQ(0, Records(10));
}

TEST_F(RecordProofTest, AFlushIsNotBelievedWhenTheShareHasGoneWithTheDevice) {
    for (int n = 0; n < 1000; ++n) {
        const std::string path = "/f" + std::to_string(n);
        EXPECT_EQ(0, m_task.file_db->SetFileInfoBySourcePath({path, path, FILE_INFO_FILE, 1, 1}));
    }
    m_fake.Pull(m_usb);
    m_fake.LockShare("photos");
    EXPECT_EQ(0, FlushRecordsIfDue(m_task));
    EXPECT_TRUE(TakeFlushFailure(m_task)) << "the run fails, and not the file";
    EXPECT_EQ(0, Records(1000));
}

TEST_F(RecordProofTest, OnlyWhatWasWrittenBeforeTheFlushIsProven) {
    EXPECT_EQ(0, m_task.file_db->SetFileInfoBySourcePath({"/f0", "/f0", FILE_INFO_FILE, 1, 1}));
    RecordProof proof(m_task);
    EXPECT_EQ(0, m_task.file_db->SetFileInfoBySourcePath({"/f1", "/f1", FILE_INFO_FILE, 1, 1}));
    EXPECT_EQ(0, proof.Settle(true));
    ReopenFileDB();
    EXPECT_EQ("/f0", Recorded("/f0"));
    EXPECT_EQ("-", Recorded("/f1"));
}

TEST_F(RecordProofTest, AFlushFailureIsTakenOnce) {
    EXPECT_EQ(0, RecordProof(m_task).Settle(false));
    EXPECT_TRUE(TakeFlushFailure(m_task));
    EXPECT_FALSE(TakeFlushFailure(m_task));
}

TEST_F(RecordProofTest, ATaskWithoutAFileDatabaseHasNothingToProve) {
    m_task.file_db.reset();
    EXPECT_EQ(0, RecordProof(m_task).Settle(true));
    EXPECT_EQ(0, RecordProof(m_task).Settle(false));
    EXPECT_EQ(0, FlushRecordsIfDue(m_task));
    EXPECT_FALSE(TakeFlushFailure(m_task));
    EndRecords(m_task);
    EXPECT_EQ(0, m_flushes);
}

TEST_F(RecordProofTest, WhatCannotBeSettledIsTold) {
    m_task.file_db->Close();
    EXPECT_EQ(ERR_SYSTEM, RecordProof(m_task).Settle(false));
    EXPECT_TRUE(m_log.Has("[WARN] Copies of task '7' will be made again"));
    EndRecords(m_task);
    EXPECT_TRUE(m_log.Has("[WARN] Names of moved files of task '7' stay taken"));
}

}  // namespace
