// The two configuration records, one row each of the task database, and their enumerations.
//
// The numbers are stored on disk and sent in commands: they are never renumbered. Records are plain
// values; texts are bytes in no particular encoding and end at a NUL byte when they are stored.
#pragma once

#include <cstdint>
#include <string>

// The uuids of the two devices that stand for the front USB port and the SD slot.
inline constexpr char DEFAULT_USB_UUID[] = "FERRIX_DEFAULT_USB_UUID";
inline constexpr char DEFAULT_SD_UUID[] = "FERRIX_DEFAULT_SD_UUID";

// Only an export copies from the share to the device; every other value is an import.
enum TaskType : int {
    TASK_TYPE_IMPORT_GENERAL = 1,
    TASK_TYPE_EXPORT_GENERAL = 2,
    TASK_TYPE_IMPORT_PHOTO = 3,
};

enum CopyStrategy : int {
    COPY_STRATEGY_VERSION = 1,
    COPY_STRATEGY_MIRROR = 2,
    COPY_STRATEGY_INCREMENTAL = 3,
};

// Consulted by incremental tasks only. A client may store any value: 1 renames, every other
// overwrites.
enum ConflictPolicy : int {
    CONFLICT_POLICY_RENAME = 1,
    CONFLICT_POLICY_OVERWRITE = 2,
};

enum RotationPolicy : int {
    ROTATION_POLICY_OLDEST = 1,
    ROTATION_POLICY_CONDITIONAL = 2,
};

// What a task is doing at this moment; kept in memory, never stored.
enum TaskRunState : int {
    TASK_RUN_STATE_IDLE = 0,
    TASK_RUN_STATE_RUNNING = 1,
    TASK_RUN_STATE_CANCELING = 2,
};

// A known USB or SD device.
struct USBInfo {
    uint64_t id = 0;  // row id; 0 is no device
    std::string uuid;
    bool run_when_plug_in = false;
    bool eject_when_task_done = true;
    std::string producer;
    std::string product;

    bool operator==(const USBInfo&) const = default;
};

// A task, bound to one device.
struct TaskInfo {
    uint64_t id = 0;           // row id, the task id everywhere; 0 is invalid
    uint64_t usb_id = 0;       // the owning USBInfo
    int64_t schedule_id = -1;  // entry of the platform's scheduler; -1 is none
    bool is_enable = false;    // disabled tasks never run; only default tasks are ever disabled
    std::string task_name;
    int task_type = 0;              // TaskType
    std::string usb_folder_path;    // relative to the mount point, "/" for its root
    std::string hub_folder_path;    // relative to the share, "/" for its root
    std::string hub_share_name;     // share on the appliance
    uint32_t last_copied_time = 0;  // end of the last successful run, seconds since the epoch
    int copy_strategy = 0;          // CopyStrategy
    bool keep_dir_structure = true;
    bool smart_create_date_dir = false;
    bool rename_photo_video = false;
    bool remove_src_file = false;
    int conflict_policy = 0;  // ConflictPolicy
    bool enable_rotation = false;
    uint64_t max_version_count = 0;  // versions to keep under rotation; stored up to 2^63 - 1
    int rotation_policy = 0;         // RotationPolicy
    int error = 0;                   // ErrorCode of the last run

    bool operator==(const TaskInfo&) const = default;
};
