#include "daemon/task-entry-loader.h"

#include <ctime>
#include <memory>

#include "daemon/task-folder.h"
#include "daemon/task-settings.h"
#include "db/file-db.h"
#include "db/task-info.h"
#include "filter/file-filter.h"
#include "platform/package-paths.h"
#include "platform/sdk-device.h"
#include "platform/task-utils.h"
#include "platform/utility.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/task-run-info.h"
#include "strategy/version-end.h"
#include "utils/confined-path.h"
#include "utils/log.h"
#include "utils/path-util.h"

namespace {

// The name of the folder of a version task's present run; empty for other strategies. 0 or -1.
int GetVersionDir(const TaskInfo& task, std::string& version_dir) {
    if (task.copy_strategy != COPY_STRATEGY_VERSION) return 0;
    const time_t now = time(nullptr);
    struct tm local = {};
    if (localtime_r(&now, &local) == nullptr ||
        GetTimeString(local, "Ferrix Copy_%F_%H%M%S", version_dir) < 0) {
        SLOG_ERR("Failed to get time str '%llu'\n", Llu(task.id));
        return -1;
    }
    return 0;
}

// The two roots of the task, and the folders that nothing may lead out of. 0 or -1.
int GetRoots(const TaskInfo& task, const std::string& usb_share_path, TaskRunInfo& entry) {
    std::string share_path;
    if (!IsInnerFolder(task.hub_folder_path) || !IsInnerFolder(task.usb_folder_path) ||
        GetHubDirFullPath(task.hub_share_name, "/", share_path) < 0 ||
        GetTaskFullPaths(usb_share_path, task, entry.src_dir_path, entry.dst_dir_path) < 0) {
        SLOG_ERR("Failed to get src_dir_full_path and dst_dir_full_path\n");
        return -1;
    }
    entry.src_dir_path = PathWithoutTrailingSlashes(entry.src_dir_path);
    entry.dst_dir_path = PathWithoutTrailingSlashes(entry.dst_dir_path);
    entry.is_export = IsExportTask(task.task_type);
    const auto device_root = std::make_shared<const ConfinedRoot>(usb_share_path);
    const auto share_root = std::make_shared<const ConfinedRoot>(share_path);
    entry.src_root = entry.is_export ? share_root : device_root;
    entry.dst_root = entry.is_export ? device_root : share_root;
    return 0;
}

// Which device it is. Without that the task could never run: better to have no entry, and try again
// at the next mount.
int GetDevice(const std::string& usb_share_path, TaskRunInfo& entry) {
    entry.device_mount_path = usb_share_path;
    if (SDK::GetDeviceIdentity(usb_share_path, entry.device_identity) == 0) return 0;
    SLOG_ERR("Failed to get the identity of the device at '%s'\n", usb_share_path.c_str());
    return -1;
}

// The memory of an incremental task; other tasks have none. 0 or -1.
int OpenFileDB(const TaskInfo& task, TaskRunInfo& entry) {
    if (task.copy_strategy != COPY_STRATEGY_INCREMENTAL) return 0;
    const std::string path = FileDBPath(task.id);
    entry.file_db = std::make_shared<FileDB>();
    if (entry.file_db->Init(path) == 0) return 0;
    SLOG_ERR("Failed to initiailize file db for task '%llu' at '%s'.\n", Llu(task.id),
             path.c_str());
    return -1;
}

int LoadBlackList(FileFilter& filter, const std::string& path) {
    if (filter.LoadBlackList(path) == 0) return 0;
    SLOG_ERR("Failed to load black list at '%s'\n", path.c_str());
    return -1;
}

int LoadWhiteList(FileFilter& filter, const std::string& path) {
    if (filter.LoadWhiteList(path) == 0) return 0;
    SLOG_ERR("Failed to load white list at '%s'\n", path.c_str());
    return -1;
}

int LoadFilters(uint64_t task_id, TaskRunInfo& entry) {
    entry.system_filter = std::make_shared<FileFilter>();
    entry.task_filter = std::make_shared<FileFilter>();
    if (LoadBlackList(*entry.system_filter, SystemFilterPath()) < 0) return -1;
    if (LoadBlackList(*entry.task_filter, BlackListPath(task_id)) < 0) return -1;
    return LoadWhiteList(*entry.task_filter, WhiteListPath(task_id));
}

void FillFromRow(const TaskInfo& task, TaskRunInfo& entry) {
    entry.task_id = task.id;
    entry.usb_id = task.usb_id;
    entry.status = TASK_RUN_STATE_IDLE;
    entry.copy_strategy = task.copy_strategy;
    CopyTaskSettings(task, entry);
}

}  // namespace

int BuildTaskEntry(const TaskInfo& task, const std::string& usb_share_path, TaskRunInfo& entry) {
    const std::string mount_path = PathWithoutTrailingSlashes(usb_share_path);
    if (mount_path.empty() || !IsValidID(task.id)) {
        SLOG_ERR("Invalid parameter\n");
        return -1;
    }
    TaskRunInfo built;
    built.strategy_handler = CreateCopyStrategyHandler(task.copy_strategy);
    if (!built.strategy_handler) {
        SLOG_ERR("Failed to create copy strategy handler '%llu'.\n", Llu(task.id));
        return -1;
    }
    if (GetVersionDir(task, built.version_dir) < 0) return -1;
    if (GetRoots(task, mount_path, built) < 0) return -1;
    if (GetDevice(mount_path, built) < 0) return -1;
    if (OpenFileDB(task, built) < 0) return -1;
    if (LoadFilters(task.id, built) < 0) return -1;
    FillFromRow(task, built);
    SettleVersionsAtLoad(built);
    SLOG_INFO("src_path '%s' and dst_path '%s' is ready (with task_id %llu)\n",
              built.src_dir_path.c_str(), built.dst_dir_path.c_str(), Llu(task.id));
    entry = std::move(built);
    return 0;
}
