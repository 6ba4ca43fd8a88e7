// The task database of version 1, and the timetables that its tasks did not have.
#include <json/value.h>

#include <ctime>

#include "db/sqlite-util.h"
#include "platform/json-util.h"
#include "platform/schedule.h"
#include "platform/sdk-system.h"
#include "platform/utility.h"
#include "updater/database-file.h"
#include "updater/updater-utils.h"
#include "updater/updater-v1.h"
#include "utils/log.h"

namespace {

constexpr unsigned OLD_VERSION = 1;

// sqlite rewrites the triggers of other tables when a table gets another name: the one that removes
// a device's tasks would name the old table, which is then dropped, and no device could be removed
// any more. So both triggers go first and are made anew at the end.
//
// The numbers of removed tasks are not given again: their log rows are still there. That is what
// sqlite_sequence remembers, under the name of the table.
constexpr char CHANGE_TASK_DB[] =
    "DROP TRIGGER IF EXISTS usb_info_delete_trigger;"
    "DROP TRIGGER IF EXISTS task_info_delete_trigger;"
    "ALTER TABLE task_info_table RENAME TO task_info_table_old;"
    "CREATE TABLE task_info_table ("
    " id INTEGER PRIMARY KEY AUTOINCREMENT,"
    " usb_id INTEGER NOT NULL,"
    " is_enable INTEGER NOT NULL,"
    " task_name TEXT NOT NULL,"
    " task_type INTEGER NOT NULL,"
    " usb_folder_path TEXT NOT NULL,"
    " hub_folder_path TEXT NOT NULL,"
    " hub_share_name TEXT NOT NULL,"
    " last_copied_time INTEGER NOT NULL,"
    " copy_strategy INTEGER NOT NULL,"
    " keep_dir_structure INTEGER NOT NULL,"
    " smart_create_date_dir INTEGER NOT NULL,"
    " rename_photo_video INTEGER NOT NULL,"
    " remove_src_file INTEGER NOT NULL,"
    " conflict_policy INTEGER NOT NULL,"
    " enable_rotation INTEGER NOT NULL,"
    " max_version_count INTEGER NOT NULL,"
    " rotation_policy INTEGER NOT NULL,"
    " schedule_id INTEGER DEFAULT -1,"
    " error INTEGER NOT NULL );"
    "INSERT INTO task_info_table ( id, usb_id, is_enable, task_name, task_type, usb_folder_path, "
    "hub_folder_path, hub_share_name, last_copied_time, copy_strategy, keep_dir_structure, "
    "smart_create_date_dir, conflict_policy, error, rename_photo_video, remove_src_file, "
    "enable_rotation, max_version_count, rotation_policy, schedule_id ) "
    "SELECT id, usb_id, is_enable, task_name, task_type, usb_folder_path, hub_folder_path, "
    "hub_share_name, last_copied_time, copy_strategy, keep_dir_structure, smart_create_date_dir, "
    "conflict_policy, error, rename_photo_file, 0, 0, 256, 1, -1 FROM task_info_table_old;"
    "DELETE FROM sqlite_sequence WHERE name = 'task_info_table' AND EXISTS "
    "(SELECT 1 FROM sqlite_sequence WHERE name = 'task_info_table_old');"
    "UPDATE sqlite_sequence SET name = 'task_info_table' WHERE name = 'task_info_table_old';"
    "DROP TABLE IF EXISTS task_info_table_old;"
    "CREATE INDEX IF NOT EXISTS task_info_table_usb_id_idx on task_info_table(usb_id);"
    "CREATE INDEX IF NOT EXISTS task_info_table_hub_share_name_idx on "
    "task_info_table(hub_share_name);"
    "CREATE TRIGGER usb_info_delete_trigger AFTER DELETE ON usb_info_table BEGIN"
    "       DELETE FROM task_info_table WHERE usb_id = OLD.id; END;"
    "CREATE TRIGGER task_info_delete_trigger AFTER DELETE ON task_info_table BEGIN"
    "   DELETE FROM usb_info_table WHERE id = OLD.usb_id AND (0 = (SELECT COUNT(*) FROM "
    "task_info_table WHERE usb_id = OLD.usb_id)); END;"
    "INSERT or REPLACE into config_table VALUES ('version', 2);";

struct TaskRow {
    uint64_t id;
    uint64_t usb_id;
    std::string task_name;
    int task_type;
};

int AddTask(const SqlQuery& row, void* context) {
    static_cast<std::vector<TaskRow>*>(context)->push_back(
        {row.UInt64(0), row.UInt64(1), row.Text(2), row.Int(3)});
    return 0;
}

int SetText(const SqlQuery& row, void* context) {
    *static_cast<std::string*>(context) = row.Text(0);
    return 0;
}

std::string Today() {
    const time_t now = time(nullptr);
    struct tm local = {};
    std::string text;
    if (localtime_r(&now, &local) == nullptr || GetTimeString(local, "%Y/%m/%d", text) < 0) {
        SLOG_ERR("Failed to get time str\n");
    }
    return text;
}

// Every day at midnight; an entry that is not enabled never runs.
std::string DefaultSchedule() {
    Json::Value schedule(Json::objectValue);
    schedule["date_type"] = 0;
    schedule["week_day"] = "0,1,2,3,4,5,6";
    schedule["date"] = Today();
    schedule["repeat_date"] = 0;
    schedule["hour"] = 0;
    schedule["minute"] = 0;
    schedule["repeat_hour"] = 0;
    schedule["last_work_hour"] = 0;
    return WriteJson(schedule);
}

int AddSchedule(const std::string& copy, const TaskRow& task, const std::string& schedule,
                std::vector<int64_t>& schedule_ids) {
    std::string uuid;
    if (QueryEach(
            copy,
            "SELECT uuid FROM usb_info_table WHERE id = " + std::to_string(task.usb_id) + " ;",
            SetText, &uuid) < 0 ||
        uuid.empty()) {
        SLOG_ERR("Failed to get uuid for usb id '%llu'\n", Llu(task.usb_id));
        return -1;
    }
    int64_t schedule_id = -1;
    if (!CreateSchedule(task.id, task.task_type, task.task_name, false, schedule, schedule_id)) {
        SLOG_ERR("UpdaterV1: Failed to CreateSchedule for task '%llu', '%s'\n", Llu(task.id),
                 uuid.c_str());
        return -1;
    }
    schedule_ids.push_back(schedule_id);
    if (ExecInTransaction(
            copy, "UPDATE task_info_table SET schedule_id = " + std::to_string(schedule_id) +
                      " WHERE id = " + std::to_string(task.id) + " ;") < 0) {
        SLOG_ERR("UpdaterV1: Failed to update schedule id for task '%llu', '%s'\n", Llu(task.id),
                 uuid.c_str());
        return -1;
    }
    return 0;
}

}  // namespace

