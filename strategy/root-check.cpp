#include "strategy/root-check.h"

#include "platform/keld-sdk-wrapper.h"
#include "processor/task-mounts.h"
#include "strategy/task-run-info.h"
#include "utils/error-code.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

// Asked for as "folder/.": a file or a planted link in the folder's place does not answer, while a
// root that is itself a link does.
bool IsSourceFolderThere(const TaskRunInfo& task) {
    FSInfo info;
    return FSStat(task.src_dir_path + "/.", info) == 0 && info.exist && info.type == FS_TYPE_DIR;
}

int CheckDevice(const TaskRunInfo& task) {
    if (SDK::IsDevicePresent(task.device_mount_path, task.device_identity)) return ERR_SUCCESS;
    SLOG_ERR("Device of task '%llu' is gone from '%s'", Llu(task.task_id),
             task.device_mount_path.c_str());
    return task.is_export ? ERR_DST_ROOT_MISS : ERR_SRC_ROOT_MISS;
}

int CheckShare(const TaskRunInfo& task) {
    if (IsShareMounted(task.hub_share_name)) return ERR_SUCCESS;
    SLOG_ERR("Share '%s' of task '%llu' is not mounted", task.hub_share_name.c_str(),
             Llu(task.task_id));
    return ERR_SHARE_NOT_MOUNTED;
}

}  // namespace

int CheckTaskRoots(const TaskRunInfo& task) {
    if (const int result = CheckDevice(task); result < 0) return result;
    if (const int result = CheckShare(task); result < 0) return result;
    if (!IsSourceFolderThere(task)) {
        SLOG_ERR("Source root folder miss '%s'", task.src_dir_path.c_str());
        return ERR_SRC_ROOT_MISS;
    }
    return ERR_SUCCESS;
}

int CheckTaskDestination(const TaskRunInfo& task) {
    return task.is_export ? CheckDevice(task) : CheckShare(task);
}
