// A connection of another program to a database file, for tests: writes what the tested object
// would not, reads what it has written, holds locks. Fails the running test on an error.
#pragma once

#include <string>
#include <vector>

struct sqlite3;

class RawDatabase {
public:
    explicit RawDatabase(const std::string& path);
    ~RawDatabase();
    RawDatabase(const RawDatabase&) = delete;
    RawDatabase& operator=(const RawDatabase&) = delete;

    void Run(const std::string& sql);
    // The first column of all rows as text, joined by "|"; NULL is "NULL".
    std::string Read(const std::string& sql);

private:
    sqlite3* m_db = nullptr;
};

// Collects the statements, as they were written, of the connections that are opened while it lives;
// one at a time, and only while one thread opens and uses them.
class StatementTrace {
public:
    StatementTrace();
    ~StatementTrace();
    StatementTrace(const StatementTrace&) = delete;
    StatementTrace& operator=(const StatementTrace&) = delete;

    // Those that settle a connection or bound a transaction: PRAGMA, BEGIN, COMMIT, ROLLBACK.
    [[nodiscard]] std::vector<std::string> Framing() const;
};

// Makes sqlite run out of memory for as long as it lives.
class NoSqliteMemory {
public:
    NoSqliteMemory();
    ~NoSqliteMemory();
    NoSqliteMemory(const NoSqliteMemory&) = delete;
    NoSqliteMemory& operator=(const NoSqliteMemory&) = delete;
};

// Gives another thread time to run into a lock that is held. Nothing shows from outside that it
// waits; when it comes later, the test proves less but does not fail.
void LetOtherThreadMeetTheLock();
