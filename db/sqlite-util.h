// What the database objects share: opening a file with its schema, statements, rows. For db/ only.
//
// Threads: the caller holds the lock of the connection. Failures of statements are logged here.
// A null connection (closed) makes every statement fail.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

struct sqlite3;
struct sqlite3_stmt;

struct SqlTextFree {
    void operator()(char* text) const;
};
using UniqueSqlText = std::unique_ptr<char, SqlTextFree>;

struct DatabaseOpenResult {
    enum Step { DONE, OPEN, SCHEMA };
    Step failed_step = DONE;
    sqlite3* db = nullptr;  // the caller's, null after a failure
    int code = 0;           // of sqlite, with its message
    std::string message;
};
// Opens the file for reading and writing and runs the script. A missing file is made with mode 0600
// and rights of others to write to an existing one are taken away: the daemon's umask is 0. sqlite
// gives the files it puts beside the database the mode of the database. Waits up to five minutes
// for a file that is locked.
[[nodiscard]] DatabaseOpenResult OpenDatabase(const std::string& path, const char* script);

// Runs a script that may be run again from its start, and gives the code of sqlite. Where a file
// enters or leaves the WAL mode sqlite does not wait for other connections, whatever its busy
// timeout is: this does, up to `wait_ms`.
[[nodiscard]] int RunSqlScript(sqlite3* db, const char* script, int wait_ms);

// Formats a statement as sqlite3_mprintf does: "%Q" quotes a text, null when memory is short.
[[nodiscard]] UniqueSqlText FormatSql(const char* format, ...);
// Runs a statement that gives no rows, ready or to be formatted. 0 or -1.
[[nodiscard]] int ExecSql(sqlite3* db, const char* sql);
[[nodiscard]] int ExecFormattedSql(sqlite3* db, const char* format, ...);

// One statement, prepared for one use or for many.
class SqlQuery {
public:
    SqlQuery() = default;
    ~SqlQuery();
    SqlQuery(const SqlQuery&) = delete;
    SqlQuery& operator=(const SqlQuery&) = delete;

    // 0 or -1; once for each object.
    [[nodiscard]] int Prepare(sqlite3* db, const char* sql);
    // The parameters, counted from 1. A text must live until Reset().
    void Bind(int parameter, const std::string& text);
    void Bind(int parameter, int64_t value);
    // 1 when there is a row to read, 0 at the end, -1 on failure.
    [[nodiscard]] int Step();
    // Runs a statement that gives no rows, and resets it. 0 or -1.
    [[nodiscard]] int Execute();
    // Ends the use, and lets go of the parameters: a statement that still stands on a row keeps the
    // database from being tidied up.
    void Reset();

    // Columns of the present row, counted from 0. NULL is 0, false and the empty text.
    [[nodiscard]] int64_t Int64(int column) const;
    [[nodiscard]] uint64_t UInt64(int column) const;
    [[nodiscard]] int Int(int column) const;
    [[nodiscard]] bool Bool(int column) const;  // any value but 0 is true
    [[nodiscard]] std::string Text(int column) const;

private:
    sqlite3* m_db = nullptr;
    sqlite3_stmt* m_statement = nullptr;
};
