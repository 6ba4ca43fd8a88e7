// Devices that come and go: from the hooks of the mount service to live entries and back.
#include <list>
#include <map>

#include "daemon/app.h"
#include "daemon/dump-log.h"
#include "daemon/request-text.h"
#include "daemon/task-entry-loader.h"
#include "daemon/usb-matcher.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "platform/sdk-device.h"
#include "platform/task-utils.h"
#include "platform/utility.h"
#include "processor/hardware-controller.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"
#include "utils/log.h"

namespace {

constexpr int FOUND = 1;

// Makes the entry of the task's device unless it is there. 0 or -1.
int AddUSBEntry(const USBInfo& usb_info, const std::string& usb_share_path) {
    TaskEntryHandler& entries = TaskEntryHandler::GetInstance();
    USBRunInfo entry;
    if (entries.GetUSBEntry(usb_info.id, entry) == 0) {
        SLOG_INFO("USB entry has already been loaded for usb id '%llu'\n", Llu(usb_info.id));
        return 0;
    }
    if (usb_share_path.empty() || !IsValidID(usb_info.id)) {
        SLOG_ERR("Invalid parameter\n");
        SLOG_ERR("Failed to prepare usb entry for usb_share_path '%s', usb id '%llu'\n",
                 usb_share_path.c_str(), Llu(usb_info.id));
        SLOG_WARN("Failed to add usb entry '%llu', usb_share_path = %s, ignore\n", Llu(usb_info.id),
                  usb_share_path.c_str());
        return -1;
    }
    entry.usb_id = usb_info.id;
    entry.usb_share_path = usb_share_path;
    entry.uuid = usb_info.uuid;
    entry.run_when_plug_in = usb_info.run_when_plug_in;
    entry.eject_when_task_done = usb_info.eject_when_task_done;
    entries.AddUSBEntry(entry);
    return 0;
}

void AddTaskEntry(const TaskInfo& task, const std::string& usb_share_path) {
    TaskEntryHandler& entries = TaskEntryHandler::GetInstance();
    TaskRunInfo entry;
    if (entries.GetTaskEntry(task.id, entry) == 0) {
        SLOG_INFO("Task entry has already been loaded for task id '%llu'\n", Llu(task.id));
        return;
    }
    if (BuildTaskEntry(task, usb_share_path, entry) < 0) {
        SLOG_WARN("Failed to add task entry '%llu', usb_share_path = %s, ignore\n", Llu(task.id),
                  usb_share_path.c_str());
        return;
    }
    entries.AddTaskEntry(entry);
    HardwareController::GetInstance().NotifyHWController();
    SLOG_INFO("Add task '%llu'\n", Llu(task.id));
}

// True when the device of a loaded task has gone: another one may stand on its path by now, or the
// same one on another path.
bool IsAnyGone(const std::list<TaskRunInfo>& tasks) {
    for (const TaskRunInfo& task : tasks) {
        if (!SDK::IsDevicePresent(task.device_mount_path, task.device_identity)) return true;
    }
    return false;
}

}  // namespace

int Ferrixd::LoadUSBTaskEntries() {
    std::map<std::string, std::string> volumes;
    if (SDK::GetMountedVolumes(volumes) < 0) SLOG_ERR("Failed to get mounted volumes\n");
    USBMatcher& matcher = USBMatcher::GetInstance();
    for (const auto& [mount_path, dev_path] : volumes) {
        std::string uuid;
        if (SDK::GetUUID(mount_path, dev_path, uuid) < 0) {
            SLOG_WARN("Failed to get uuid for device '%s', ignore this device\n", dev_path.c_str());
            continue;
        }
        if (matcher.Register(mount_path, dev_path, uuid) < 0) {
            SLOG_WARN("Failed to register usb for device '%s', ignore this device\n",
                      dev_path.c_str());
            continue;
        }
        USBInfo usb_info;
        if (matcher.Match(uuid, usb_info) != FOUND) {
            SLOG_WARN("NO matched usb info for '%s', ignore this device\n", dev_path.c_str());
            continue;
        }
        if (LoadUSBTaskEntryByUSBID(usb_info.id, mount_path) < 0) {
            SLOG_WARN("Failed to load usb and task entry for '%llu', '%s', ignore\n",
                      Llu(usb_info.id), mount_path.c_str());
        }
    }
    return 0;
}

