// Tasks come into the system and leave it. Nothing is rolled back: what a failing step leaves
// behind stays, and "remove_task" clears it.
#include <list>

#include "daemon/app.h"
#include "daemon/dump-log.h"
#include "daemon/request-text.h"
#include "daemon/task-folder.h"
#include "daemon/usb-matcher.h"
#include "db/side-files.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "platform/schedule.h"
#include "platform/sdk-device.h"
#include "platform/sdk-system.h"
#include "platform/task-utils.h"
#include "platform/utility.h"
#include "processor/task-entry-handler.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr int FOUND = 1;
constexpr uint64_t NO_TASK = 0;
constexpr int64_t NO_SCHEDULE = -1;

USBInfo ReadUSBInfo(const PObject& request) {
    USBInfo usb;
    usb.uuid = RequestText(request, "uuid");
    usb.run_when_plug_in = request["run_when_plug_in"].AsBool();
    usb.eject_when_task_done = request["eject_when_task_done"].AsBool();
    usb.producer = RequestText(request, "producer");
    usb.product = RequestText(request, "product");
    return usb;
}

TaskInfo ReadTaskInfo(const PObject& request, uint64_t usb_id) {
    TaskInfo task;
    task.usb_id = usb_id;
    task.is_enable = true;
    task.task_name = RequestText(request, "task_name");
    task.task_type = request["task_type"].AsInt32();
    task.usb_folder_path = RequestText(request, "usb_folder_path");
    task.hub_folder_path = RequestText(request, "hub_folder_path");
    task.hub_share_name = RequestText(request, "hub_share_name");
    task.copy_strategy = request["copy_strategy"].AsInt32();
    task.keep_dir_structure = request["keep_dir_structure"].AsBool();
    task.smart_create_date_dir = request["smart_create_date_dir"].AsBool();
    task.rename_photo_video = request["rename_photo_video"].AsBool();
    task.remove_src_file = request["remove_src_file"].AsBool();
    task.conflict_policy = request["conflict_policy"].AsInt32();
    task.enable_rotation = request["enable_rotation"].AsBool();
    task.max_version_count = request["max_version_count"].AsUInt64();
    task.rotation_policy = request["rotation_policy"].AsInt32();
    return task;
}

}  // namespace

int Ferrixd::AddTask(const PObject& request, PObject& response) {
    if (!request.HasMember("usb_share_path") || !request.HasMember("uuid")) {
        SetResponseError(RESPONSE_BAD_REQUEST, "Invalid parameter", response);
        return -1;
    }
    if (!CheckImportDestPath(request, NO_TASK, response)) return -1;
    ReleaseDefaultTask(RequestText(request, "uuid"));
    TaskInfo task_info;
    if (AddTaskRows(request, task_info, response) < 0) return -1;
    if (SetUpTask(request, task_info, response) < 0) return -1;
    if (ScheduleTask(request, task_info, response) < 0) return -1;
    LogDump(TaskEntryHandler::GetInstance().ToString());
    response["task_id"] = task_info.id;
    if (!LogTask(task_info, LogDescription::LOG_DESC_TASK_ADDED, response)) return -1;
    SLOG_INFO("Add Task '%llu'\n", Llu(task_info.id));
    return 0;
}

int Ferrixd::AddTaskRows(const PObject& request, TaskInfo& task_info, PObject& response) {
    TaskDB& task_db = TaskDB::GetInstance();
    const USBInfo new_usb = ReadUSBInfo(request);
    USBInfo known_usb;
    if (task_db.GetUSBInfoByUUID(new_usb.uuid, known_usb) == FOUND) {
        SLOG_ERR("USB info has already existed for uuid  '%s'\n", new_usb.uuid.c_str());
        SetResponseError(RESPONSE_DEVICE_KNOWN, "USB info has already existed", response);
        return -1;
    }
    uint64_t usb_id = 0;
    if (task_db.AddUSBInfo(new_usb, usb_id) < 0) {
        SetResponseError(RESPONSE_DATABASE, "Failed to AddUSBInfo to DB", response);
        return -1;
    }
    std::list<TaskInfo> known_tasks;
    if (task_db.ListTaskInfoByUSB(usb_id, known_tasks) == 0 && !known_tasks.empty()) {
        SLOG_ERR("Task info has already added for usb_id '%llu'\n", Llu(usb_id));
        SetResponseError(RESPONSE_TASK_KNOWN, "Task info has already existed", response);
        return -1;
    }
    if (!IsValidID(usb_id)) {
        SLOG_ERR("Failed to PrepareTaskInfo.\n");
        SetResponseError(RESPONSE_BAD_REQUEST, "Failed to PrepareTaskInfo", response);
        return -1;
    }
    task_info = ReadTaskInfo(request, usb_id);
    uint64_t task_id = 0;
    if (task_db.AddTaskInfo(task_info, task_id) < 0) {
        SetResponseError(RESPONSE_DATABASE, "Failed to AddTaskInfo to DB", response);
        return -1;
    }
    task_info.id = task_id;
    return 0;
}

