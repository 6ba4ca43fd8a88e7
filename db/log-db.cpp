#include "db/log-db.h"

#include <sqlite3.h>

#include <cstdlib>

#include "db/log-info.h"
#include "db/sqlite-util.h"
#include "utils/log.h"

namespace {

// Every object is made and every row inserted only if it is not there yet: the script runs at each
// start. The two triggers keep the newest rows, so that no code has to remove any.
constexpr char kSchema[] =
    "PRAGMA journal_mode = WAL;"
    "PRAGMA synchronous = NORMAL;"
    "PRAGMA recursive_triggers = true;"
    "BEGIN IMMEDIATE;"
    "CREATE TABLE IF NOT EXISTS config_table ("
    " key TEXT PRIMARY KEY,"
    " value TEXT NOT NULL );"
    "INSERT or IGNORE into config_table VALUES ('version', 1);"
    "INSERT or IGNORE into config_table VALUES ('log_rotate_count', 100000);"
    "CREATE TABLE IF NOT EXISTS log_info_table ("
    " id INTEGER PRIMARY KEY AUTOINCREMENT,"
    " task_id INTEGER NOT NULL,"
    " log_type INTEGER NOT NULL,"
    " timestamp INTEGER NOT NULL,"
    " description_id INTEGER NOT NULL,"
    " description_param TEXT NOT NULL,"
    " error INTEGER NOT NULL );"
    "CREATE INDEX IF NOT EXISTS log_info_table_task_id_idx on log_info_table(task_id);"
    "CREATE INDEX IF NOT EXISTS log_info_table_log_type_idx on log_info_table(log_type);"
    "CREATE INDEX IF NOT EXISTS log_info_table_timestamp_idx on log_info_table(timestamp);"
    "CREATE INDEX IF NOT EXISTS log_info_table_description_id_idx on "
    "log_info_table(description_id);"
    "CREATE INDEX IF NOT EXISTS log_info_table_description_param_idx on "
    "log_info_table(description_param);"
    "CREATE TRIGGER IF NOT EXISTS log_rotate_trigger AFTER UPDATE OF value ON config_table"
    " WHEN NEW.key = 'log_rotate_count'"
    " AND CAST (NEW.value as INTEGER) < CAST (OLD.value as INTEGER)"
    " BEGIN"
    " DELETE FROM log_info_table WHERE id IN (SELECT id FROM log_info_table ORDER BY id DESC"
    " LIMIT -1 OFFSET CAST(NEW.value as INTEGER));"
    " END;"
    "CREATE TRIGGER IF NOT EXISTS add_log_info_rotate_trigger AFTER INSERT ON log_info_table"
    " WHEN CAST((SELECT COUNT(*) FROM log_info_table) as INTEGER) >"
    " CAST ((SELECT value FROM config_table WHERE key = 'log_rotate_count') as INTEGER)"
    " BEGIN"
    " DELETE FROM log_info_table WHERE id IN (SELECT id FROM log_info_table ORDER BY id DESC"
    " LIMIT -1 OFFSET CAST((SELECT value FROM config_table WHERE key = 'log_rotate_count')"
    " as INTEGER));"
    " END;"
    "COMMIT;";

// Kept as texts: a displaying program shows them as they are.
constexpr char kMinRotateCount[] = "5";
constexpr char kMaxRotateCount[] = "100000";

uint64_t Number(const char* text) { return static_cast<uint64_t>(strtol(text, nullptr, 10)); }

// A part of a LIKE pattern; quotes and backslashes are the caller's care.
std::string EscapeForLike(const std::string& keyword) {
    std::string escaped;
    for (const char c : keyword) {
        if (c == '%' || c == '_') escaped += '\\';
        escaped += c;
    }
    return escaped;
}

std::string DescriptionClause(const std::vector<int>& ids) {
    // No description asked for is an answer without rows, not one with all of them.
    if (ids.empty()) return " AND 0 ";
    std::string clause = " AND ( description_id = " + std::to_string(ids.front());
    for (size_t i = 1; i < ids.size(); ++i) {
        clause += " OR description_id = " + std::to_string(ids[i]);
    }
    return clause + " )";
}

bool IsLogType(int type) {
    return type == LogDB::LOG_TYPE_INFO || type == LogDB::LOG_TYPE_TASK_ERROR ||
           type == LogDB::LOG_TYPE_FILE_ERROR;
}

std::string FilterText(const LogFilter& filter) {
    std::string text = " WHERE 1";
    const auto add_number = [&text](const char* clause, uint64_t number) {
        if (number != 0) text += clause + std::to_string(number);
    };
    add_number(" AND task_id = ", filter.task_id);
    add_number(" AND timestamp >= ", filter.from_time);
    add_number(" AND timestamp <= ", filter.to_time);
    if (!filter.keyword.empty()) {
        text +=
            " AND description_param LIKE '%" + EscapeForLike(filter.keyword) + "%' ESCAPE '\\' ";
    }
    if (IsLogType(filter.log_type)) {
        text += " AND log_type = " + std::to_string(filter.log_type);
    }
    text += DescriptionClause(filter.description_ids);
    text += " ORDER BY id DESC";
    add_number(" LIMIT ", filter.limit);
    add_number(" OFFSET ", filter.offset);
    return text;
}

void ReadRow(const SqlQuery& row, LogInfo& info) {
    info.task_id = row.UInt64(0);
    info.log_type = row.Int(1);
    info.timestamp = static_cast<uint32_t>(row.Int64(2));
    info.description_id = row.Int(3);
    info.description_param = row.Text(4);
    info.error = row.Int(5);
}

// The first column of the first row, 0 without a row. 0 or -1; `number` is unchanged on failure.
int ReadNumber(sqlite3* db, const std::string& sql, uint64_t& number) {
    SqlQuery query;
    if (query.Prepare(db, sql.c_str()) < 0) return -1;
    const int found = query.Step();
    if (found < 0) return -1;
    number = found == 1 ? query.UInt64(0) : 0;
    return 0;
}

}  // namespace

