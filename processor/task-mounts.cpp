#include "processor/task-mounts.h"

#include "platform/keld-sdk-wrapper.h"
#include "processor/task-entry-handler.h"
#include "utils/log.h"

bool IsShareMounted(const std::string& share_name) {
    SDK::Share share;
    if (share.Open(share_name) < 0) {
        SLOG_ERR("Failed to get share info '%s'\n", share_name.c_str());
        return false;
    }
    return share.IsMounted();
}

bool IsTaskShareMounted(uint64_t task_id) {
    TaskRunInfo task;
    if (TaskEntryHandler::GetInstance().GetTaskEntry(task_id, task) < 0) return false;
    return IsShareMounted(task.hub_share_name);
}

bool IsTaskUSBMounted(uint64_t task_id, uint64_t& usb_id, std::string& share_name,
                      std::string& path) {
    const TaskEntryHandler& entries = TaskEntryHandler::GetInstance();
    TaskRunInfo task;
    USBRunInfo usb;
    if (entries.GetTaskEntry(task_id, task) < 0 || entries.GetUSBEntry(task.usb_id, usb) < 0) {
        return false;
    }
    std::string found_name;
    std::string found_path;
    if (SDK::GetShareNameByPath(usb.usb_share_path, found_name, found_path) < 0 ||
        found_name.empty() || found_path.empty()) {
        return false;
    }
    usb_id = usb.usb_id;
    share_name = found_name;
    path = found_path;
    return true;
}

bool IsTaskRunnable(bool is_usb_mounted, uint64_t task_id) {
    return is_usb_mounted && IsTaskShareMounted(task_id);
}
