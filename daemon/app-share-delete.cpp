// A share is deleted: the user's tasks on it go altogether; a default task, which cannot go, loses
// its share and is switched off.
#include <list>

#include "daemon/app.h"
#include "daemon/request-text.h"
#include "daemon/share-tasks.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "platform/task-utils.h"
#include "utils/log.h"

int Ferrixd::HandleShareDelete(const PObject& request) {
    const std::string share_name = RequestText(request, "share_name");
    if (share_name.empty()) {
        SLOG_ERR("HandleShareDelete: Invalid parameter\n");
        return -1;
    }
    std::list<TaskInfo> tasks;
    if (ListTasksOfShare(share_name, tasks) < 0) return -1;
    if (tasks.empty()) return 0;
    SLOG_INFO("HandleShareDelete: share_name = %s\n", share_name.c_str());
    for (const TaskInfo& task : tasks) {
        if (IsDefaultTask(task.id)) {
            ClearTaskOfShare(task);
        } else {
            RemoveTaskOfShare(task);
        }
    }
    return 0;
}

void Ferrixd::RemoveTaskOfShare(const TaskInfo& task) {
    SLOG_NOTICE("HandleShareDelete: RemoveTask '%llu' because share '%s' is deleted\n",
                Llu(task.id), task.hub_share_name.c_str());
    PObject request;
    PObject response;
    request["task_id"] = task.id;
    if (RemoveTask(request, response) < 0) {
        SLOG_WARN("Failed to remove task for '%llu', ignore\n", Llu(task.id));
    }
}

void Ferrixd::ClearTaskOfShare(const TaskInfo& task) {
    SLOG_INFO("HandleShareDelete: ClearTask '%llu' because share '%s' is deleted\n", Llu(task.id),
              task.hub_share_name.c_str());
    TaskInfo cleared = task;
    cleared.hub_share_name.clear();
    cleared.hub_folder_path.clear();
    if (TaskDB::GetInstance().UpdateTaskInfo(cleared) < 0) {
        // The line names another handler; those who search logs for it know it so.
        SLOG_ERR("HandleSharePathChange: Failed to UpdateTaskInfo '%s' -> '%s'\n",
                 task.hub_share_name.c_str(), cleared.hub_share_name.c_str());
    }
    PObject request;
    PObject response;
    request["task_id"] = task.id;
    DisableDefaultTask(request, response);
}
