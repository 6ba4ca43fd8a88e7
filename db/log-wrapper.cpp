#include "db/log-wrapper.h"

#include <ctime>

#include "db/log-db.h"
#include "utils/log.h"

int AddLog(LogInfo& info) {
    if (info.task_id == 0 || info.log_type == 0) {
        SLOG_ERR("Invalid parameter\n");
        return -1;
    }
    info.timestamp = static_cast<uint32_t>(time(nullptr));
    if (LogDB::GetInstance().AddLogInfo(info) < 0) {
        SLOG_ERR("Failed to add log info to log db for task '%llu'\n", Llu(info.task_id));
        return -1;
    }
    return 0;
}