int Ferrixd::LoadUSBTaskEntryByUSBID(uint64_t usb_id, const std::string& usb_share_path) {
    USBInfo usb_info;
    if (TaskDB::GetInstance().GetUSBInfoByID(usb_id, usb_info) != FOUND) {
        SLOG_ERR("Failed to get usb info from db '%llu'\n", Llu(usb_id));
        return -1;
    }
    std::list<TaskInfo> tasks;
    if (TaskDB::GetInstance().ListTaskInfoByUSB(usb_id, tasks) < 0) {
        SLOG_ERR("Failed to list task info for usb '%llu'\n", Llu(usb_id));
        return -1;
    }
    DropUnusedUSBEntry(usb_id, usb_share_path);
    for (const TaskInfo& task : tasks) {
        if (AddUSBEntry(usb_info, usb_share_path) == 0) AddTaskEntry(task, usb_share_path);
    }
    return 0;
}

int Ferrixd::HandleVolumeMount(const PObject& request) {
    const std::string usb_share_path = RequestText(request, "mountpoint");
    const std::string device = RequestText(request, "device");
    if (usb_share_path.empty() || device.empty()) {
        SLOG_ERR("HandleVolumeMount: Invalid parameter\n");
        return -1;
    }
    SLOG_INFO("HandleVolumeMount: usb_share_path = %s, device = %s\n", usb_share_path.c_str(),
              device.c_str());
    std::string uuid;
    if (SDK::GetUUID(usb_share_path, device, uuid) < 0) {
        SLOG_ERR("Failed to get uuid for device '%s'\n", device.c_str());
        return -1;
    }
    if (USBMatcher::GetInstance().Register(usb_share_path, device, uuid) < 0) {
        SLOG_ERR("Failed to register usb for device '%s'\n", device.c_str());
        return -1;
    }
    USBInfo usb_info;
    if (USBMatcher::GetInstance().Match(uuid, usb_info) != FOUND) {
        SLOG_WARN("NO matched usb info for '%s'\n", device.c_str());
        return -1;
    }
    DropStaleEntries(usb_info.id);
    if (LoadUSBTaskEntryByUSBID(usb_info.id, usb_share_path) < 0) {
        SLOG_ERR("Failed to load usb and task entry for '%llu', '%s', ignore\n", Llu(usb_info.id),
                 usb_share_path.c_str());
        return -1;
    }
    if (usb_info.run_when_plug_in) EnqueueRunnableTasks(usb_info.id);
    LogDump(TaskEntryHandler::GetInstance().ToString());
    SLOG_INFO("Mount usb device '%s', uuid '%s', usb_id '%llu'\n", device.c_str(), uuid.c_str(),
              Llu(usb_info.id));
    return 0;
}

void Ferrixd::EnqueueRunnableTasks(uint64_t usb_id) {
    std::list<TaskRunInfo> tasks;
    TaskEntryHandler::GetInstance().ListTaskEntriesByUSB(usb_id, tasks);
    for (const TaskRunInfo& task : tasks) {
        if (IsTaskRunnable(true, task.task_id)) {
            EnqueueTask(task.task_id);
        } else {
            SLOG_INFO("Task '%llu' is not runnable\n", Llu(task.task_id));
        }
    }
}

// A device that was pulled out is not announced. When it comes back its old entries would stand for
// the device that has gone, and no task of them could run.
void Ferrixd::DropStaleEntries(uint64_t usb_id) {
    std::list<TaskRunInfo> tasks;
    TaskEntryHandler::GetInstance().ListTaskEntriesByUSB(usb_id, tasks);
    if (!IsAnyGone(tasks)) return;
    SLOG_NOTICE("The device of usb id '%llu' has been replaced, its entries are loaded anew\n",
                Llu(usb_id));
    DropTaskEntries(usb_id);
}

// The entry of a device whose tasks could not be loaded outlives its unmounting and is worth
// nothing on another path.
void Ferrixd::DropUnusedUSBEntry(uint64_t usb_id, const std::string& usb_share_path) {
    USBRunInfo usb;
    if (TaskEntryHandler::GetInstance().GetUSBEntry(usb_id, usb) < 0) return;
    std::list<TaskRunInfo> tasks;
    TaskEntryHandler::GetInstance().ListTaskEntriesByUSB(usb_id, tasks);
    if (tasks.empty() && usb.usb_share_path != usb_share_path) RemoveUSB(usb_id);
}

