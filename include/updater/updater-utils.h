// Short visits to a database file: each operation opens it, does its work and closes it again.
//
// Failures are logged. Threads: any; a file that another program has locked is waited for, up to a
// minute.
#pragma once

#include <cstdint>
#include <string>

class SqlQuery;

// Reads the version of the layout. 1 with the version, 0 when the file names none, -1.
[[nodiscard]] int GetDBVersion(const std::string& path, unsigned& version);

// Runs the statements in one transaction: all of them take effect, or none. 0 or -1. The file has
// to be there; neither argument may be empty.
[[nodiscard]] int ExecInTransaction(const std::string& path, const std::string& sql);

// Takes one row; `context` is the caller's. A negative result ends the query as a failure.
using RowCallback = int (*)(const SqlQuery& row, void* context);
// Calls back for every row of one query, opened for reading alone. 0 or -1; neither text may be
// empty.
[[nodiscard]] int QueryEach(const std::string& path, const std::string& sql, RowCallback callback,
                            void* context);
