#include "db/task-db.h"

#include <sqlite3.h>

#include "db/sqlite-util.h"
#include "utils/log.h"

namespace {

// Every object is made and every row inserted only if it is not there yet: the script runs at each
// start. Recursive triggers are what keeps devices and tasks alive as pairs.
constexpr char kSchema[] =
    "PRAGMA journal_mode = WAL;PRAGMA synchronous = NORMAL;PRAGMA recursive_triggers = true;"
    "BEGIN IMMEDIATE;"
    "CREATE TABLE IF NOT EXISTS config_table ("
    " key TEXT PRIMARY KEY,"
    " value TEXT NOT NULL );"
    "INSERT or IGNORE into config_table VALUES ('version', 2);"
    "CREATE TABLE IF NOT EXISTS usb_info_table ("
    " id INTEGER PRIMARY KEY AUTOINCREMENT,"
    " uuid TEXT UNIQUE NOT NULL,"
    " run_when_plug_in INTEGER NOT NULL,"
    " eject_when_task_done INTEGER NOT NULL,"
    " producer TEXT NOT NULL,"
    " product TEXT NOT NULL );"
    // The order of the columns is fixed: rows are read by position.
    "CREATE TABLE IF NOT EXISTS task_info_table ("
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
    "CREATE INDEX IF NOT EXISTS usb_info_table_uuid_idx on usb_info_table(uuid);"
    "CREATE INDEX IF NOT EXISTS task_info_table_usb_id_idx on task_info_table(usb_id);"
    "CREATE INDEX IF NOT EXISTS task_info_table_hub_share_name_idx on "
    "task_info_table(hub_share_name);"
    "CREATE TRIGGER IF NOT EXISTS usb_info_delete_trigger AFTER DELETE ON usb_info_table BEGIN"
    "       DELETE FROM task_info_table WHERE usb_id = OLD.id; END;"
    "CREATE TRIGGER IF NOT EXISTS task_info_delete_trigger AFTER DELETE ON task_info_table BEGIN"
    "   DELETE FROM usb_info_table WHERE id = OLD.usb_id AND (0 = (SELECT COUNT(*) FROM "
    "task_info_table WHERE usb_id = OLD.usb_id)); END;"
    "COMMIT;";

#define SELECT_USB                                                                     \
    "SELECT id, uuid, run_when_plug_in, eject_when_task_done, producer, product FROM " \
    "usb_info_table "
#define SELECT_TASK                                                                          \
    "SELECT id, usb_id, is_enable, task_name, task_type, usb_folder_path, hub_folder_path, " \
    "hub_share_name, last_copied_time, copy_strategy, keep_dir_structure, "                  \
    "smart_create_date_dir, rename_photo_video, remove_src_file, conflict_policy, "          \
    "enable_rotation, max_version_count, rotation_policy, schedule_id, error FROM "          \
    "task_info_table "

void ReadRow(const SqlQuery& row, USBInfo& info) {
    info.id = row.UInt64(0);
    info.uuid = row.Text(1);
    info.run_when_plug_in = row.Bool(2);
    info.eject_when_task_done = row.Bool(3);
    info.producer = row.Text(4);
    info.product = row.Text(5);
}

void ReadRow(const SqlQuery& row, TaskInfo& info) {
    info.id = row.UInt64(0);
    info.usb_id = row.UInt64(1);
    info.is_enable = row.Bool(2);
    info.task_name = row.Text(3);
    info.task_type = row.Int(4);
    info.usb_folder_path = row.Text(5);
    info.hub_folder_path = row.Text(6);
    info.hub_share_name = row.Text(7);
    info.last_copied_time = static_cast<uint32_t>(row.Int64(8));
    info.copy_strategy = row.Int(9);
    info.keep_dir_structure = row.Bool(10);
    info.smart_create_date_dir = row.Bool(11);
    info.rename_photo_video = row.Bool(12);
    info.remove_src_file = row.Bool(13);
    info.conflict_policy = row.Int(14);
    info.enable_rotation = row.Bool(15);
    info.max_version_count = row.UInt64(16);
    info.rotation_policy = row.Int(17);
    info.schedule_id = row.Int64(18);
    info.error = row.Int(19);
}

// 1 when there is a row, 0, -1.
template <typename Info>
int ReadOne(sqlite3* db, const UniqueSqlText& sql, Info& info) {
    SqlQuery query;
    if (!sql || query.Prepare(db, sql.get()) < 0) return -1;
    const int found = query.Step();
    if (found == 1) ReadRow(query, info);
    return found;
}

template <typename Info>
int ReadAll(sqlite3* db, const char* sql, std::list<Info>& list) {
    SqlQuery query;
    if (query.Prepare(db, sql) < 0) return -1;
    list.clear();
    for (;;) {
        const int found = query.Step();
        if (found != 1) return found;
        ReadRow(query, list.emplace_back());
    }
}

int Insert(sqlite3* db, const UniqueSqlText& sql, uint64_t& id) {
    if (!sql || ExecSql(db, sql.get()) < 0) return -1;
    id = static_cast<uint64_t>(sqlite3_last_insert_rowid(db));
    return 0;
}

}  // namespace

