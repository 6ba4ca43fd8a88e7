#include "db/raw-database.h"

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <chrono>
#include <thread>

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
