#include "updater/updater-v1.h"

#include "db/sqlite-util.h"
#include "db/task-info.h"
#include "updater/database-file.h"
#include "updater/updater-utils.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr unsigned OLD_VERSION = 1;

// The indexes of the old names cover the same columns.
constexpr char CHANGE_FILE_DB[] =
    "DROP INDEX IF EXISTS file_info_table_src_path_idx;"
    "DROP INDEX IF EXISTS file_info_table_dst_path_idx;"
    "CREATE INDEX IF NOT EXISTS file_info_src_path_idx on file_info_table(source_path);"
    "CREATE INDEX IF NOT EXISTS file_info_dst_path_idx on file_info_table(destination_path);"
    "INSERT or REPLACE into config_table VALUES ('version', 2);";

int AddId(const SqlQuery& row, void* context) {
    static_cast<std::vector<uint64_t>*>(context)->push_back(row.UInt64(0));
    return 0;
}

}  // namespace

int UpdaterV1::Run() {
    const std::string path = m_repository + "/db/" + "task-db.sqlite";
    if (!FSExists(path)) {
        SLOG_ERR("UpdaterV1: task db '%s' does not exist\n", path.c_str());
        return -1;
    }
    unsigned version = 0;
    if (GetDBVersion(path, version) != 1) {
        SLOG_ERR("UpdaterV1: Failed to get task db version '%s'\n", path.c_str());
        return -1;
    }
    SLOG_INFO("UpdaterV1: task_db_version (%u) \n", version);
    if (version != OLD_VERSION) return 0;
    if (UpdateFileDBs() < 0) {
        SLOG_ERR("UpdaterV1: Failed to update file db\n");
        return -1;
    }
    if (UpdateTaskDB(path) < 0) {
        SLOG_ERR("UpdaterV1: Failed to update task db '%s'\n", path.c_str());
        return -1;
    }
    return 0;
}

int UpdaterV1::UpdateFileDBs() {
    std::vector<uint64_t> task_ids;
    if (QueryEach(m_repository + "/db/" + "task-db.sqlite",
                  "SELECT id FROM task_info_table WHERE copy_strategy = " +
                      std::to_string(COPY_STRATEGY_INCREMENTAL) + "; ",
                  AddId, &task_ids) < 0) {
        SLOG_ERR("UpdaterV1: Failed to list incbkp task info\n");
        return -1;
    }
    for (const uint64_t task_id : task_ids) {
        if (UpdateFileDB(task_id) < 0) return -1;
    }
    return 0;
}

int UpdaterV1::UpdateFileDB(uint64_t task_id) {
    const std::string path = m_repository + "/task/" + std::to_string(task_id) + "/file-db.sqlite";
    if (!FSExists(path)) {
        SLOG_ERR("UpdaterV1: file db '%s' does not exist\n", path.c_str());
        return -1;
    }
    unsigned version = 0;
    if (GetDBVersion(path, version) != 1) {
        SLOG_ERR("UpdaterV1: Failed to get file db version '%s'\n", path.c_str());
        return -1;
    }
    if (version != OLD_VERSION) return 0;
    if (ChangeFileDB(path) < 0) {
        SLOG_ERR("UpdaterV1: Failed to update file db for task '%llu'\n", Llu(task_id));
        return -1;
    }
    return 0;
}

int UpdaterV1::ChangeFileDB(const std::string& path) {
    DatabaseCopy copy(path, OLD_VERSION);
    if (copy.Make() < 0) {
        SLOG_ERR("UpdaterV1: Failed to backup file db '%s' -> '%s'\n", path.c_str(),
                 copy.Path().c_str());
        return -1;
    }
    if (ExecInTransaction(copy.Path(), CHANGE_FILE_DB) < 0) {
        SLOG_ERR("UpdaterV1: Failed to update file db '%s'\n", copy.Path().c_str());
        return -1;
    }
    if (copy.ReplaceOriginal() < 0) {
        SLOG_ERR("UpdaterV1: Failed to move DB back '%s' -> '%s'.\n", copy.Path().c_str(),
                 path.c_str());
        return -1;
    }
    return 0;
}
