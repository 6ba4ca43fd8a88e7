#include "strategy/inc-backup-create-handler.h"

#include "db/file-db.h"
#include "strategy/inc-backup-path.h"
#include "strategy/task-run-info.h"
#include "utils/error-code.h"
#include "utils/log.h"

int IncBackupCreateHandler::RunCreate() {
    if (!Task().keep_dir_structure) {
        SLOG_INFO("Do not keep source folder, commit db for current folder '%s'",
                  EventPath().c_str());
    } else if (const int result = CreateHandler::RunCreate(); result < 0) {
        return result;
    }
    if (const int result = UpdateDB(); result < 0) {
        SLOG_ERR("Failed to update db for path '%s' [ret = %d]", EventPath().c_str(), result);
        return result;
    }
    return ERR_SUCCESS;
}

int IncBackupCreateHandler::SetCreateFullPath() {
    if (!Task().keep_dir_structure && (Task().smart_create_date_dir || Task().rename_photo_video)) {
        SLOG_INFO("Do not keep source folder, ignore current folder '%s'", EventPath().c_str());
        return ERR_IGNORE;
    }
    // Without any of the options all files lie in the root.
    m_create_full_path =
        IncBackupGetDstFullPath(Task(), Task().keep_dir_structure ? EventPath() : "/");
    SLOG_INFO("IncBackupCreateHandler: SetCreateFullPath = %s", m_create_full_path.c_str());
    return ERR_SUCCESS;
}

int IncBackupCreateHandler::UpdateDB() {
    if (!Task().file_db) {
        SLOG_ERR("File DB is NULL [task: %llu]", Llu(Task().task_id));
        return ERR_SYSTEM;
    }
    FileInfo info;
    info.source_path = EventPath();
    info.destination_path = IncBackupGetDstEventPath(Task(), m_create_full_path);
    info.file_type = FILE_INFO_DIR;
    if (Task().file_db->SetFileInfoInBatch(info) == 0) return ERR_SUCCESS;
    SLOG_ERR("Failed to SetFileInfoBySourcePath from DB '%s'", EventPath().c_str());
    return ERR_SYSTEM;
}
