#include "daemon/task-settings.h"

#include <memory>

#include "daemon/task-folder.h"
#include "db/task-info.h"
#include "platform/request-setting.h"
#include "platform/task-utils.h"
#include "strategy/task-run-info.h"
#include "utils/confined-path.h"
#include "utils/path-util.h"

namespace {

enum class AppliesTo { IMPORTS, EXPORTS, ALL };

template <typename Value>
struct SettingRow {
    const char* key;
    Value TaskInfo::*field;
    AppliesTo tasks = AppliesTo::ALL;
};

constexpr SettingRow<std::string> kTexts[] = {
    {"hub_share_name",  &TaskInfo::hub_share_name,  AppliesTo::IMPORTS},
    {"hub_folder_path", &TaskInfo::hub_folder_path, AppliesTo::IMPORTS},
    {"usb_folder_path", &TaskInfo::usb_folder_path, AppliesTo::EXPORTS},
    {"task_name",       &TaskInfo::task_name,       AppliesTo::ALL    },
};
constexpr SettingRow<bool> kFlags[] = {
    {"keep_dir_structure",    &TaskInfo::keep_dir_structure   },
    {"smart_create_date_dir", &TaskInfo::smart_create_date_dir},
    {"rename_photo_video",    &TaskInfo::rename_photo_video   },
    {"remove_src_file",       &TaskInfo::remove_src_file      },
    {"enable_rotation",       &TaskInfo::enable_rotation      },
};
constexpr SettingRow<int> kNumbers[] = {
    {"conflict_policy", &TaskInfo::conflict_policy},
    {"rotation_policy", &TaskInfo::rotation_policy},
};
constexpr SettingRow<uint64_t> kCounts[] = {
    {"max_version_count", &TaskInfo::max_version_count},
};

bool Applies(AppliesTo tasks, int task_type) {
    if (tasks == AppliesTo::ALL) return true;
    return IsExportTask(task_type) == (tasks == AppliesTo::EXPORTS);
}

// Takes one table's keys; `get` is the reader of its type. True when a value has changed.
template <typename Value, size_t N, typename Get>
bool TakeAll(const SettingRow<Value> (&rows)[N], const Get& get, const PObject& request,
             TaskInfo& task) {
    bool is_changed = false;
    for (const SettingRow<Value>& row : rows) {
        Value value{};
        if (!Applies(row.tasks, task.task_type)) continue;
        if (!get(request, row.key, task.*row.field, value)) continue;
        task.*row.field = value;
        is_changed = true;
    }
    return is_changed;
}

}  // namespace

bool TakeTaskSettings(const PObject& request, TaskInfo& task) {
    const bool has_text = TakeAll(kTexts, GetChangedString, request, task);
    const bool has_flag = TakeAll(kFlags, GetChangedBool, request, task);
    const bool has_number = TakeAll(kNumbers, GetChangedInt, request, task);
    const bool has_count = TakeAll(kCounts, GetChangedUInt64, request, task);
    return has_text || has_flag || has_number || has_count;
}

bool LeadsOut(const TaskInfo& task, const TaskInfo& old_task) {
    const auto leads_out = [](const std::string& folder, const std::string& old_folder) {
        return folder != old_folder && !IsInnerFolder(folder);
    };
    return leads_out(task.hub_folder_path, old_task.hub_folder_path) ||
           leads_out(task.usb_folder_path, old_task.usb_folder_path);
}

void CopyTaskSettings(const TaskInfo& task, TaskRunInfo& entry) {
    entry.task_name = task.task_name;
    entry.hub_share_name = task.hub_share_name;
    entry.keep_dir_structure = task.keep_dir_structure;
    entry.smart_create_date_dir = task.smart_create_date_dir;
    entry.rename_photo_video = task.rename_photo_video;
    entry.remove_src_file = task.remove_src_file;
    entry.conflict_policy = task.conflict_policy;
    entry.enable_rotation = task.enable_rotation;
    entry.max_version_count = task.max_version_count;
    entry.rotation_policy = task.rotation_policy;
}

void ApplyTaskSettings(const TaskInfo& task, const std::string& usb_share_path,
                       TaskRunInfo& entry) {
    std::string source;
    std::string share_path;
    const std::string mount_path = PathWithoutTrailingSlashes(usb_share_path);
    if (GetTaskFullPaths(mount_path, task, source, entry.dst_dir_path) == 0) {
        entry.dst_dir_path = PathWithoutTrailingSlashes(entry.dst_dir_path);
        if (!entry.is_export && GetHubDirFullPath(task.hub_share_name, "/", share_path) == 0) {
            entry.dst_root = std::make_shared<const ConfinedRoot>(share_path);
        }
    }
    CopyTaskSettings(task, entry);
}
