// What the tests of the log share: a log in a scratch folder with rows of one's choice.
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "db/log-db.h"
#include "db/log-info.h"
#include "support/temp-dir.h"

class LogFixture : public testing::Test {
protected:
    LogFixture() { EXPECT_EQ(0, m_db.Init(m_path)); }

    void Add(const LogInfo& row) { EXPECT_EQ(0, m_db.AddLogInfo(row)); }
    static LogInfo FileRow(const std::string& task, const std::string& file, uint32_t time,
                           uint64_t task_id = 1) {
        LogInfo row;
        row.SetTaskId(task_id);
        EXPECT_EQ(0, row.SetDescription(LogDescription::LOG_DESC_FILE_FAILED, task, file));
        row.timestamp = time;
        return row;
    }
    static LogInfo TaskRow(LogDescription::ID id, uint32_t time, uint64_t task_id = 1) {
        LogInfo row;
        row.SetTaskId(task_id);
        EXPECT_EQ(0, row.SetDescription(id, "Camera", "other"));
        row.timestamp = time;
        return row;
    }

    TempDir m_dir;
    const std::string m_path = m_dir / "log-db.sqlite";
    LogDB m_db;
};

using Times = std::vector<uint32_t>;

inline Times TimesOf(const std::vector<LogInfo>& rows) {
    Times times;
    for (const LogInfo& row : rows) times.push_back(row.timestamp);
    return times;
}
