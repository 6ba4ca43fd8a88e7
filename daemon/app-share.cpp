// Shares that are renamed, restored or transformed: their tasks leave the running system before the
// change and come back after it. The rows stay. A run that was under way is not started again.
#include <list>

#include "daemon/app.h"
#include "daemon/request-text.h"
#include "daemon/share-tasks.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "platform/task-utils.h"
#include "processor/task-entry-handler.h"
#include "utils/confined-path.h"
#include "utils/log.h"

namespace {

// The hook table never gives a "type" of this value: the shell takes three others only.
std::string NameBeforeChange(const PObject& request) {
    const bool is_path_change = RequestText(request, "type") == "pre_path_change";
    return RequestText(request, is_path_change ? "origin_share_name" : "share_name");
}

// The place of the share that the entry was built for.
std::string SharePath(const TaskRunInfo& entry) {
    const auto& root = entry.is_export ? entry.src_root : entry.dst_root;
    return root == nullptr ? "" : root->Path();
}

// A share that has no place now is taken to be where it was.
bool IsForAnotherPlace(const TaskRunInfo& entry, const TaskInfo& task) {
    if (entry.hub_share_name != task.hub_share_name) return true;
    std::string share_path;
    return GetHubDirFullPath(task.hub_share_name, "/", share_path) == 0 &&
           share_path != SharePath(entry);
}

}  // namespace

int Ferrixd::HandleShareRemoveEntry(const PObject& request) {
    const std::string share_name = NameBeforeChange(request);
    if (share_name.empty()) {
        SLOG_ERR("HandleShareRemoveEntry: Invalid parameter\n");
        return -1;
    }
    std::list<TaskInfo> tasks;
    if (ListTasksOfShare(share_name, tasks) < 0) return -1;
    if (tasks.empty()) return 0;
    SLOG_INFO("HandleShareRemoveEntry: share_name = %s\n", share_name.c_str());
    PauseProcessors();
    for (const TaskInfo& task : tasks) DropTaskEntry(task.usb_id, task.id);
    ResumeProcessors();
    return 0;
}

int Ferrixd::HandleSharePathChange(const PObject& request) {
    const std::string origin_share_name = RequestText(request, "origin_share_name");
    const std::string share_name = RequestText(request, "share_name");
    if (origin_share_name.empty() || share_name.empty()) {
        SLOG_ERR("HandleSharePathChange: Invalid parameter\n");
        return -1;
    }
    if (origin_share_name != share_name &&
        TaskDB::GetInstance().UpdateHUBShareName(origin_share_name, share_name) < 0) {
        SLOG_ERR("HandleSharePathChange: Failed to UpdateHUBShareName '%s' -> '%s'\n",
                 origin_share_name.c_str(), share_name.c_str());
        return -1;
    }
    std::list<TaskInfo> tasks;
    if (ListTasksOfShare(share_name, tasks) < 0) return -1;
    if (tasks.empty()) return 0;
    SLOG_INFO("HandleSharePathChange: origin_share_name = %s, share_name = %s\n",
              origin_share_name.c_str(), share_name.c_str());
    DropMovedEntries(tasks);
    LoadUSBTaskEntries();
    return 0;
}

// A device that was plugged in while its share was on its way has entries of the old name or place,
// which would be kept: the task would wait for that, or copy into whatever is there next.
void Ferrixd::DropMovedEntries(const std::list<TaskInfo>& tasks) {
    for (const TaskInfo& task : tasks) {
        TaskRunInfo entry;
        if (TaskEntryHandler::GetInstance().GetTaskEntry(task.id, entry) < 0 ||
            !IsForAnotherPlace(entry, task)) {
            continue;
        }
        SLOG_NOTICE("Task '%llu' was loaded for share '%s', it is loaded anew\n", Llu(task.id),
                    entry.hub_share_name.c_str());
        PauseProcessors();
        DropTaskEntry(task.usb_id, task.id);
        ResumeProcessors();
    }
}

int Ferrixd::HandleShareReloadEntry(const PObject& request) {
    const std::string share_name = RequestText(request, "share_name");
    if (share_name.empty()) {
        SLOG_ERR("HandleShareReloadEntry: Invalid parameter\n");
        return -1;
    }
    std::list<TaskInfo> tasks;
    if (ListTasksOfShare(share_name, tasks) < 0) return -1;
    if (tasks.empty()) return 0;
    SLOG_INFO("HandleShareReloadEntry: share_name = %s\n", share_name.c_str());
    DropMovedEntries(tasks);
    LoadUSBTaskEntries();
    return 0;
}
