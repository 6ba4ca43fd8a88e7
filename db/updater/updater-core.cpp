#include "updater/updater-core.h"

#include <utility>

#include "db/sqlite-util.h"
#include "updater/updater-utils.h"
#include "updater/updater-v1.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

int AddCount(const SqlQuery& row, void* context) {
    *static_cast<int64_t*>(context) += row.Int64(0);
    return 0;
}

// A daemon that was killed at its very first start leaves a database without any table.
bool IsNewInstall(const std::string& task_db) {
    if (!FSExists(task_db)) return true;
    int64_t tables = 0;
    return QueryEach(task_db, "SELECT COUNT(*) FROM sqlite_master;", AddCount, &tables) == 0 &&
           tables == 0;
}

}  // namespace

UpdaterCore::UpdaterCore(BoxConfigPaths paths) : m_paths(std::move(paths)) {}

int UpdaterCore::Run(const std::string& repository) {
    const std::string task_db = repository + "/db/" + "task-db.sqlite";
    if (IsNewInstall(task_db)) {
        SLOG_WARN("UpdaterCore: new install\n");
        if (DefaultTasks(repository, m_paths).Prepare() == 0) return 0;
        SLOG_ERR("Failed to prepare default task at '%s'\n", repository.c_str());
        return -1;
    }
    unsigned version = 0;
    if (GetDBVersion(task_db, version) != 1) {
        SLOG_ERR("UpdaterCore: Failed to get task db version '%s'\n", task_db.c_str());
        return -1;
    }
    if (version == 1 && UpdaterV1(repository).Run() < 0) {
        SLOG_ERR("UpdaterCore: Failed to run updater v1\n");
        return -1;
    }
    return 0;
}
