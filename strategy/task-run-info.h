// A task in the form that a run needs: its settings, its resolved paths and its shared objects.
//
// Built when the entries of a device are loaded and kept in TaskEntryHandler, which hands out full
// copies. The counted references are owned jointly by all copies: an object lives as long as the
// last copy, also when the entry has gone. After loading only the registry's own copy changes: a
// run sets `status` and `version_dir`, a command the settings with the destination. A copy belongs
// to one thread; the objects behind the references are safe for any.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

class ConfinedRoot;
class CopyStrategyHandler;
class FileDB;
class FileFilter;

struct TaskRunInfo {
    uint64_t task_id = 0;
    uint64_t usb_id = 0;
    std::string task_name;
    int status = 0;         // TASK_RUN_STATE_...
    int copy_strategy = 0;  // COPY_STRATEGY_...
    std::string hub_share_name;
    std::string dst_dir_path;  // absolute, without a slash at the end
    std::string src_dir_path;  // absolute, without a slash at the end
    bool keep_dir_structure = true;
    bool smart_create_date_dir = false;
    bool rename_photo_video = false;
    bool remove_src_file = false;
    int conflict_policy = 0;  // CONFLICT_POLICY_...
    std::string version_dir;  // name of the folder of the current run; version tasks only
    bool enable_rotation = false;
    uint64_t max_version_count = 0;
    int rotation_policy = 0;  // ROTATION_POLICY_...

    std::shared_ptr<CopyStrategyHandler> strategy_handler;
    std::shared_ptr<FileFilter> system_filter;  // black list only, asked while listing
    std::shared_ptr<FileFilter> task_filter;    // black and white list, asked for each event
    std::shared_ptr<FileDB> file_db;            // incremental tasks only

    // Which device the task is about, so that a device that is gone is never taken for an empty
    // one: where it is mounted, and the platform's opaque text for the very device and file system
    // that stood there when the entry was loaded. Without them the device counts as gone.
    std::string device_mount_path;
    std::string device_identity;
    bool is_export = false;  // the device is the destination, the share the source

    // While these live, the file layer follows no link below the two roots (the mount path of the
    // device and the path of the share). Null leaves the paths as they are.
    std::shared_ptr<const ConfinedRoot> src_root;
    std::shared_ptr<const ConfinedRoot> dst_root;
};
