#include "updater/updater-core.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "db/sqlite-util.h"
#include "updater/updater-utils.h"
#include "updater/updater-v1.h"
#include "utils/log.h"

namespace {

constexpr unsigned OLD_VERSION = 1;
constexpr unsigned PRESENT_VERSION = 2;

enum class Found {
    NOTHING,
    NO_TABLES,  // a daemon that was killed at its very first start leaves it so
    TABLES,
    UNKNOWN,
};

int AddCount(const SqlQuery& row, void* context) {
    *static_cast<int64_t*>(context) += row.Int64(0);
    return 0;
}

// A disk that fails to answer must not look like one without a database: all tasks would be lost.
Found LookFor(const std::string& task_db) {
    struct stat info = {};
    if (lstat(task_db.c_str(), &info) != 0) {
        if (errno == ENOENT) return Found::NOTHING;
        SLOG_ERR("'%s' cannot be looked for: %s (%d)\n", task_db.c_str(), std::strerror(errno),
                 errno);
        return Found::UNKNOWN;
    }
    int64_t tables = 0;
    if (QueryEach(task_db, "SELECT COUNT(*) FROM sqlite_master;", AddCount, &tables) < 0) {
        return Found::UNKNOWN;
    }
    return tables == 0 ? Found::NO_TABLES : Found::TABLES;
}

}  // namespace

UpdaterCore::UpdaterCore(BoxConfigPaths paths) : m_paths(std::move(paths)) {}

int UpdaterCore::Run(const std::string& repository) {
    const std::string task_db = repository + "/db/" + "task-db.sqlite";
    DefaultTasks default_tasks(repository, m_paths);
    const Found found = LookFor(task_db);
    if (found == Found::NOTHING || found == Found::NO_TABLES) {
        SLOG_WARN("UpdaterCore: new install\n");
        if (default_tasks.Prepare(found == Found::NO_TABLES) == 0) return 0;
        SLOG_ERR("Failed to prepare default task at '%s'\n", repository.c_str());
        return -1;
    }
    unsigned version = 0;
    if (found == Found::UNKNOWN || GetDBVersion(task_db, version) != 1) {
        SLOG_ERR("UpdaterCore: Failed to get task db version '%s'\n", task_db.c_str());
        return -1;
    }
    if (version == OLD_VERSION && UpdaterV1(repository).Run() < 0) {
        SLOG_ERR("UpdaterCore: Failed to run updater v1\n");
        return -1;
    }
    if (version <= PRESENT_VERSION) default_tasks.RemoveLeftKeys();
    return 0;
}
