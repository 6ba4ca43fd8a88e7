#include "updater/updater-utils.h"

#include <sqlite3.h>

#include <limits>

#include "db/side-files.h"
#include "db/sqlite-util.h"
#include "updater/database-connection.h"
#include "updater/database-file.h"
#include "utils/log.h"

namespace {

// 1 with a number that can be one of a version, 0.
int ReadVersion(const SqlQuery& row, unsigned& version) {
    const int64_t number = row.Int64(0);
    if (number <= 0 || number > std::numeric_limits<unsigned>::max()) return 0;
    version = static_cast<unsigned>(number);
    return 1;
}

int OpenToRead(DatabaseConnection& connection, const std::string& path) {
    // When the file is beyond help, that is told by who reads it.
    if (HasJournal(path)) (void)!MakeSingleFile(path);
    return connection.Open(path, SQLITE_OPEN_READONLY);
}

}  // namespace

int GetDBVersion(const std::string& path, unsigned& version) {
    if (path.empty()) {
        SLOG_ERR("db path is empty\n");
        return -1;
    }
    DatabaseConnection connection;
    if (OpenToRead(connection, path) < 0) return -1;
    SqlQuery query;
    if (query.Prepare(connection.Get(), "SELECT value FROM config_table WHERE key = 'version' ;") <
        0) {
        return -1;
    }
    const int found = query.Step();
    return found == 1 ? ReadVersion(query, version) : found;
}

int ExecInTransaction(const std::string& path, const std::string& sql) {
    if (path.empty() || sql.empty()) {
        SLOG_ERR("Invalid Parameter\n");
        return -1;
    }
    DatabaseConnection connection;
    if (connection.Open(path, SQLITE_OPEN_READWRITE) < 0) return -1;
    if (connection.Run("BEGIN TRANSACTION;") == 0 && connection.Run(sql.c_str()) == 0 &&
        connection.Run("END TRANSACTION;") == 0) {
        return 0;
    }
    // Some failures have rolled it back already.
    if (sqlite3_get_autocommit(connection.Get()) == 0) (void)!connection.Run("ROLLBACK;");
    return -1;
}

int QueryEach(const std::string& path, const std::string& sql, RowCallback callback,
              void* context) {
    if (path.empty() || sql.empty()) {
        SLOG_ERR("Invalid Parameter\n");
        return -1;
    }
    DatabaseConnection connection;
    if (OpenToRead(connection, path) < 0) return -1;
    SqlQuery query;
    if (query.Prepare(connection.Get(), sql.c_str()) < 0) return -1;
    for (;;) {
        const int found = query.Step();
        if (found != 1) return found;
        if (callback(query, context) < 0) return -1;
    }
}