int Ferrixd::SetUpTask(const PObject& request, const TaskInfo& task_info, PObject& response) {
    if (InitTaskEnv(task_info.id) < 0) {
        SLOG_ERR("Failed to InitTaskEnv for '%llu'\n", Llu(task_info.id));
        SetResponseError(RESPONSE_OTHER, "Failed to InitTaskEnv", response);
        return -1;
    }
    if (WriteFilterSetting(task_info.id, request) < 0) {
        SLOG_ERR("Failed to WriteFilterSetting for '%llu'\n", Llu(task_info.id));
        SetResponseError(RESPONSE_OTHER, "Failed to WriteFilterSetting", response);
        return -1;
    }
    if (LoadUSBTaskEntryByUSBID(task_info.usb_id, RequestText(request, "usb_share_path")) < 0) {
        SLOG_ERR("Failed to add usb entry '%llu' and task entry\n", Llu(task_info.usb_id));
        SetResponseError(RESPONSE_OTHER, "Failed to LoadUSBTaskEntryByUSBID", response);
        return -1;
    }
    USBMatcher::GetInstance().RemoveByUUID(RequestText(request, "uuid"));
    return 0;
}

int Ferrixd::ScheduleTask(const PObject& request, TaskInfo& task_info, PObject& response) {
    const std::string schedule = RequestText(request, "schedule_json_str");
    if (!CreateSchedule(task_info.id, task_info.task_type, task_info.task_name,
                        request["schedule_enabled"].AsBool(), schedule, task_info.schedule_id)) {
        SLOG_ERR("Failed to create schedule [%s]", schedule.c_str());
        SetResponseError(RESPONSE_OTHER, "Failed to CreateSchedule", response);
        return -1;
    }
    if (TaskDB::GetInstance().UpdateTaskInfo(task_info) < 0) {
        SetResponseError(RESPONSE_DATABASE, "Failed to update task info", response);
        return -1;
    }
    return 0;
}

// Where a repository has lost its task database, numbers are given again and folders are still
// there. A new task would take what the old one had copied for its own and leave it out. What says
// that a copy is not to be trusted, in the other files, holds for any task and stays.
int Ferrixd::InitTaskEnv(uint64_t task_id) {
    if (MakeTaskFolder(task_id) == 0 && RemoveDatabase(FileDBPath(task_id)) == 0) return 0;
    SLOG_ERR("Failed to create task folder '%s'\n", TaskFolderPath(task_id).c_str());
    return -1;
}

int Ferrixd::RemoveTask(const PObject& request, PObject& response) {
    if (!request.HasMember("task_id")) {
        SetResponseError(RESPONSE_BAD_REQUEST, "Invalid parameter", response);
        return -1;
    }
    const uint64_t task_id = request["task_id"].AsUInt64();
    if (IsDefaultTask(task_id)) {
        SLOG_ERR("Default Task '%llu' can not be removed\n", Llu(task_id));
        SetResponseError(RESPONSE_OTHER, "Default Task can not be removed", response);
        return -1;
    }
    TaskInfo task_info;
    if (!FindTask(task_id, task_info, response)) return -1;
    USBRunInfo usb;
    const bool is_plugged_in =
        TaskEntryHandler::GetInstance().GetUSBEntry(task_info.usb_id, usb) == 0;

    PauseProcessors();
    DropTaskWork(task_id);
    TaskEntryHandler::GetInstance().RemoveTaskEntry(task_id);
    RemoveTaskTraces(task_info, response);
    SLOG_INFO("Remove Task '%llu'\n", Llu(task_id));
    const int result = is_plugged_in ? OfferToDefaultTask(usb.usb_share_path, response) : 0;
    ResumeProcessors();
    return result;
}

void Ferrixd::RemoveTaskTraces(const TaskInfo& task_info, PObject& response) {
    if (TaskDB::GetInstance().RemoveTaskInfo(task_info.id) < 0) {
        SetResponseError(RESPONSE_DATABASE, "Failed to RemoveTaskInfo from DB", response);
    }
    if (task_info.schedule_id != NO_SCHEDULE && SDK::RemoveSchedEntry(task_info.schedule_id) < 0) {
        SLOG_ERR("Failed to KELDSchedTaskRemove[%lld]\n", Lld(task_info.schedule_id));
        SetResponseError(RESPONSE_OTHER, "Failed to remove schedule", response);
    }
    RemoveUSBInfo(task_info.usb_id, response);
    const std::string folder = TaskFolderPath(task_info.id);
    if (FSRemove(folder) < 0) {
        SLOG_ERR("Failed to remove task folder '%s'\n", folder.c_str());
        SetResponseError(RESPONSE_OTHER, "Failed to remove task folder", response);
    }
    LogTask(task_info, LogDescription::LOG_DESC_TASK_REMOVED, response);
}

int Ferrixd::RemoveUSBInfo(uint64_t usb_id, PObject& response) {
    RemoveUSB(usb_id);
    if (TaskDB::GetInstance().RemoveUSBInfo(usb_id) < 0) {
        SetResponseError(RESPONSE_DATABASE, "Failed to RemoveUSBInfo from DB", response);
        return -1;
    }
    return 0;
}

int Ferrixd::OfferToDefaultTask(const std::string& usb_share_path, PObject& response) {
    std::string dev_path;
    if (SDK::GetDevPath(usb_share_path, dev_path) < 0) {
        SetResponseError(RESPONSE_OTHER, "Failed to get device path", response);
        return -1;
    }
    std::string uuid;
    if (SDK::GetUUID(usb_share_path, dev_path, uuid) < 0) {
        SetResponseError(RESPONSE_OTHER, "Failed to get uuid for device", response);
        return -1;
    }
    if (USBMatcher::GetInstance().Register(usb_share_path, dev_path, uuid) < 0) {
        SetResponseError(RESPONSE_OTHER, "Failed to register usb for device", response);
        return -1;
    }
    LoadDefaultTaskEntry(usb_share_path, uuid);
    return 0;
}
