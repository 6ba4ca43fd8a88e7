#include "daemon/share-tasks.h"

#include "db/task-db.h"
#include "utils/log.h"

int ListTasksOfShare(const std::string& share_name, std::list<TaskInfo>& tasks) {
    if (TaskDB::GetInstance().ListTaskInfoByShare(share_name, tasks) == 0) return 0;
    SLOG_ERR("Failed to list all task info for share name '%s'\n", share_name.c_str());
    return -1;
}
