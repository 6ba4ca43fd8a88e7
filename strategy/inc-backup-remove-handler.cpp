#include "strategy/inc-backup-remove-handler.h"

#include "db/file-db.h"
#include "strategy/task-run-info.h"
#include "utils/error-code.h"
#include "utils/log.h"

int IncBackupRemoveHandler::Remove() {
    const std::string& path = EventPath();
    SLOG_INFO("IncBackupRemoveHandler: remove db record '%s', [task: %llu]", path.c_str(),
              Llu(Task().task_id));
    if (!Task().file_db) {
        SLOG_ERR("File DB is NULL [task: %llu]", Llu(Task().task_id));
        return ERR_SYSTEM;
    }
    if (Task().file_db->RemoveFileInfoBySourcePath(path) == 0) return ERR_SUCCESS;
    SLOG_ERR("Failed to RemoveFileInfoBySourcePath from DB '%s'", path.c_str());
    return ERR_SYSTEM;
}
