// The rule that two imports may not share a destination.
#include <algorithm>
#include <list>
#include <string_view>

#include "daemon/app.h"
#include "daemon/request-text.h"
#include "daemon/task-folder.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "platform/task-utils.h"
#include "utils/confined-path.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

// With a slash at the end, so that a folder "/a" is no prefix of a folder "/ab". A folder has one
// text only: what "//" and "/./" add leads to the same place.
std::string WithSlash(std::string_view folder) {
    std::string path = "/";
    while (!folder.empty()) {
        const std::string_view name = folder.substr(0, folder.find('/'));
        folder.remove_prefix(std::min(name.size() + 1, folder.size()));
        if (!name.empty() && name != ".") path.append(name).append(1, '/');
    }
    return path;
}

bool Overlap(const std::string& one, const std::string& other) {
    return one.starts_with(other) || other.starts_with(one);
}

// Looks at a folder of a share without being led out of the share. 0, or -1 when it cannot be
// looked at, leads out, or is a link, below which the task would not be let either.
int StatInsideShare(const std::string& share_name, const std::string& folder,
                    const std::string& path, FSInfo& info) {
    std::string share_path;
    if (!IsInnerFolder(folder) || GetHubDirFullPath(share_name, "/", share_path) < 0) return -1;
    const ConfinedRoot root(share_path);
    if (FSStat(path, info) < 0) return -1;
    const bool is_inside = path.size() > share_path.size();
    return info.exist && is_inside && info.type == FS_TYPE_LINK ? -1 : 0;
}

}  // namespace

bool Ferrixd::CheckImportDestPath(const PObject& request, uint64_t own_task_id, PObject& response) {
    return CheckImportDestPath(request["task_type"].AsInt32(),
                               RequestText(request, "hub_share_name"),
                               RequestText(request, "hub_folder_path"), own_task_id, response);
}

bool Ferrixd::CheckImportDestPath(int task_type, const std::string& share_name,
                                  const std::string& folder_path, uint64_t own_task_id,
                                  PObject& response) {
    if (IsExportTask(task_type)) return true;
    std::string path;
    if (GetHubDirFullPath(share_name, folder_path, path) < 0) {
        SLOG_ERR("GetHubDirFullPath() failed.\n");
        SetResponseError(RESPONSE_OTHER, "Failed to resolve import destination path.", response);
        return false;
    }
    FSInfo info;
    if (StatInsideShare(share_name, folder_path, path, info) < 0) {
        SLOG_ERR("Failed to FSStat '%s'.\n", path.c_str());
        SetResponseError(RESPONSE_OTHER, "FSStat import path failed.", response);
        return false;
    }
    if (!info.exist) {
        SLOG_ERR("Import path does not exist.\n");
        SetResponseError(RESPONSE_DESTINATION_MISSING, "Import destination path does not exist.",
                         response);
        return false;
    }
    return IsImportPathFree(share_name, folder_path, own_task_id, response);
}

bool Ferrixd::IsImportPathFree(const std::string& share_name, const std::string& folder_path,
                               uint64_t own_task_id, PObject& response) {
    std::list<TaskInfo> tasks;
    if (TaskDB::GetInstance().ListAllTaskInfo(tasks) < 0) {
        SLOG_ERR("Failed to list all task info\n");
        SetResponseError(RESPONSE_DATABASE, "Failed to list tasks from DB", response);
        return false;
    }
    const std::string folder = WithSlash(folder_path);
    for (const TaskInfo& task : tasks) {
        if (IsExportTask(task.task_type) || !task.is_enable || task.id == own_task_id) continue;
        if (task.hub_share_name != share_name) continue;
        if (!Overlap(folder, WithSlash(task.hub_folder_path))) continue;
        SetResponseError(RESPONSE_DESTINATION_IN_USE, "Duplicated destination path", response);
        return false;
    }
    return true;
}
