#include "daemon/task-log.h"

#include "db/log-info.h"
#include "db/log-wrapper.h"

int AddTaskLog(uint64_t task_id, LogDescription::ID id, const std::string& task_name) {
    LogInfo log;
    log.SetTaskId(task_id);
    log.SetDescription(id, task_name);
    return AddLog(log);
}

int AddRenameLog(uint64_t task_id, const std::string& old_name, const std::string& new_name) {
    LogInfo log;
    log.SetTaskId(task_id);
    log.SetDescription(LogDescription::LOG_DESC_TASK_RENAMED, old_name, new_name);
    return AddLog(log);
}