TaskDB& TaskDB::GetInstance() {
    static TaskDB& instance = *new TaskDB;
    return instance;
}

TaskDB::TaskDB() = default;

TaskDB::~TaskDB() { Close(); }

int TaskDB::Init(const std::string& path) {
    const DbLock lock(m_mutex);
    if (m_db != nullptr) {
        SLOG_INFO("Task DB has been inited");
        return 0;
    }
    const DatabaseOpenResult result = OpenDatabase(path, kSchema);
    switch (result.failed_step) {
        case DatabaseOpenResult::OPEN:
            SLOG_ERR("Failed to create task db at '%s'. [%d] %s", path.c_str(), result.code,
                     result.message.c_str());
            return -1;
        case DatabaseOpenResult::SCHEMA:
            SLOG_ERR("Failed to create task db table at '%s'. [%d] %s", path.c_str(), result.code,
                     result.message.c_str());
            return -1;
        case DatabaseOpenResult::DONE:
            break;
    }
    m_db = result.db;
    return 0;
}

void TaskDB::Close() {
    const DbLock lock(m_mutex);
    if (m_db == nullptr) return;
    if (const int code = sqlite3_close_v2(m_db); code != SQLITE_OK) {
        SLOG_ERR("Task db cannot be closed. [%d] at <%p>\n", code, static_cast<void*>(m_db));
    }
    m_db = nullptr;
}

int TaskDB::AddUSBInfo(const USBInfo& info, uint64_t& id) {
    const DbLock lock(m_mutex);
    return Insert(m_db,
                  FormatSql(" INSERT INTO usb_info_table ( uuid, run_when_plug_in, "
                            "eject_when_task_done, producer, product ) VALUES  ( %Q, %d, %d, %Q, "
                            "%Q );",
                            info.uuid.c_str(), info.run_when_plug_in, info.eject_when_task_done,
                            info.producer.c_str(), info.product.c_str()),
                  id);
}

int TaskDB::UpdateUSBInfo(const USBInfo& info) {
    const DbLock lock(m_mutex);
    return ExecFormattedSql(
        m_db,
        " UPDATE usb_info_table SET uuid = %Q, run_when_plug_in = %d, eject_when_task_done = %d, "
        "producer = %Q, product = %Q WHERE id = %llu ;",
        info.uuid.c_str(), info.run_when_plug_in, info.eject_when_task_done, info.producer.c_str(),
        info.product.c_str(), Llu(info.id));
}

int TaskDB::GetUSBInfoByID(uint64_t id, USBInfo& info) {
    const DbLock lock(m_mutex);
    return ReadOne(m_db, FormatSql(SELECT_USB "WHERE id = %llu ;", Llu(id)), info);
}

int TaskDB::GetUSBInfoByUUID(const std::string& uuid, USBInfo& info) {
    const DbLock lock(m_mutex);
    return ReadOne(m_db, FormatSql(SELECT_USB "WHERE uuid = %Q ;", uuid.c_str()), info);
}

int TaskDB::RemoveUSBInfo(uint64_t id) {
    const DbLock lock(m_mutex);
    return ExecFormattedSql(m_db, " DELETE FROM usb_info_table WHERE id = %llu ;", Llu(id));
}

int TaskDB::ListUSBInfo(std::list<USBInfo>& list) {
    const DbLock lock(m_mutex);
    return ReadAll(m_db, SELECT_USB ";", list);
}

int TaskDB::AddTaskInfo(const TaskInfo& info, uint64_t& id) {
    const DbLock lock(m_mutex);
    return Insert(
        m_db,
        FormatSql(" INSERT INTO task_info_table ( usb_id, is_enable, task_name, task_type, "
                  "usb_folder_path, hub_folder_path, hub_share_name, last_copied_time, "
                  "copy_strategy, keep_dir_structure, smart_create_date_dir, rename_photo_video, "
                  "remove_src_file, conflict_policy, enable_rotation, max_version_count, "
                  "rotation_policy, schedule_id, error ) VALUES  ( %llu, %d, %Q, %d, %Q, %Q, %Q, "
                  "%u, %d, %d, %d, %d, %d, %d, %d, %llu, %d, %lld, %d );",
                  Llu(info.usb_id), info.is_enable, info.task_name.c_str(), info.task_type,
                  info.usb_folder_path.c_str(), info.hub_folder_path.c_str(),
                  info.hub_share_name.c_str(), info.last_copied_time, info.copy_strategy,
                  info.keep_dir_structure, info.smart_create_date_dir, info.rename_photo_video,
                  info.remove_src_file, info.conflict_policy, info.enable_rotation,
                  Llu(info.max_version_count), info.rotation_policy, Lld(info.schedule_id),
                  info.error),
        id);
}

