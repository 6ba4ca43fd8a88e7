#include "strategy/record-proof.h"

#include "db/file-db.h"
#include "strategy/destination-flush.h"
#include "strategy/root-check.h"
#include "strategy/task-run-info.h"
#include "utils/error-code.h"
#include "utils/log.h"

namespace {

// A flush waits for the disk, and the run with it: rare enough to be little beside the copying of
// small files. What a power cut costs is that the files since the last one are copied again.
constexpr uint64_t FLUSH_FILES = 1000;
constexpr int64_t FLUSH_SECONDS = 30;

// The outcome of a flush of the destination. One that is reported good says nothing when the
// destination is gone.
int Flush(const TaskRunInfo& task) {
    LogFlush();  // it may take long
    return FlushDestination(task) < 0 ? ERR_IO : CheckTaskDestination(task);
}

}  // namespace

RecordProof::RecordProof(const TaskRunInfo& task) : m_task(task) {
    if (!task.file_db) return;
    const bool is_marked = task.file_db->GetUnprovenMark(m_mark) == 0;
    if (!is_marked) m_mark = 0;  // then nothing is proven
    if (task.file_db->TakeRowLoss() || !is_marked) m_result = ERR_SYSTEM;
}

int RecordProof::Settle(bool is_on_disk) {
    if (!m_task.file_db) return ERR_SUCCESS;
    const int result = is_on_disk ? (m_mark == 0 ? 0 : m_task.file_db->ProveFileInfo(m_mark))
                                  : m_task.file_db->ForgetUnproven();
    if (result < 0) m_result = ERR_SYSTEM;
    // What could not be settled is forgotten when the database is opened again.
    if (m_result < 0) SLOG_WARN("Copies of task '%llu' will be made again", Llu(m_task.task_id));
    return m_result;
}

int FlushRecordsIfDue(const TaskRunInfo& task) {
    FileDB* const db = task.file_db.get();
    if (db == nullptr) return ERR_SUCCESS;
    if (db->UnprovenCount() < FLUSH_FILES && db->UnprovenSeconds() < FLUSH_SECONDS) {
        return ERR_SUCCESS;
    }
    RecordProof proof(task);
    const bool is_on_disk = Flush(task) == ERR_SUCCESS;
    const int settled = proof.Settle(is_on_disk);
    return is_on_disk ? settled : ERR_SUCCESS;
}

bool TakeFlushFailure(const TaskRunInfo& task) {
    return task.file_db && task.file_db->TakeFlushFailure();
}

void EndRecords(const TaskRunInfo& task) {
    if (task.file_db && task.file_db->ForgetMovedFiles() < 0) {
        SLOG_WARN("Names of moved files of task '%llu' stay taken", Llu(task.task_id));
    }
}
