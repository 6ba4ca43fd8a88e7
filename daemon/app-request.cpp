// What many commands begin and end with.
#include "daemon/app.h"
#include "daemon/task-log.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "utils/log.h"

namespace {

constexpr int FOUND = 1;

}  // namespace

void Ferrixd::SetResponseError(int code, const std::string& text, PObject& response) {
    response.Clear();
    response["error_code"] = code;
    response["error"] = text;
}

bool Ferrixd::ReadTaskId(const PObject& request, uint64_t& task_id, PObject& response) {
    if (!request.HasMember("task_id")) {
        SLOG_ERR("Invalid parameter\n");
        SetResponseError(RESPONSE_BAD_REQUEST, "Invalid parameter", response);
        return false;
    }
    task_id = request["task_id"].AsUInt64();
    return true;
}

bool Ferrixd::FindTask(uint64_t task_id, TaskInfo& task_info, PObject& response) {
    if (TaskDB::GetInstance().GetTaskInfo(task_id, task_info) == FOUND) return true;
    SetResponseError(RESPONSE_NO_SUCH_TASK, "Task id does not exist", response);
    return false;
}

bool Ferrixd::FindUSB(uint64_t usb_id, USBInfo& usb_info, PObject& response) {
    if (TaskDB::GetInstance().GetUSBInfoByID(usb_id, usb_info) == FOUND) return true;
    SetResponseError(RESPONSE_NO_SUCH_DEVICE, "USB id does not exist", response);
    return false;
}

bool Ferrixd::LogTask(const TaskInfo& task_info, LogDescription::ID id, PObject& response) {
    if (AddTaskLog(task_info.id, id, task_info.task_name) == 0) return true;
    SLOG_ERR("Failed to add log info to log db for '%llu'\n", Llu(task_info.id));
    SetResponseError(RESPONSE_DATABASE, "Failed to add log info to log db", response);
    return false;
}
