#include "strategy/version-task-handler.h"

#include "strategy/task-run-info.h"
#include "strategy/version-end.h"
#include "strategy/version-mark.h"
#include "utils/error-code.h"
#include "utils/file-op.h"
#include "utils/log.h"

int VersionTaskHandler::PreHandle() {
    const TaskRunInfo& task = *GetTask();
    SLOG_INFO("TaskHandler: pre handle task '%llu'", Llu(task.task_id));
    if (const int result = TaskHandler::PreHandle(); result != ERR_SUCCESS) return result;
    // What an earlier run has left could not be reached when the task was loaded, but can be now.
    SettleUnfinishedVersions(task);
    if (PutVersionMarks(task.task_id, {MakeVersionMark(task, VersionMark::FILLING)}) < 0) {
        SLOG_WARN("The version of task '%llu' will not be known as unfinished after a crash",
                  Llu(task.task_id));
    }
    const std::string path = task.dst_dir_path + "/" + task.version_dir;
    if (FSMKDir(path, true, FS_KEEP_UID, FS_KEEP_GID) != 0) {
        // The run goes on: each copy makes the folders that it needs.
        SLOG_ERR("Failed to create folder '%s' for task '%llu'", path.c_str(), Llu(task.task_id));
    }
    return ERR_SUCCESS;
}
