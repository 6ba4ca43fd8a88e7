#include "file-db-state.h"

#include <sqlite3.h>

#include "utils/path-util.h"

// Every object is made and every row inserted only if it is not there yet. The tables from
// unproven_table on are ours alone: a program that does not know them does no harm, because the
// triggers belong to the file.
//
// The triggers delete before they insert: within "INSERT OR IGNORE" a conflict in a trigger is
// ignored, too, and the row would keep the number of an old flush. They are kept cheap: each page
// that a small transaction touches is written whole. So is the log's checkpoint rare, which flushes
// twice. A folder that was not made has nothing to prove. A trigger that is changed gets a new
// name: files have the old one.
const char FILE_DB_SCHEMA[] =
    "PRAGMA journal_mode = WAL;PRAGMA synchronous = NORMAL;PRAGMA wal_autocheckpoint = 4000;"
    "BEGIN IMMEDIATE;"
    "CREATE TABLE IF NOT EXISTS config_table ("
    " key TEXT PRIMARY KEY,"
    " value TEXT NOT NULL );"
    "CREATE TABLE IF NOT EXISTS file_info_table ("
    " id INTEGER PRIMARY KEY,"
    " source_path TEXT UNIQUE NOT NULL,"
    " destination_path TEXT NOT NULL,"
    " file_type INTEGER NOT NULL,"
    " size INTEGER NOT NULL,"
    " mtime INTEGER NOT NULL );"
    "CREATE INDEX IF NOT EXISTS file_info_src_path_idx on file_info_table(source_path);"
    "CREATE INDEX IF NOT EXISTS file_info_dst_path_idx on file_info_table(destination_path);"
    "INSERT or IGNORE into config_table VALUES ('version', 1);"

    "CREATE TABLE IF NOT EXISTS unproven_table ("
    " id INTEGER PRIMARY KEY,"
    " flush INTEGER NOT NULL );"
    "CREATE TABLE IF NOT EXISTS flush_table ("
    " id INTEGER PRIMARY KEY,"
    " flush INTEGER NOT NULL );"
    "INSERT or IGNORE into flush_table VALUES (1, 1);"
    "DROP TRIGGER IF EXISTS file_info_insert_trigger;"
    "DROP TRIGGER IF EXISTS file_info_update_trigger;"
    "CREATE TRIGGER IF NOT EXISTS file_info_added_trigger AFTER INSERT ON file_info_table BEGIN"
    "  DELETE FROM unproven_table WHERE id = NEW.id;"
    "  INSERT INTO unproven_table SELECT NEW.id, flush FROM flush_table"
    "   WHERE NEW.file_type = 0 OR NEW.destination_path <> ''; END;"
    "CREATE TRIGGER IF NOT EXISTS file_info_changed_trigger AFTER UPDATE ON file_info_table BEGIN"
    "  DELETE FROM unproven_table WHERE id = NEW.id;"
    "  INSERT INTO unproven_table SELECT NEW.id, flush FROM flush_table"
    "   WHERE NEW.file_type = 0 OR NEW.destination_path <> ''; END;"
    "DELETE FROM file_info_table WHERE id IN ( SELECT id FROM unproven_table );"
    "DELETE FROM unproven_table;"

    "CREATE TABLE IF NOT EXISTS moved_table ("
    " destination_path TEXT PRIMARY KEY,"
    " source_path TEXT NOT NULL,"
    " size INTEGER NOT NULL,"
    " mtime INTEGER NOT NULL );"
    "CREATE INDEX IF NOT EXISTS moved_src_path_idx on moved_table(source_path);"
    "COMMIT;";

