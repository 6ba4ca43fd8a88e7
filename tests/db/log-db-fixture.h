// What the tests of LogDB share: an open store in a scratch folder.
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "db/log-db.h"
#include "db/log-info.h"
#include "db/raw-database.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

inline const std::vector<int> kAllDescriptions = {0,   1,   2,   3,   10,  11,
                                                  100, 101, 102, 103, 104, 1000};

inline LogInfo Row(uint64_t task_id, uint32_t timestamp,
                   LogDescription::ID id = LogDescription::LOG_DESC_TASK_ADDED,
                   const std::string& name = "task") {
    LogInfo info;
    info.SetTaskId(task_id);
    EXPECT_EQ(0, info.SetDescription(id, name, name));
    info.timestamp = timestamp;
    return info;
}

class LogDBTest : public testing::Test {
protected:
    LogDBTest() { EXPECT_EQ(0, m_db.Init(m_path)); }

    void Add(const LogInfo& info) { EXPECT_EQ(0, m_db.AddLogInfo(info)); }
    // Rows of task 1 with the times first to last.
    void AddRows(uint32_t first, uint32_t last) {
        for (uint32_t i = first; i <= last; ++i) Add(Row(1, i));
    }
    std::string Raw(const std::string& sql) { return RawDatabase(m_path).Read(sql); }
    // The times of the rows that a filter selects.
    std::vector<uint32_t> TimesOf(const LogFilter& filter) {
        std::vector<LogInfo> rows;
        EXPECT_EQ(0, m_db.ListLogInfo(filter, rows));
        std::vector<uint32_t> times;
        for (const LogInfo& row : rows) times.push_back(row.timestamp);
        if (filter.limit == 0) {
            uint64_t count = 0;
            EXPECT_EQ(0, m_db.CountLogInfo(filter, count));
            EXPECT_EQ(times.size(), count);
        }
        return times;
    }
    static LogFilter Everything() {
        LogFilter filter;
        filter.description_ids = kAllDescriptions;
        return filter;
    }

    TempDir m_dir;
    const std::string m_path = m_dir / "log-db.sqlite";
    LogDB m_db;
};
using Times = std::vector<uint32_t>;
