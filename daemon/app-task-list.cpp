// How tasks are shown to clients.
#include <list>

#include "daemon/app.h"
#include "daemon/dump-log.h"
#include "daemon/usb-matcher.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "platform/task-utils.h"
#include "platform/utility.h"
#include "processor/file-processor.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"
#include "strategy/run-progress.h"
#include "utils/log.h"

namespace {

// What a task stands on at this moment.
struct Mounts {
    bool is_usb_mounted = false;
    bool is_hub_mounted = false;
    bool is_runnable = false;
    std::string usb_share_name;
};

Mounts GetMounts(uint64_t task_id) {
    Mounts mounts;
    uint64_t usb_id = 0;
    std::string path;
    mounts.is_usb_mounted = IsTaskUSBMounted(task_id, usb_id, mounts.usb_share_name, path);
    mounts.is_hub_mounted = IsTaskShareMounted(task_id);
    mounts.is_runnable = IsTaskRunnable(mounts.is_usb_mounted, task_id);
    return mounts;
}

// The status of a loaded task that nothing works on.
const char* IdleStatus(const TaskInfo& task) {
    if (TaskEventManager::GetInstance().IsInReadyQueue(task.id)) return "waiting";
    // It may have left the queue since its state was read: the state was set before it left.
    TaskRunInfo entry;
    if (TaskEntryHandler::GetInstance().GetTaskEntry(task.id, entry) == 0 &&
        entry.status == TASK_RUN_STATE_RUNNING) {
        return "copying";
    }
    if (task.error != 0) return "failed";
    return task.last_copied_time == 0 ? "initial" : "successful";
}

// `run_state` is null for a task that is not loaded.
const char* TaskStatus(const TaskInfo& task, const Mounts& mounts, const int* run_state) {
    if (!IsValidID(task.id)) return "na";
    if (!task.is_enable) return "disabled";
    if (!mounts.is_usb_mounted || !mounts.is_hub_mounted || run_state == nullptr) {
        return task.error != 0 ? "failed" : "unmounted";
    }
    switch (*run_state) {
        case TASK_RUN_STATE_RUNNING:
            return "copying";
        case TASK_RUN_STATE_CANCELING:
            return "canceling";
        case TASK_RUN_STATE_IDLE:
            return IdleStatus(task);
        default:
            return "na";
    }
}

void SetSettings(const TaskInfo& task, PObject& response) {
    response["id"] = task.id;
    response["type"] = task.task_type;
    response["task_name"] = task.task_name;
    response["copy_strategy"] = task.copy_strategy;
    response["keep_dir_structure"] = task.keep_dir_structure;
    response["smart_create_date_dir"] = task.smart_create_date_dir;
    response["rename_photo_video"] = task.rename_photo_video;
    response["remove_src_file"] = task.remove_src_file;
    response["conflict_policy"] = task.conflict_policy;
    response["enable_rotation"] = task.enable_rotation;
    response["max_version_count"] = task.max_version_count;
    response["rotation_policy"] = task.rotation_policy;
    response["latest_finish_time"] = task.last_copied_time;
    response["error_code"] = task.error;
    response["schedule_id"] = task.schedule_id;
}

void SetDevice(const USBInfo& usb, PObject& response) {
    response["is_default_task"] = IsDefaultUUID(usb.uuid);
    response["uuid"] = usb.uuid;
    response["run_when_plug_in"] = usb.run_when_plug_in;
    response["eject_when_task_done"] = usb.eject_when_task_done;
    response["producer"] = usb.producer;
    response["product"] = usb.product;
}

void SetPaths(const TaskInfo& task, PObject& response) {
    std::string source;
    std::string destination;
    GetTaskDisplayPaths(task, source, destination);
    response["source_path"] = source;
    response["destination_path"] = destination;
}

// A run may have ended since the row was read.
TaskInfo WithLatestResult(const TaskInfo& listed) {
    TaskInfo latest;
    if (TaskDB::GetInstance().GetTaskInfo(listed.id, latest) != 1) return listed;
    TaskInfo task = listed;
    task.error = latest.error;
    task.last_copied_time = latest.last_copied_time;
    return task;
}

// The file that is being copied for this task, if the worker has one of it in hand. The worker goes
// on meanwhile: the path is taken only when the task is the same after it was read.
std::string CopyFilePath(uint64_t task_id, const FileProcessor* file_processor) {
    if (file_processor == nullptr || file_processor->GetCurrentTaskId() != task_id) return "";
    std::string path = file_processor->GetCurrentPath();
    return file_processor->GetCurrentTaskId() == task_id ? path : "";
}

}  // namespace

int Ferrixd::GetTaskResponse(const TaskInfo& listed, FileProcessor* file_processor,
                             PObject& response) {
    USBInfo usb_info;
    if (!FindUSB(listed.usb_id, usb_info, response)) return -1;
    const Mounts mounts = GetMounts(listed.id);
    TaskRunInfo entry;
    const bool is_loaded = TaskEntryHandler::GetInstance().GetTaskEntry(listed.id, entry) == 0;
    // A run leaves its result in the row before it ejects the device, and both before its state is
    // idle: a row that is read after these is of no earlier run.
    const TaskInfo task_info = is_loaded ? WithLatestResult(listed) : listed;
    const std::string status = TaskStatus(task_info, mounts, is_loaded ? &entry.status : nullptr);
    SetSettings(task_info, response);
    SetDevice(usb_info, response);
    SetPaths(task_info, response);
    response["task_status"] = status;
    response["is_usb_mounted"] = mounts.is_usb_mounted;
    response["is_hub_mounted"] = mounts.is_hub_mounted;
    response["is_task_runnable"] = mounts.is_runnable;
    response["usb_share_name"] = mounts.usb_share_name;
    response["copy_file_path"] =
        status == "copying" ? CopyFilePath(task_info.id, file_processor) : "";
    SLOG_DBG("GetTaskResponse: [%s]\n\n", response.ToText().c_str());
    return 0;
}

FileProcessor* Ferrixd::FirstFileProcessor() const {
    for (size_t i = 0; i < m_processor_count; ++i) {
        auto* file_processor = dynamic_cast<FileProcessor*>(m_processors[i]);
        if (file_processor != nullptr) return file_processor;
    }
    return nullptr;
}

int Ferrixd::ListTask(const PObject&, PObject& response) {
    std::list<TaskInfo> tasks;
    if (TaskDB::GetInstance().ListAllTaskInfo(tasks) < 0) {
        SetResponseError(RESPONSE_DATABASE, "Failed to list tasks  from DB", response);
        return -1;
    }
    FileProcessor* file_processor = FirstFileProcessor();
    PObject::array_type task_list;
    for (const TaskInfo& task : tasks) {
        PObject element;
        if (GetTaskResponse(task, file_processor, element) < 0) {
            SLOG_WARN("Failed to get task response for '%llu', ignore\n", Llu(task.id));
            continue;
        }
        task_list.push_back(std::move(element));
    }
    response["task_list"] = task_list;
    return 0;
}

int Ferrixd::ListEntry(const PObject&, PObject&) {
    LogDump(TaskEntryHandler::GetInstance().ToString());
    USBMatcher::GetInstance().Dump();
    return 0;
}

// About the run in hand, or the last one: only one task runs at a time.
int Ferrixd::GetTaskProgress(const PObject&, PObject& response) {
    const RunProgress::Snapshot progress = RunProgress::GetInstance().Get();
    response["run"] = progress.run;
    response["task_id"] = progress.task_id;
    response["start_time"] = progress.start_time;
    response["files"] = progress.files;
    response["bytes"] = progress.bytes;
    return 0;
}
