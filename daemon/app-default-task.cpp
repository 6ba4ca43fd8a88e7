// The default tasks, which serve devices without a task of their own, are switched on and off. For
// any other task both commands do nothing, with success.
#include "daemon/app.h"
#include "daemon/usb-matcher.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "platform/task-utils.h"
#include "processor/task-entry-handler.h"
#include "utils/log.h"

namespace {

constexpr int FOUND = 1;

// Of the task's device; empty when there is none.
std::string UuidOf(uint64_t task_id) {
    TaskInfo task_info;
    USBInfo usb_info;
    if (TaskDB::GetInstance().GetTaskInfo(task_id, task_info) != FOUND ||
        TaskDB::GetInstance().GetUSBInfoByID(task_info.usb_id, usb_info) != FOUND) {
        return "";
    }
    return usb_info.uuid;
}

}  // namespace

int Ferrixd::EnableDefaultTask(const PObject& request, PObject& response) {
    uint64_t task_id = 0;
    if (!ReadTaskId(request, task_id, response)) return -1;
    if (!IsDefaultTask(task_id)) {
        SLOG_INFO("Current task '%llu' is NOT default task\n", Llu(task_id));
        return 0;
    }
    TaskInfo task_info;
    if (!FindTask(task_id, task_info, response)) return -1;
    if (!CheckImportDestPath(task_info.task_type, task_info.hub_share_name,
                             task_info.hub_folder_path, task_id, response)) {
        SLOG_ERR("CheckImportDestPath() failed\n");
        return -1;
    }
    if (TaskDB::GetInstance().SetTaskEnable(task_id, true) < 0) {
        SetResponseError(RESPONSE_DATABASE, "Failed to update task info", response);
        return -1;
    }
    if (!LogTask(task_info, LogDescription::LOG_DESC_DEFAULT_TASK_ENABLED, response)) return -1;
    SLOG_INFO("Enable Task '%llu'\n", Llu(task_id));
    return LoadCandidate(task_info.usb_id, response);
}

int Ferrixd::LoadCandidate(uint64_t usb_id, PObject& response) {
    std::string usb_share_path;
    if (USBMatcher::GetInstance().GetMountPath(usb_id, usb_share_path) < 0) {
        SLOG_INFO("USB For default task is not mounted '%llu'\n", Llu(usb_id));
        return 0;
    }
    if (LoadUSBTaskEntryByUSBID(usb_id, usb_share_path) < 0) {
        SLOG_ERR("Failed to add usb entry '%llu' and task entry\n", Llu(usb_id));
        SetResponseError(RESPONSE_OTHER, "Failed to LoadUSBTaskEntryByUSBID", response);
        return -1;
    }
    return 0;
}

int Ferrixd::DisableDefaultTask(const PObject& request, PObject& response) {
    uint64_t task_id = 0;
    if (!ReadTaskId(request, task_id, response)) return -1;
    if (!IsDefaultTask(task_id)) {
        SLOG_INFO("Current task '%llu' is NOT default task '%s'\n", Llu(task_id),
                  UuidOf(task_id).c_str());
        return 0;
    }
    TaskInfo task_info;
    if (!FindTask(task_id, task_info, response)) return -1;
    USBInfo usb_info;
    if (!FindUSB(task_info.usb_id, usb_info, response)) return -1;
    PauseProcessors();
    DropTaskWork(task_id);
    TaskEntryHandler::GetInstance().RemoveTaskEntry(task_id);
    int result = 0;
    if (TaskDB::GetInstance().SetTaskEnable(task_id, false) < 0) {
        SetResponseError(RESPONSE_DATABASE, "Failed to update task info", response);
        result = -1;
    }
    RemoveUSB(usb_info.id);
    ResumeProcessors();
    if (!LogTask(task_info, LogDescription::LOG_DESC_DEFAULT_TASK_DISABLED, response)) return -1;
    SLOG_INFO("Disable Task '%llu'\n", Llu(task_id));
    return result;
}
