#include "service/usage-report.h"

#include <json/value.h>

#include <cstdio>
#include <list>
#include <string>

#include "db/task-db.h"
#include "platform/global-setting.h"
#include "service/repository.h"
#include "service/service-lock.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr int REPORT_VERSION = 1;
constexpr char PACKAGE_VERSION[] = "0037";

// A database that is not there is not made: it would count as a repository in use.
int OpenDatabase(TaskDB& db) {
    const std::string path = RepositoryPath(GetRepoVolPath()) + "/db/task-db.sqlite";
    if (FSExists(path) && db.Init(path) == 0) return 0;
    SLOG_ERR("Failed to init task db at '%s'\n", path.c_str());
    return -1;
}

Json::Value ReportTask(const TaskInfo& task) {
    Json::Value report(Json::objectValue);
    report["task_type"] = task.task_type;
    report["is_enable"] = task.is_enable;
    report["last_copied_time"] = task.last_copied_time;
    report["copy_strategy"] = task.copy_strategy;
    report["keep_dir_structure"] = task.keep_dir_structure;
    report["smart_create_date_dir"] = task.smart_create_date_dir;
    report["rename_photo_video"] = task.rename_photo_video;
    report["remove_src_file"] = task.remove_src_file;
    report["conflict_policy"] = task.conflict_policy;
    report["enable_rotation"] = task.enable_rotation;
    report["max_version_count"] = Json::UInt64{task.max_version_count};
    report["rotation_policy"] = task.rotation_policy;
    return report;
}

Json::Value ReportDevice(const USBInfo& usb, const std::list<TaskInfo>& tasks) {
    Json::Value report(Json::objectValue);
    report["usb_id"] = Json::UInt64{usb.id};
    report["uuid"] = usb.uuid;
    report["run_when_plug_in"] = usb.run_when_plug_in;
    report["eject_when_task_done"] = usb.eject_when_task_done;
    report["producer"] = usb.producer;
    report["product"] = usb.product;
    report["task_info"] = Json::Value(Json::arrayValue);
    for (const TaskInfo& task : tasks) {
        if (task.usb_id == usb.id) report["task_info"].append(ReportTask(task));
    }
    return report;
}

}  // namespace

int PrintUsageReport() {
    const ServiceLock lock;
    TaskDB db;
    if (OpenDatabase(db) < 0) return -1;
    std::list<USBInfo> devices;
    if (db.ListUSBInfo(devices) < 0) {
        SLOG_ERR("Failed to list all usb info\n");
        return -1;
    }
    std::list<TaskInfo> tasks;
    if (db.ListAllTaskInfo(tasks) < 0) {
        SLOG_ERR("Failed to list all task info\n");
        return -1;
    }
    Json::Value report(Json::objectValue);
    report["collect_version"] = REPORT_VERSION;
    report["package_version"] = PACKAGE_VERSION;
    report["beep"] = GetBeep();
    report["collect_data"] = Json::Value(Json::arrayValue);
    for (const USBInfo& usb : devices) report["collect_data"].append(ReportDevice(usb, tasks));
    printf("%s", report.toStyledString().c_str());
    fflush(stdout);
    return 0;
}