void Ferrixd::DropTaskEntries(uint64_t usb_id) {
    std::list<TaskRunInfo> tasks;
    TaskEntryHandler::GetInstance().ListTaskEntriesByUSB(usb_id, tasks);
    PauseProcessors();
    for (const TaskRunInfo& task : tasks) DropTaskEntry(usb_id, task.task_id);
    ResumeProcessors();
}

int Ferrixd::HandleVolumeUnmount(const PObject& request) {
    const std::string usb_share_path = RequestText(request, "mountpoint");
    const std::string device = RequestText(request, "device");
    if (usb_share_path.empty() || device.empty()) {
        SLOG_ERR("HandleVolumeUnmount: Invalid parameter\n");
        return -1;
    }
    SLOG_INFO("HandleVolumeUnmount: usb_share_path = %s\n", usb_share_path.c_str());
    USBMatcher::GetInstance().UnregisterByPath(usb_share_path);
    USBRunInfo usb;
    if (TaskEntryHandler::GetInstance().GetUSBEntryByPath(usb_share_path, usb) < 0) {
        SLOG_WARN("USB '%s' dose not mount\n", usb_share_path.c_str());
        return 0;
    }
    std::list<TaskRunInfo> tasks;
    TaskEntryHandler::GetInstance().ListTaskEntriesByUSB(usb.usb_id, tasks);
    if (tasks.empty()) {
        SLOG_INFO("No matched task entry for usb share path '%s'\n", usb_share_path.c_str());
        return 0;
    }
    DropTaskEntries(usb.usb_id);
    SLOG_INFO("Unmount usb device '%s', usb_share_path '%s', usb_id '%llu'\n", device.c_str(),
              usb_share_path.c_str(), Llu(usb.usb_id));
    return 0;
}

void Ferrixd::DropTaskEntry(uint64_t usb_id, uint64_t task_id) {
    DropTaskWork(task_id);
    TaskEntryHandler::GetInstance().RemoveTaskEntry(task_id);
    std::list<TaskRunInfo> rest;
    TaskEntryHandler::GetInstance().ListTaskEntriesByUSB(usb_id, rest);
    if (rest.empty()) RemoveUSB(usb_id);
}

void Ferrixd::EnqueueTask(uint64_t task_id) {
    TaskEventManager::GetInstance().PushEvent(task_id);
    HardwareController::GetInstance().NotifyHWController();
    SLOG_INFO("Run task '%llu'\n", Llu(task_id));
}

void Ferrixd::RemoveUSB(uint64_t usb_id) {
    TaskEntryHandler::GetInstance().RemoveUSBEntry(usb_id);
    HardwareController::GetInstance().NotifyHWController();
    SLOG_INFO("Remove usb '%llu'\n", Llu(usb_id));
}

void Ferrixd::ReleaseDefaultTask(const std::string& uuid) {
    if (uuid.empty()) {
        SLOG_ERR("Invalid parameter\n");
        return;
    }
    USBInfo usb_info;
    if (USBMatcher::GetInstance().Match(uuid, usb_info) != FOUND || !IsDefaultUUID(usb_info.uuid)) {
        SLOG_INFO("Current device '%s' is NOT a DEFAULT_TASK\n", uuid.c_str());
        return;
    }
    SLOG_INFO("current uuid '%s' is a DEFAULT_TASK\n", uuid.c_str());
    DropTaskEntries(usb_info.id);
}

int Ferrixd::LoadDefaultTaskEntry(const std::string& usb_share_path, const std::string& uuid) {
    if (usb_share_path.empty() || uuid.empty()) {
        SLOG_ERR("Invalid parameter\n");
        return -1;
    }
    USBInfo usb_info;
    if (USBMatcher::GetInstance().Match(uuid, usb_info) != FOUND || !IsDefaultUUID(usb_info.uuid)) {
        SLOG_INFO("Current device '%s' is NOT a DEFAULT_TASK\n", uuid.c_str());
        return 0;
    }
    SLOG_INFO("current uuid '%s' is a DEFAULT_TASK\n", uuid.c_str());
    if (LoadUSBTaskEntryByUSBID(usb_info.id, usb_share_path) < 0) {
        SLOG_ERR("Failed to add usb entry '%llu' and task entry\n", Llu(usb_info.id));
        return -1;
    }
    return 0;
}
