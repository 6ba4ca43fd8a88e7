// A share is locked and unlocked. The entries stay, so that a task of it shows as not runnable and
// returns by itself; the run that was under way is lost, and nothing starts it again.
#include <list>

#include "daemon/app.h"
#include "daemon/request-text.h"
#include "daemon/share-tasks.h"
#include "db/task-info.h"
#include "ipc/pobject.h"
#include "utils/log.h"

int Ferrixd::HandleShareUnmounted(const PObject& request) {
    const std::string share_name = RequestText(request, "share_name");
    if (share_name.empty()) {
        SLOG_ERR("HandleShareUnmounted: Invalid parameter\n");
        return -1;
    }
    std::list<TaskInfo> tasks;
    if (ListTasksOfShare(share_name, tasks) < 0) return -1;
    if (tasks.empty()) return 0;
    SLOG_INFO("HandleShareUnmounted: share_name = %s\n", share_name.c_str());
    for (const TaskInfo& task : tasks) {
        SLOG_INFO("HandleShareUnmounted: CancelTask '%llu' because HUB share '%s' is unmounted\n",
                  Llu(task.id), share_name.c_str());
        PObject cancel;
        PObject response;
        cancel["task_id"] = task.id;
        CancelTask(cancel, response);  // refuses a task whose device is away
    }
    return 0;
}

int Ferrixd::HandleShareMounted(const PObject& request) {
    const std::string share_name = RequestText(request, "share_name");
    if (share_name.empty()) {
        SLOG_ERR("HandleShareMounted: Invalid parameter\n");
        return -1;
    }
    std::list<TaskInfo> tasks;
    if (ListTasksOfShare(share_name, tasks) < 0) return -1;
    if (!tasks.empty()) {
        SLOG_INFO("HandleShareMounted: share_name = %s, do nothing\n", share_name.c_str());
    }
    return 0;
}
