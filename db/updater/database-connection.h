// A connection to a database file for the length of a block, with its failures logged.
#pragma once

#include <string>

struct sqlite3;

class DatabaseConnection {
public:
    DatabaseConnection() = default;
    ~DatabaseConnection();
    DatabaseConnection(const DatabaseConnection&) = delete;
    DatabaseConnection& operator=(const DatabaseConnection&) = delete;

    // `flags` of sqlite; the file is never made. Once for each object. 0 or -1.
    [[nodiscard]] int Open(const std::string& path, int flags);
    // Statements without parameters, whose rows are not looked at. 0 or -1.
    [[nodiscard]] int Run(const char* sql);
    // The same for a script that may be run again from its start, as when the journal's mode is
    // changed: other connections are waited for there too. 0 or -1.
    [[nodiscard]] int RunScript(const char* script);
    [[nodiscard]] sqlite3* Get() const { return m_db; }

private:
    sqlite3* m_db = nullptr;
};
