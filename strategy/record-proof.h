// Makes the rows of an incremental task's file database true: a row may stay only once the copy
// that it speaks of is on the disk (db/file-db.h).
//
// Tasks without a file database have nothing to prove: then nothing happens here.
#pragma once

#include <cstdint>

struct TaskRunInfo;

// Around a flush of the destination: made before it, settled after it.
class RecordProof {
public:
    explicit RecordProof(const TaskRunInfo& task);

    // The rows that were there before the flush are proven, or all that are not yet proven go. 0,
    // or "System error" when rows were lost since the last time or could not be settled: their
    // files are made again, which a good run does not leave behind.
    [[nodiscard]] int Settle(bool is_on_disk);

private:
    const TaskRunInfo& m_task;
    int64_t m_mark = 0;
    int m_result = 0;
};

// Flushes the destination once some hundred files or a while have gone by since the last time. 0,
// or the result of Settle(). A flush that fails is no failure of the event in hand: done again, it
// would find its copy there and take it for good. TakeFlushFailure() tells the run.
[[nodiscard]] int FlushRecordsIfDue(const TaskRunInfo& task);

// Whether a flush has failed since the last call. A later good one says nothing about the copies
// that it covered.
[[nodiscard]] bool TakeFlushFailure(const TaskRunInfo& task);

// Every file of the source has been seen to, and what was copied is on the disk.
void EndRecords(const TaskRunInfo& task);