LogDB& LogDB::GetInstance() {
    static LogDB& instance = *new LogDB;
    return instance;
}

LogDB::LogDB() = default;

LogDB::~LogDB() { Close(); }

int LogDB::Init(const std::string& path) {
    const DbLock lock(m_mutex);
    if (m_db != nullptr) {
        SLOG_INFO("Task DB has been inited\n");
        return 0;
    }
    const DatabaseOpenResult result = OpenDatabase(path, kSchema);
    switch (result.failed_step) {
        case DatabaseOpenResult::OPEN:
            SLOG_ERR("Failed to create log db at '%s'. [%d] %s\n", path.c_str(), result.code,
                     result.message.c_str());
            return -1;
        case DatabaseOpenResult::SCHEMA:
            SLOG_ERR("Failed to create log db table at '%s'. [%d] %s\n", path.c_str(), result.code,
                     result.message.c_str());
            return -1;
        case DatabaseOpenResult::DONE:
            break;
    }
    m_db = result.db;
    SLOG_DBG("Log db is initialized successfully at location '%s'\n", path.c_str());
    return 0;
}

void LogDB::Close() {
    const DbLock lock(m_mutex);
    if (m_db == nullptr) return;
    if (const int code = sqlite3_close_v2(m_db); code != SQLITE_OK) {
        SLOG_ERR("Log db cannot be closed. [%d] at <%p>\n", code, static_cast<void*>(m_db));
    }
    m_db = nullptr;
}

int LogDB::AddLogInfo(const LogInfo& info) {
    const DbLock lock(m_mutex);
    return ExecFormattedSql(
        m_db,
        " INSERT INTO log_info_table ( task_id, log_type, timestamp, description_id, "
        "description_param, error ) VALUES  ( %llu, %d, %u, %u, %Q,  %d  );",
        Llu(info.task_id), info.log_type, info.timestamp,
        static_cast<unsigned>(info.description_id), info.description_param.c_str(), info.error);
}

int LogDB::SetRotateCount(uint64_t count) {
    if (count < Number(kMinRotateCount) || count > Number(kMaxRotateCount)) {
        SLOG_ERR("Invalid rotation count '%llu'\n", Llu(count));
        return -1;
    }
    const DbLock lock(m_mutex);
    return ExecFormattedSql(
        m_db, " UPDATE config_table SET  value = %llu  WHERE key = 'log_rotate_count' ;",
        Llu(count));
}

int LogDB::GetRotateCount(uint64_t& count) {
    const DbLock lock(m_mutex);
    constexpr char kSql[] = "SELECT value FROM config_table WHERE key = 'log_rotate_count'; ";
    SLOG_DBG("sql = '%s\n'", kSql);
    return ReadNumber(m_db, kSql, count);
}

int LogDB::CountLogInfo(const LogFilter& filter, uint64_t& count) {
    const DbLock lock(m_mutex);
    return ReadNumber(m_db, "SELECT COUNT(*) FROM log_info_table" + FilterText(filter) + " ;",
                      count);
}

int LogDB::ListLogInfo(const LogFilter& filter, std::vector<LogInfo>& rows) {
    const DbLock lock(m_mutex);
    SqlQuery query;
    const std::string sql =
        "SELECT task_id, log_type, timestamp, description_id, description_param, error FROM "
        "log_info_table " +
        FilterText(filter) + " ;";
    if (query.Prepare(m_db, sql.c_str()) < 0) return -1;
    for (;;) {
        const int found = query.Step();
        if (found != 1) return found;
        ReadRow(query, rows.emplace_back());
    }
}
