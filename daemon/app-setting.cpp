// The settings of a task, and of the box.
#include "daemon/app.h"
#include "daemon/request-text.h"
#include "daemon/task-log.h"
#include "daemon/task-settings.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "platform/schedule.h"
#include "platform/task-utils.h"
#include "processor/hardware-controller.h"
#include "processor/task-entry-handler.h"
#include "strategy/rotation-handler.h"
#include "utils/log.h"

namespace {

// A lowered number of versions takes effect without a copy.
void RotateVersions(const TaskRunInfo& entry) {
    RotationHandler rotation;
    rotation.Init(entry);
    if (rotation.Run() < 0) {
        SLOG_ERR("SetTask: Failed to handle rotation for task '%llu'\n", Llu(entry.task_id));
    }
}

}  // namespace

// The check reads what the request holds and not what is stored: a client that changes anything of
// an import sends the task's type, share and folder along, and an export sends its type.
int Ferrixd::SetTaskSetting(const PObject& request, PObject& response) {
    uint64_t task_id = 0;
    if (!ReadTaskId(request, task_id, response)) return -1;
    if (!CheckImportDestPath(request, task_id, response)) {
        SLOG_ERR("CheckImportDestPath() failed\n");
        return -1;
    }
    TaskInfo task_info;
    if (!FindTask(task_id, task_info, response)) return -1;
    if (SetTask(request, task_id, response) < 0) {
        SLOG_ERR("Failed to set task info for task '%llu'\n", Llu(task_id));
        return -1;
    }
    // A name that was sent is logged as it was sent, also an empty one, which has changed nothing.
    if (request.HasMember("task_name")) task_info.task_name = RequestText(request, "task_name");
    if (!LogTask(task_info, LogDescription::LOG_DESC_TASK_SETTING_CHANGED, response)) return -1;
    SLOG_INFO("Set Task '%llu' Setting\n", Llu(task_id));
    return 0;
}

int Ferrixd::SetTask(const PObject& request, uint64_t task_id, PObject& response) {
    TaskInfo old_info;
    if (!FindTask(task_id, old_info, response)) return -1;
    TaskInfo task_info = old_info;
    if (!TakeTaskSettings(request, task_info)) return 0;
    // The row is not written: no entry could be made of it at the next mount.
    if (LeadsOut(task_info, old_info)) {
        SLOG_ERR("Invalid parameter\n");
        SetResponseError(RESPONSE_BAD_REQUEST, "Invalid parameter", response);
        return -1;
    }
    const bool is_renamed = task_info.task_name != old_info.task_name;
    if (is_renamed && AddRenameLog(task_id, old_info.task_name, task_info.task_name) < 0) {
        SLOG_ERR("Failed to add log info to log db for '%llu'\n", Llu(task_id));
        SetResponseError(RESPONSE_DATABASE, "Failed to add log info to log db", response);
    }
    if (TaskDB::GetInstance().UpdateTaskInfo(task_info) < 0) {
        SetResponseError(RESPONSE_DATABASE, "Failed to update task info", response);
        return -1;
    }
    return SetLiveTask(task_info, is_renamed, response);
}

// A task without live entries takes its row up when they are loaded. Its timetable keeps the old
// name until a later rename.
int Ferrixd::SetLiveTask(const TaskInfo& task_info, bool is_renamed, PObject& response) {
    TaskEntryHandler& entries = TaskEntryHandler::GetInstance();
    TaskRunInfo entry;
    if (entries.GetTaskEntry(task_info.id, entry) < 0) {
        SLOG_INFO("Task '%llu' does not match\n", Llu(task_info.id));
        return 0;
    }
    USBRunInfo usb;
    if (entries.GetUSBEntry(task_info.usb_id, usb) < 0) {
        SLOG_INFO("USB '%llu' dose not mount\n", Llu(task_info.usb_id));
        return 0;
    }
    ApplyTaskSettings(task_info, usb.usb_share_path, entry);
    entries.SetTaskSettings(entry);
    if (NeedRotation(entry.copy_strategy, entry.enable_rotation)) RotateVersions(entry);
    if (is_renamed && !UpdateScheduleName(task_info.schedule_id, task_info.task_name)) {
        SLOG_ERR("UpdateScheduleName() failed\n");
        SetResponseError(RESPONSE_OTHER, "Failed to UpdateScheduleName", response);
        return -1;
    }
    return 0;
}

int Ferrixd::GetTaskSetting(const PObject& request, PObject& response) {
    uint64_t task_id = 0;
    if (!ReadTaskId(request, task_id, response)) return -1;
    TaskInfo task_info;
    if (!FindTask(task_id, task_info, response)) return -1;
    if (GetTaskResponse(task_info, FirstFileProcessor(), response) < 0) {
        SLOG_ERR("Failed to get task response for '%llu', ignore\n", Llu(task_id));
        SetResponseError(RESPONSE_OTHER, "Failed to get task response", response);
        return -1;
    }
    SLOG_INFO("Get Task '%llu' Setting\n", Llu(task_id));
    return 0;
}

// In memory only: the next start reads the box's settings again.
int Ferrixd::SetGlobalSetting(const PObject& request, PObject& /*response*/) {
    HardwareController::GetInstance().SetBeepEnabled(request["beep_on_task_start_end"].AsBool());
    return 0;
}
