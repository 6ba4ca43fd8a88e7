#include "db/raw-database.h"

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <chrono>
#include <thread>

namespace {

std::vector<std::string>& Traced() {
    static std::vector<std::string> statements;
    return statements;
}

int Collect(unsigned /*event*/, void* /*context*/, void* /*statement*/, void* sql) {
    Traced().emplace_back(static_cast<const char*>(sql));
    return 0;
}

int TraceNewConnection(sqlite3* db, char** /*message*/, const void* /*api*/) {
    return sqlite3_trace_v2(db, SQLITE_TRACE_STMT, Collect, nullptr);
}

// The type that sqlite declares for every entry point.
void (*TracePoint())() { return reinterpret_cast<void (*)()>(TraceNewConnection); }

}  // namespace

StatementTrace::StatementTrace() {
    Traced().clear();
    EXPECT_EQ(SQLITE_OK, sqlite3_auto_extension(TracePoint()));
}

StatementTrace::~StatementTrace() { EXPECT_EQ(1, sqlite3_cancel_auto_extension(TracePoint())); }

std::vector<std::string> StatementTrace::Framing() const {
    std::vector<std::string> framing;
    for (const std::string& statement : Traced()) {
        for (const char* word : {"PRAGMA", "BEGIN", "COMMIT", "ROLLBACK"}) {
            if (statement.starts_with(word)) framing.push_back(statement);
        }
    }
    return framing;
}

RawDatabase::RawDatabase(const std::string& path) {
    EXPECT_EQ(SQLITE_OK, sqlite3_open(path.c_str(), &m_db)) << path;
}

RawDatabase::~RawDatabase() { sqlite3_close_v2(m_db); }

void RawDatabase::Run(const std::string& sql) {
    EXPECT_EQ(SQLITE_OK, sqlite3_exec(m_db, sql.c_str(), nullptr, nullptr, nullptr))
        << sqlite3_errmsg(m_db) << ": " << sql;
}

std::string RawDatabase::Read(const std::string& sql) {
    sqlite3_stmt* statement = nullptr;
    EXPECT_EQ(SQLITE_OK, sqlite3_prepare_v2(m_db, sql.c_str(), -1, &statement, nullptr))
        << sqlite3_errmsg(m_db) << ": " << sql;
    std::string all;
    bool is_first = true;
    while (sqlite3_step(statement) == SQLITE_ROW) {
        if (!is_first) all += "|";
        is_first = false;
        const unsigned char* text = sqlite3_column_text(statement, 0);
        all += text == nullptr ? "NULL" : reinterpret_cast<const char*>(text);
    }
    EXPECT_EQ(SQLITE_OK, sqlite3_finalize(statement)) << sqlite3_errmsg(m_db) << ": " << sql;
    return all;
}

NoSqliteMemory::NoSqliteMemory() { sqlite3_hard_heap_limit64(1); }

NoSqliteMemory::~NoSqliteMemory() { sqlite3_hard_heap_limit64(0); }

void LetOtherThreadMeetTheLock() { std::this_thread::sleep_for(std::chrono::milliseconds(50)); }
