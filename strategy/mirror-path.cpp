#include "strategy/mirror-path.h"

#include "strategy/file-event-context.h"
#include "strategy/task-run-info.h"
#include "utils/log.h"

std::string MirrorGetDstFullPath(const TaskRunInfo& task, const std::string& path) {
    std::string full_path = FullEventPath(task.dst_dir_path, path);
    SLOG_INFO("Mirror: GetDstFullPath = %s", full_path.c_str());
    return full_path;
}
