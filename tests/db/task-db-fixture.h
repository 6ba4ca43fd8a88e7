// What the tests of TaskDB share: an open store in a scratch folder.
#pragma once

#include <gtest/gtest.h>

#include <string>

#include "db/raw-database.h"
#include "db/task-db.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

class TaskDBTest : public testing::Test {
protected:
    TaskDBTest() { EXPECT_EQ(0, m_db.Init(m_path)); }

    uint64_t AddUSB(const std::string& uuid) {
        USBInfo info;
        info.uuid = uuid;
        uint64_t id = 0;
        EXPECT_EQ(0, m_db.AddUSBInfo(info, id));
        return id;
    }
    uint64_t AddTask(uint64_t usb_id, const std::string& share = "photos") {
        TaskInfo info;
        info.usb_id = usb_id;
        info.task_name = "task";
        info.hub_share_name = share;
        uint64_t id = 0;
        EXPECT_EQ(0, m_db.AddTaskInfo(info, id));
        return id;
    }
    TaskInfo Task(uint64_t id) {
        TaskInfo info;
        EXPECT_EQ(1, m_db.GetTaskInfo(id, info));
        return info;
    }
    std::string Raw(const std::string& sql) { return RawDatabase(m_path).Read(sql); }
    // Makes reading of the row with this id fail, after the statement has been prepared.
    void BreakRow(const std::string& table, uint64_t id) {
        RawDatabase raw(m_path);
        raw.Run("PRAGMA legacy_alter_table = ON; ALTER TABLE " + table + " RENAME TO broken;");
        std::string columns = raw.Read("SELECT name FROM pragma_table_info('broken')");
        std::string list;
        for (const char c : columns) list += c == '|' ? std::string(", ") : std::string(1, c);
        list.replace(
            list.rfind(", ") + 2, std::string::npos,
            "CASE id WHEN " + std::to_string(id) + " THEN abs(-9223372036854775807 - 1) ELSE " +
                list.substr(list.rfind(", ") + 2) + " END AS " + list.substr(list.rfind(", ") + 2));
        raw.Run("CREATE VIEW " + table + " AS SELECT " + list + " FROM broken;");
    }

    TempDir m_dir;
    const std::string m_path = m_dir / "task-db.sqlite";
    TaskDB m_db;
};
