#include "platform/task-utils.h"

#include "db/task-db.h"
#include "platform/keld-sdk-wrapper.h"
#include "platform/utility.h"
#include "utils/log.h"

namespace {

// What a folder of a task adds to the path of its root.
std::string FolderSuffix(const std::string& folder) { return folder == "/" ? "" : folder; }

}  // namespace

bool IsExportTask(int task_type) { return task_type == TASK_TYPE_EXPORT_GENERAL; }

bool NeedRotation(int copy_strategy, bool enable_rotation) {
    return copy_strategy == COPY_STRATEGY_VERSION && enable_rotation;
}

bool IsDefaultUUID(const std::string& uuid) {
    return uuid == DEFAULT_USB_UUID || uuid == DEFAULT_SD_UUID;
}

bool IsDefaultTask(uint64_t task_id) {
    if (!IsValidID(task_id)) {
        SLOG_ERR("Task id '%llu' is not valid\n", Llu(task_id));
        return false;
    }
    TaskInfo task;
    if (TaskDB::GetInstance().GetTaskInfo(task_id, task) != 1) {
        SLOG_ERR("Failed to get task info for task '%llu'\n", Llu(task_id));
        return false;
    }
    USBInfo usb;
    if (TaskDB::GetInstance().GetUSBInfoByID(task.usb_id, usb) != 1) {
        SLOG_ERR("Failed to get usb info for usb id '%llu'\n", Llu(task.usb_id));
        return false;
    }
    return IsDefaultUUID(usb.uuid);
}

int GetHubDirFullPath(const std::string& share_name, const std::string& folder, std::string& path) {
    SDK::Share share;
    std::string volume;
    if (share.Open(share_name) == 0) volume = share.GetVolumePath();
    // Without its volume the path would lead into the root file system.
    if (volume.empty()) {
        SLOG_ERR("Failed to open hub_share_name '%s'\n", share_name.c_str());
        return -1;
    }
    SLOG_DBG("hub_volume_path = %s, hub_share_name = %s\n", volume.c_str(), share_name.c_str());
    path = volume + "/" + share_name + FolderSuffix(folder);
    return 0;
}

void GetUSBDirFullPath(const std::string& usb_share_path, const std::string& folder,
                       std::string& path) {
    path = usb_share_path + FolderSuffix(folder);
}

int GetTaskFullPaths(const std::string& usb_share_path, const TaskInfo& task, std::string& source,
                     std::string& destination) {
    std::string hub;
    if (GetHubDirFullPath(task.hub_share_name, task.hub_folder_path, hub) < 0) return -1;
    std::string usb;
    GetUSBDirFullPath(usb_share_path, task.usb_folder_path, usb);
    const bool is_export = IsExportTask(task.task_type);
    source = is_export ? hub : usb;
    destination = is_export ? usb : hub;
    return 0;
}

std::string GetHubDisplayPath(const TaskInfo& task) {
    return "/" + task.hub_share_name + FolderSuffix(task.hub_folder_path);
}

void GetTaskDisplayPaths(const TaskInfo& task, std::string& source, std::string& destination) {
    const std::string hub = GetHubDisplayPath(task);
    const bool is_export = IsExportTask(task.task_type);
    source = is_export ? hub : task.usb_folder_path;
    destination = is_export ? task.usb_folder_path : hub;
}
