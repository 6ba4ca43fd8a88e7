// The store of the log that users see: one sqlite3 file, one connection, one object in the process.
// It keeps the newest rows only; triggers in the file enforce the limit.
//
// Threads: every operation may be called from any thread; one mutex is held for a whole operation.
// Results: 0 or -1; failures are logged. While closed, all operations give -1. A file locked by
// another process is waited for, up to five minutes.
// Rows are added through AddLog() (db/log-wrapper.h); the queries are for displaying programs.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "db/db-mutex.h"

class LogInfo;
struct sqlite3;

// What to select; a default record selects nothing, because it names no description.
struct LogFilter {
    uint64_t task_id = 0;    // 0: any
    uint32_t limit = 0;      // 0: none
    uint32_t offset = 0;     // 0: none; refused by the database without a limit
    uint32_t from_time = 0;  // seconds since the epoch, included; 0: open
    uint32_t to_time = 0;
    // A part of the stored parameter text, which is JSON: characters above ASCII are escapes there.
    // "%" and "_" are taken literally, ASCII letters match in either case, and a backslash takes
    // the next character literally: it is written twice. Empty: none. It must not hold a single
    // quote: it goes into the statement as it stands.
    std::string keyword;
    int log_type = 0;                  // a LogDB::LOG_TYPE; anything else: all
    std::vector<int> description_ids;  // LogDescription::ID; empty: no row at all
};

class LogDB {
public:
    // Stored in the rows: never renumbered.
    enum LOG_TYPE : int {
        LOG_TYPE_INFO = 1,
        LOG_TYPE_TASK_ERROR = 2,
        LOG_TYPE_FILE_ERROR = 4,
    };

    // The object of the daemon, made on first use. It is never destroyed, so that a thread that
    // still runs while the process exits finds it whole.
    static LogDB& GetInstance();

    // For tests and for programs with a file of their own; everyone else asks GetInstance().
    LogDB();
    ~LogDB();
    LogDB(const LogDB&) = delete;
    LogDB& operator=(const LogDB&) = delete;

    // Opens the file, made with mode 0600 if it is missing, and brings its schema up to date.
    // Open already: 0, and the first file stays. After a failure the object is closed as before.
    [[nodiscard]] int Init(const std::string& path);
    // May be called at any time; Init() may follow.
    void Close();

    [[nodiscard]] int AddLogInfo(const LogInfo& info);

    // The number of rows kept, 5 to 100000. Lowering it removes the oldest rows at once.
    [[nodiscard]] int SetRotateCount(uint64_t count);
    // A file without the setting gives 0, and keeps all rows.
    [[nodiscard]] int GetRotateCount(uint64_t& count);

    // A limit or offset in the filter counts the one row of the answer, not the rows selected.
    [[nodiscard]] int CountLogInfo(const LogFilter& filter, uint64_t& count);
    // Appends the rows to `rows`, newest first. After a failure `rows` keeps what was read.
    [[nodiscard]] int ListLogInfo(const LogFilter& filter, std::vector<LogInfo>& rows);

private:
    DbMutex m_mutex;
    sqlite3* m_db = nullptr;  // guarded by m_mutex; null while closed
};