namespace {

// Each page that a transaction touches is written once: with so many rows the cost of one is small
// beside that of its copy.
constexpr uint64_t kBatchRows = 100;

#define SELECT_FILE \
    "SELECT source_path, destination_path, file_type, size, mtime FROM file_info_table "

struct StatementRow {
    SqlQuery FileDBState::*statement;
    const char* sql;
};

// "GLOB 'prefix*'" is asked as a range: it is an index's work, holds for bytes that are no UTF-8,
// which GLOB takes for one another, and knows no limit of length.
// No flush has the greatest number, and none proves a doubted row: its file may be gone by now.
// Only a row that is written anew speaks of the next one.
constexpr StatementRow kStatements[] = {
    {&FileDBState::begin,              "BEGIN TRANSACTION;"                            },
    {&FileDBState::end,                "END TRANSACTION;"                              },
    {&FileDBState::insert_row,
     "INSERT OR IGNORE INTO file_info_table ( source_path, destination_path, file_type, size, "
     "mtime ) VALUES  ( ?1, ?2, ?3, ?4, ?5 );"                                         },
    {&FileDBState::update_row,
     "UPDATE file_info_table SET source_path = ?1, destination_path = ?2, file_type = ?3, size = "
     "?4, mtime = ?5 WHERE changes() = 0 AND source_path = ?1 ;"                       },
    {&FileDBState::remove_rows,
     "DELETE FROM file_info_table WHERE (source_path = ?1 OR (source_path >= ?2 AND source_path < "
     "?3));"                                                                           },
    {&FileDBState::row_by_source,      SELECT_FILE " WHERE source_path = ?1"           },
    {&FileDBState::row_by_destination, SELECT_FILE " WHERE destination_path = ?1"      },
    {&FileDBState::rows_in_range,
     SELECT_FILE " WHERE source_path >= ?1 AND source_path < ?2 ORDER BY source_path ;"},
    {&FileDBState::add_moved,
     "INSERT OR REPLACE INTO moved_table ( source_path, destination_path, size, mtime ) VALUES ( "
     "?1, ?2, ?3, ?4 );"                                                               },
    {&FileDBState::get_moved,
     "SELECT destination_path FROM moved_table WHERE source_path = ?1 AND size = ?2 AND mtime = "
     "?3;"                                                                             },
    {&FileDBState::is_taken,
     "SELECT 1 FROM file_info_table WHERE destination_path = ?1 UNION ALL SELECT 1 FROM "
     "moved_table "
     "WHERE destination_path = ?1;"                                                    },
    {&FileDBState::numbered,
     "SELECT destination_path FROM file_info_table WHERE destination_path >= ?1 AND "
     "destination_path < ?2 UNION ALL SELECT destination_path FROM moved_table WHERE "
     "destination_path >= ?1 AND destination_path < ?2;"                               },
    {&FileDBState::doubt_forget,
     "DELETE FROM unproven_table WHERE id = ( SELECT id FROM file_info_table WHERE source_path = "
     "?1 "
     ");"                                                                              },
    {&FileDBState::doubt_add,
     "INSERT INTO unproven_table SELECT id, 9223372036854775807 FROM file_info_table WHERE "
     "source_path = ?1;"                                                               },
    {&FileDBState::unproven_mark,
     "SELECT flush FROM flush_table WHERE EXISTS ( SELECT 1 FROM unproven_table WHERE flush < "
     "9223372036854775807 );"                                                          },
    {&FileDBState::prove,              "DELETE FROM unproven_table WHERE flush <= ?1;" },
    {&FileDBState::unproven_count,
     "SELECT COUNT(*) FROM unproven_table WHERE flush < 9223372036854775807;"          },
};

}  // namespace

int FileDBState::Prepare() {
    for (const StatementRow& row : kStatements) {
        if ((this->*row.statement).Prepare(db, row.sql) < 0) return -1;
    }
    SqlQuery any_moved;
    if (any_moved.Prepare(db, "SELECT EXISTS ( SELECT 1 FROM moved_table );") < 0) return -1;
    if (any_moved.Step() != 1) return -1;
    has_moved_files = any_moved.Bool(0);
    return 0;
}

int FileDBState::Begin() { return EndBatch() < 0 ? -1 : begin.Execute(); }

int FileDBState::End(int result) {
    if (result == 0) result = end.Execute();
    if (result == 0) return 0;
    // Also after a failed end: the next operation shall not find itself inside this one.
    if (sqlite3_get_autocommit(db) == 0) static_cast<void>(ExecSql(db, "ROLLBACK;"));
    free_numbers.clear();  // the names of rows that are gone
    return result;
}

int FileDBState::BeginDurable() {
    if (EndBatch() < 0 || ExecSql(db, "PRAGMA synchronous = FULL;") < 0) return -1;
    return begin.Execute();
}

int FileDBState::EndDurable(int result) {
    result = End(result);
    return ExecSql(db, "PRAGMA synchronous = NORMAL;") < 0 ? -1 : result;
}

int FileDBState::BeginInBatch() {
    if (batch_rows > 0) {
        if (sqlite3_get_autocommit(db) == 0) return 0;
        static_cast<void>(EndBatch());  // a full disk has ended it by itself
    }
    if (begin.Execute() < 0) return -1;
    batch_rows = 1;
    return 0;
}

int FileDBState::EndInBatch(int result) {
    if (result == 0 && batch_rows++ < kBatchRows) return 0;
    batch_rows = 0;
    result = End(result);
    if (result < 0) has_lost_rows = true;
    return result;
}

int FileDBState::EndBatch() {
    if (batch_rows == 0) return 0;
    batch_rows = 0;
    const bool is_open = sqlite3_get_autocommit(db) == 0;
    if (End(is_open ? 0 : -1) == 0) return 0;
    has_lost_rows = true;
    return -1;
}

int FileDBState::RemoveRows(const std::string& path) {
    const std::string below = PathAddTrailingSlash(path);
    const std::string beyond = EndOfPrefix(below);
    remove_rows.Bind(1, path);
    remove_rows.Bind(2, below);
    remove_rows.Bind(3, beyond);
    const int result = remove_rows.Execute();
    if (result < 0 || sqlite3_changes(db) > 0) free_numbers.clear();
    return result;
}

int FileDBState::ForgetIfOwed() {
    if (!must_forget) return 0;
    unproven = 0;
    free_numbers.clear();
    static_cast<void>(EndBatch());  // its rows go anyway
    if (begin.Execute() < 0) return -1;
    const int result =
        End(ExecSql(db,
                    "DELETE FROM file_info_table WHERE id IN ( SELECT id FROM unproven_table );"
                    "DELETE FROM unproven_table;"));
    must_forget = result < 0;
    return result;
}

std::string EndOfPrefix(std::string prefix) {
    ++prefix.back();
    return prefix;
}

void ReadFileInfo(const SqlQuery& row, FileInfo& info) {
    info.source_path = row.Text(0);
    info.destination_path = row.Text(1);
    info.file_type = row.Int(2);
    info.size = row.UInt64(3);
    info.mtime = static_cast<uint32_t>(row.Int64(4));
}