int UpdaterV1::UpdateTaskDB(const std::string& path) {
    DatabaseCopy copy(path, OLD_VERSION);
    if (copy.Make() < 0) {
        SLOG_ERR("UpdaterV1: Failed to backup task db '%s' -> '%s'\n", path.c_str(),
                 copy.Path().c_str());
        return -1;
    }
    std::vector<int64_t> schedule_ids;
    if (ChangeTaskDB(copy.Path(), schedule_ids) == 0) {
        if (copy.ReplaceOriginal() == 0) return 0;
        SLOG_ERR("UpdaterV1: Failed to move DB back '%s' -> '%s'.\n", copy.Path().c_str(),
                 path.c_str());
    }
    if (copy.HasReplacedOriginal()) return -1;
    for (const int64_t id : schedule_ids) {
        if (SDK::RemoveSchedEntry(id) < 0) SLOG_ERR("Schedule '%lld' is left over\n", Lld(id));
    }
    return -1;
}

int UpdaterV1::ChangeTaskDB(const std::string& copy, std::vector<int64_t>& schedule_ids) {
    return ExecInTransaction(copy, CHANGE_TASK_DB) < 0 ? -1 : AddSchedules(copy, schedule_ids);
}

int UpdaterV1::AddSchedules(const std::string& copy, std::vector<int64_t>& schedule_ids) {
    std::vector<TaskRow> tasks;
    if (QueryEach(copy, "SELECT id, usb_id, task_name, task_type FROM task_info_table;", AddTask,
                  &tasks) < 0) {
        SLOG_ERR("UpdaterV1: Failed to list all task info\n");
        return -1;
    }
    const std::string schedule = DefaultSchedule();
    if (schedule.empty()) {
        SLOG_ERR("UpdaterV1: Failed to get default schedule content\n");
        return -1;
    }
    // No task of this version has an entry: those that are there were made by an attempt that was
    // broken off. They would stay for ever. One that cannot be removed is not enabled.
    (void)!RemoveAllSchedule();
    for (const TaskRow& task : tasks) {
        if (AddSchedule(copy, task, schedule, schedule_ids) < 0) return -1;
    }
    return 0;
}
