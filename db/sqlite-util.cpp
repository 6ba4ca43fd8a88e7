#include "db/sqlite-util.h"

#include <sqlite3.h>
#include <sys/stat.h>

#include <chrono>
#include <cstdarg>

#include "utils/log.h"

namespace {

// Another program of the package may hold the file for as long as it takes to upgrade it.
constexpr int kBusyTimeoutMs = 300000;
constexpr int kRetryMs = 10;

std::string MessageOf(sqlite3* db, int code) {
    return db != nullptr ? sqlite3_errmsg(db) : sqlite3_errstr(code);
}

// The file is not opened here: closing any descriptor of a file drops the locks that connections of
// this process hold on it. A failure shows when sqlite opens the file.
void PrepareFile(const std::string& path) {
    if (::mknod(path.c_str(), S_IFREG | 0600, 0) == 0) return;
    struct stat info;
    if (::stat(path.c_str(), &info) != 0 || !S_ISREG(info.st_mode)) return;
    if ((info.st_mode & (S_IWGRP | S_IWOTH)) == 0) return;
    const mode_t mode = info.st_mode & 07777 & ~static_cast<mode_t>(S_IWGRP | S_IWOTH);
    if (::chmod(path.c_str(), mode) != 0) {
        SLOG_WARN("Others can write to '%s' and that cannot be changed\n", path.c_str());
    }
}

UniqueSqlText FormatSqlList(const char* format, va_list arguments) {
    UniqueSqlText sql(sqlite3_vmprintf(format, arguments));
    if (!sql) SLOG_ERR("sqlite3_mprintf: return NULL\n%s\n", format);
    return sql;
}

}  // namespace

void SqlTextFree::operator()(char* text) const { sqlite3_free(text); }

int RunSqlScript(sqlite3* db, const char* script, int wait_ms) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(wait_ms);
    for (;;) {
        const int code = sqlite3_exec(db, script, nullptr, nullptr, nullptr);
        if (code != SQLITE_BUSY || std::chrono::steady_clock::now() >= deadline) return code;
        if (sqlite3_get_autocommit(db) == 0)
            sqlite3_exec(db, "ROLLBACK", nullptr, nullptr, nullptr);
        sqlite3_sleep(kRetryMs);
    }
}

DatabaseOpenResult OpenDatabase(const std::string& path, const char* script) {
    DatabaseOpenResult result;
    PrepareFile(path);
    result.code = sqlite3_open_v2(path.c_str(), &result.db,
                                  SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr);
    if (result.code != SQLITE_OK) {
        result.failed_step = DatabaseOpenResult::OPEN;
    } else {
        sqlite3_busy_timeout(result.db, kBusyTimeoutMs);
        result.code = RunSqlScript(result.db, script, kBusyTimeoutMs);
        if (result.code != SQLITE_OK) result.failed_step = DatabaseOpenResult::SCHEMA;
    }
    if (result.failed_step != DatabaseOpenResult::DONE) {
        result.message = MessageOf(result.db, result.code);
        sqlite3_close_v2(result.db);  // a failed open gives a handle too; this undoes the script
        result.db = nullptr;
    }
    return result;
}

UniqueSqlText FormatSql(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    UniqueSqlText sql = FormatSqlList(format, arguments);
    va_end(arguments);
    return sql;
}

int ExecSql(sqlite3* db, const char* sql) {
    char* text = nullptr;
    const int code = sqlite3_exec(db, sql, nullptr, nullptr, &text);
    const UniqueSqlText message(text);
    if (code == SQLITE_OK) return 0;
    SLOG_ERR("sqlite3_exec: [%d] %s\n", code, message ? message.get() : sqlite3_errstr(code));
    return -1;
}

int ExecFormattedSql(sqlite3* db, const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    const UniqueSqlText sql = FormatSqlList(format, arguments);
    va_end(arguments);
    return sql ? ExecSql(db, sql.get()) : -1;
}

SqlQuery::~SqlQuery() { sqlite3_finalize(m_statement); }

int SqlQuery::Prepare(sqlite3* db, const char* sql) {
    m_db = db;
    const int code = sqlite3_prepare_v2(db, sql, -1, &m_statement, nullptr);
    if (code == SQLITE_OK) return 0;
    SLOG_ERR("sqlite3_prepare_v2: [%d] %s\n", code, MessageOf(db, code).c_str());
    return -1;
}

int SqlQuery::Step() {
    const int code = sqlite3_step(m_statement);
    if (code == SQLITE_ROW) return 1;
    if (code == SQLITE_DONE) return 0;
    SLOG_ERR("sqlite3_step: [%d] %s\n", code, MessageOf(m_db, code).c_str());
    return -1;
}

void SqlQuery::Bind(int parameter, const std::string& text) {
    sqlite3_bind_text(m_statement, parameter, text.data(), static_cast<int>(text.size()),
                      SQLITE_STATIC);
}

void SqlQuery::Bind(int parameter, int64_t value) {
    sqlite3_bind_int64(m_statement, parameter, value);
}

int SqlQuery::Execute() {
    const int code = sqlite3_step(m_statement);
    const std::string message =
        code == SQLITE_DONE || code == SQLITE_ROW ? std::string() : MessageOf(m_db, code);
    Reset();
    if (message.empty()) return 0;
    SLOG_ERR("sqlite3_exec: [%d] %s\n", code, message.c_str());
    return -1;
}

void SqlQuery::Reset() {
    sqlite3_reset(m_statement);
    sqlite3_clear_bindings(m_statement);
}

int64_t SqlQuery::Int64(int column) const { return sqlite3_column_int64(m_statement, column); }

uint64_t SqlQuery::UInt64(int column) const { return static_cast<uint64_t>(Int64(column)); }

int SqlQuery::Int(int column) const { return sqlite3_column_int(m_statement, column); }

bool SqlQuery::Bool(int column) const { return Int64(column) != 0; }

std::string SqlQuery::Text(int column) const {
    const auto* text = sqlite3_column_text(m_statement, column);
    if (text == nullptr) return {};
    const int size = sqlite3_column_bytes(m_statement, column);
    return {reinterpret_cast<const char*>(text), static_cast<size_t>(size)};
}