int TaskDB::UpdateTaskInfo(const TaskInfo& info) {
    const DbLock lock(m_mutex);
    return ExecFormattedSql(
        m_db,
        " UPDATE task_info_table SET  usb_id = %llu,  is_enable = %d, task_name = %Q, task_type = "
        "%d,  usb_folder_path = %Q,  hub_folder_path = %Q,  hub_share_name = %Q,  "
        "last_copied_time = %u,  copy_strategy = %d,  keep_dir_structure = %d,  "
        "smart_create_date_dir = %d,  rename_photo_video = %d,  remove_src_file = %d,  "
        "conflict_policy = %d,  enable_rotation = %d,  max_version_count = %llu,  "
        "rotation_policy = %d,  schedule_id = %lld,  error = %d  WHERE id = %llu ;",
        Llu(info.usb_id), info.is_enable, info.task_name.c_str(), info.task_type,
        info.usb_folder_path.c_str(), info.hub_folder_path.c_str(), info.hub_share_name.c_str(),
        info.last_copied_time, info.copy_strategy, info.keep_dir_structure,
        info.smart_create_date_dir, info.rename_photo_video, info.remove_src_file,
        info.conflict_policy, info.enable_rotation, Llu(info.max_version_count),
        info.rotation_policy, Lld(info.schedule_id), info.error, Llu(info.id));
}

int TaskDB::SetTaskEnable(uint64_t id, bool is_enable) {
    const DbLock lock(m_mutex);
    return ExecFormattedSql(m_db, " UPDATE task_info_table SET  is_enable = %d  WHERE id = %llu ;",
                            is_enable, Llu(id));
}

int TaskDB::UpdateHUBShareName(const std::string& old_name, const std::string& new_name) {
    const DbLock lock(m_mutex);
    return ExecFormattedSql(
        m_db, " UPDATE task_info_table SET  hub_share_name = %Q  WHERE hub_share_name = %Q ;",
        new_name.c_str(), old_name.c_str());
}

int TaskDB::GetTaskInfo(uint64_t id, TaskInfo& info) {
    const DbLock lock(m_mutex);
    return ReadOne(m_db, FormatSql(SELECT_TASK " WHERE id = %llu", Llu(id)), info);
}

int TaskDB::RemoveTaskInfo(uint64_t id) {
    const DbLock lock(m_mutex);
    return ExecFormattedSql(m_db, " DELETE FROM task_info_table WHERE id = %llu ;", Llu(id));
}

int TaskDB::ListTaskInfoByShare(const std::string& share_name, std::list<TaskInfo>& list) {
    const DbLock lock(m_mutex);
    const UniqueSqlText name = FormatSql("%Q", share_name.c_str());
    if (!name) return -1;
    const std::string sql =
        std::string(SELECT_TASK) + " WHERE hub_share_name = " + name.get() + " ;";
    return ReadAll(m_db, sql.c_str(), list);
}

int TaskDB::ListTaskInfoByUSB(uint64_t usb_id, std::list<TaskInfo>& list) {
    const DbLock lock(m_mutex);
    const std::string sql =
        std::string(SELECT_TASK) + " WHERE usb_id = " + std::to_string(usb_id) + " ;";
    return ReadAll(m_db, sql.c_str(), list);
}

int TaskDB::ListAllTaskInfo(std::list<TaskInfo>& list) {
    const DbLock lock(m_mutex);
    return ReadAll(m_db, SELECT_TASK " ;", list);
}

int TaskDB::SetTaskResult(uint64_t id, int error, uint32_t time) {
    const DbLock lock(m_mutex);
    std::string sql = " UPDATE task_info_table SET ";
    // A failed run comes with time 0: the time of the last good one stays beside its error.
    if (time != 0) sql += " last_copied_time = " + std::to_string(time) + ", ";
    sql += " error = " + std::to_string(error) + " ";
    sql += " WHERE id = " + std::to_string(id) + " ;";
    return ExecSql(m_db, sql.c_str());
}
