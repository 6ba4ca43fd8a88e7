#include "updater/database-connection.h"

#include <sqlite3.h>

#include "db/sqlite-util.h"
#include "utils/log.h"

namespace {

// The daemon is stopped: whoever holds the file now, as a program that shows the log, holds it for
// a moment.
constexpr int BUSY_TIMEOUT_MS = 60000;

}  // namespace

DatabaseConnection::~DatabaseConnection() {
    const int code = sqlite3_close_v2(m_db);
    if (code != SQLITE_OK) SLOG_ERR("sqlite3_close_v2: [%d]\n", code);
}

int DatabaseConnection::Open(const std::string& path, int flags) {
    const int code = sqlite3_open_v2(path.c_str(), &m_db, flags, nullptr);
    if (code != SQLITE_OK) {
        SLOG_ERR("Failed to open db at '%s'. [%d] %s\n", path.c_str(), code,
                 m_db != nullptr ? sqlite3_errmsg(m_db) : sqlite3_errstr(code));
        return -1;
    }
    sqlite3_busy_timeout(m_db, BUSY_TIMEOUT_MS);
    return 0;
}

int DatabaseConnection::Run(const char* sql) { return ExecSql(m_db, sql); }

int DatabaseConnection::RunScript(const char* script) {
    const int code = RunSqlScript(m_db, script, BUSY_TIMEOUT_MS);
    if (code == SQLITE_OK) return 0;
    SLOG_ERR("sqlite3_exec: [%d] %s\n", code, sqlite3_errmsg(m_db));
    return -1;
}
