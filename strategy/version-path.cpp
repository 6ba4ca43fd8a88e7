#include "strategy/version-path.h"

#include "strategy/file-event-context.h"
#include "strategy/task-run-info.h"
#include "utils/log.h"

std::string VersionGetDstFullPath(const TaskRunInfo& task, const std::string& path) {
    std::string full_path = FullEventPath(task.dst_dir_path + "/" + task.version_dir, path);
    SLOG_INFO("Version: GetDstFullPath = %s", full_path.c_str());
    return full_path;
}
