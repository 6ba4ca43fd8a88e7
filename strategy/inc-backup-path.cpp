#include "strategy/inc-backup-path.h"

#include "strategy/file-event-context.h"
#include "strategy/task-run-info.h"
#include "utils/log.h"

std::string IncBackupGetDstFullPath(const TaskRunInfo& task, const std::string& dst_ev_path) {
    std::string full_path = FullEventPath(task.dst_dir_path, dst_ev_path);
    SLOG_INFO("IncBackup: GetDstFullPath = %s", full_path.c_str());
    return full_path;
}

std::string IncBackupGetDstEventPath(const TaskRunInfo& task, const std::string& full_path) {
    const size_t found = full_path.find(task.dst_dir_path);
    if (found == std::string::npos) return {};
    const size_t start = found + task.dst_dir_path.size();
    return start < full_path.size() ? full_path.substr(start) : "/";
}
