#include "processor/run-aftermath.h"

#include <string>

#include "db/task-db.h"
#include "platform/keld-sdk-wrapper.h"
#include "processor/task-entry-handler.h"
#include "utils/log.h"

namespace {

constexpr char kRdxScript[] = "/lib/udev/script/rdx_util.sh";

// Takes the device out of the system. 0, or -1 with a log line.
int PullOut(const std::string& dev_name, const std::string& usb_share_path) {
    if (dev_name.empty()) {
        SLOG_ERR("keld_dev_name is empty\n");
        return -1;
    }
    if (SDK::EjectDevice(dev_name) != 0) {
        SLOG_ERR("Failed to eject USB for '%s'\n", usb_share_path.c_str());
        return -1;
    }
    if (SDK::RunProgram(kRdxScript, "eject", dev_name) != 0) {
        SLOG_ERR("Fail to eject RDX device [%s]\n", dev_name.c_str());
        return -1;
    }
    return 0;
}

int Eject(const USBRunInfo& usb) {
    const char* const path = usb.usb_share_path.c_str();
    std::string dev_path;
    if (SDK::GetDevPath(usb.usb_share_path, dev_path) < 0) {
        SLOG_ERR("Failed to get dev_path for '%s'\n", path);
        return -1;
    }
    std::string dev_name;
    if (SDK::GetKELDDevName(dev_path, dev_name) < 0) {
        SLOG_ERR("Failed to get keld_dev_name for '%s'\n", path);
        return -1;
    }
    if (PullOut(dev_name, usb.usb_share_path) < 0) {
        SLOG_ERR("Failed to eject usb for '%s'\n", path);
        return -1;
    }
    SLOG_INFO("Eject USB for usb '%llu', usb_share_path = '%s', dev_path = '%s'\n", Llu(usb.usb_id),
              path, dev_path.c_str());
    return 0;
}

}  // namespace

void CreateTaskIndex(uint64_t task_id, const TaskRunInfo& run_info) {
    TaskInfo info;
    if (TaskDB::GetInstance().GetTaskInfo(task_id, info) != 1) {
        SLOG_ERR("Failed to get task info for '%llu'\n", Llu(task_id));
        return;
    }
    if (info.task_type == TASK_TYPE_EXPORT_GENERAL) {
        SLOG_DBG("Export Task '%llu' does not need to create index\n", Llu(task_id));
        return;
    }
    // A run that could not be prepared has no destination.
    if (run_info.dst_dir_path.empty()) return;
    std::string path = run_info.dst_dir_path;
    if (run_info.copy_strategy == COPY_STRATEGY_VERSION) path += "/" + run_info.version_dir;
    SDK::AddToIndex(path);
}

int EjectTaskDevice(uint64_t task_id, const TaskRunInfo& run_info) {
    USBRunInfo usb;
    if (TaskEntryHandler::GetInstance().GetUSBEntry(run_info.usb_id, usb) < 0) {
        SLOG_ERR("USB id '%llu' does not exist\n", Llu(run_info.usb_id));
        return -1;
    }
    if (!usb.eject_when_task_done) return 0;
    if (Eject(usb) < 0) {
        SLOG_WARN("Failed to process eject USB for task '%llu', ignore\n", Llu(task_id));
        return -1;
    }
    return 0;
}
