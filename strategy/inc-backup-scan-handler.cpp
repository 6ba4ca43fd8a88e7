#include "strategy/inc-backup-scan-handler.h"

#include "db/file-db.h"
#include "event/event-generator.h"
#include "strategy/task-run-info.h"
#include "utils/error-code.h"
#include "utils/file-list.h"
#include "utils/log.h"

int IncBackupScanHandler::GetDstList(FileList& list) {
    if (!Task().file_db) {
        SLOG_ERR("File DB is NULL [task: %llu]", Llu(Task().task_id));
        return ERR_SYSTEM;
    }
    if (Task().file_db->GetFileListBySourcePath(EventPath(), false, list) == 0) return ERR_SUCCESS;
    SLOG_ERR("Failed to GetFileListBySourcePath from DB '%s'", EventPath().c_str());
    return ERR_SYSTEM;
}

void IncBackupScanHandler::IssueRemove(const FileListEntry& entry) {
    SLOG_INFO("IssueRemove: %s, %d. Only delete DB record.", entry.path.c_str(), entry.is_dir);
    EventGenerator(Task().task_id).PushRemoveEvent(JoinEntryPath(entry.path), entry.is_dir);
}

void IncBackupScanHandler::IssueModify(const FileListEntry& src, const FileListEntry& dst) {
    if (src.is_dir != dst.is_dir) IssueRemove(dst);
    IssueCopy(src);
}
