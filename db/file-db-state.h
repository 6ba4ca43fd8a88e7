// An open file database: its connection and its statements, each prepared once. For FileDB only,
// under its lock.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <unordered_map>

#include "db/file-info.h"
#include "db/sqlite-util.h"

struct FileDBState {
    // The connection stays the caller's, who closes it after the destruction.
    explicit FileDBState(sqlite3* connection) : db(connection) {}

    // 0, or -1 when a statement does not fit the tables of the file.
    [[nodiscard]] int Prepare();
    // Sets up a transaction around statements: all or nothing. An open batch is ended before.
    [[nodiscard]] int Begin();
    [[nodiscard]] int End(int result);
    // The same, and on the disk when it is ended well. Ended also when the beginning failed.
    [[nodiscard]] int BeginDurable();
    [[nodiscard]] int EndDurable(int result);
    // The same around statements of many operations; ended after some rows, and by EndBatch().
    [[nodiscard]] int BeginInBatch();
    [[nodiscard]] int EndInBatch(int result);
    [[nodiscard]] int EndBatch();

    // Removes the row of the path and all below.
    [[nodiscard]] int RemoveRows(const std::string& path);
    // Forgets all rows that are unproven, if that is still to be done after a failed flush. Until
    // then nobody may believe a row.
    [[nodiscard]] int ForgetIfOwed();

    sqlite3* db;

    SqlQuery begin, end;
    SqlQuery insert_row, update_row, remove_rows;
    SqlQuery row_by_source, row_by_destination, rows_in_range;
    SqlQuery add_moved, get_moved, is_taken, numbered;
    SqlQuery doubt_forget, doubt_add, unproven_mark, prove, unproven_count;

    // The lowest number that may be free for a stem and extension: all below are taken. True as
    // long as no row goes or changes its destination, which empties it.
    std::unordered_map<std::string, uint64_t> free_numbers;

    uint64_t batch_rows = 0;     // of the open batch; 0 when there is none
    bool has_lost_rows = false;  // with a batch that failed
    bool has_flush_failed = false;
    bool must_forget = false;     // what is unproven: a flush failed
    bool has_moved_files = true;  // noted names; most tasks have none
    uint64_t unproven = 0;        // rows of files since the last proof
    std::chrono::steady_clock::time_point unproven_since{};
};

// The tables, ready for use, with what is unproven forgotten: run at each opening.
extern const char FILE_DB_SCHEMA[];

// Resets a statement at the end of a block.
class StatementUse {
public:
    explicit StatementUse(SqlQuery& statement) : m_statement(statement) {}
    ~StatementUse() { m_statement.Reset(); }
    StatementUse(const StatementUse&) = delete;
    StatementUse& operator=(const StatementUse&) = delete;

private:
    SqlQuery& m_statement;
};

// The first text that is greater than all texts that start with `prefix`, whose last character is a
// plain one.
[[nodiscard]] std::string EndOfPrefix(std::string prefix);

// The columns of the rows, in the order in which they are asked for.
void ReadFileInfo(const SqlQuery& row, FileInfo& info);
