// What sqlite puts beside a database: a write-ahead log with its index, and a journal.
//
// sqlite takes one that lies beside a database for that database's own and plays it back, whatever
// file it belonged to. Failures are logged. Threads: any; nobody has the database open.
#pragma once

#include <string>

// Whether there is nothing under the path. False also when that cannot be told.
[[nodiscard]] bool IsMissing(const std::string& path);

// Whether nothing lies beside the database. False also when that cannot be told.
[[nodiscard]] bool IsSingleFile(const std::string& path);

// Whether a transaction was broken off and waits to be rolled back, which a reader cannot do.
[[nodiscard]] bool HasJournal(const std::string& path);

// Removes what lies beside the database, and the database with it. 0, also when there is nothing;
// -1 when something is still there.
[[nodiscard]] int RemoveSideFiles(const std::string& path);
[[nodiscard]] int RemoveDatabase(const std::string& path);
