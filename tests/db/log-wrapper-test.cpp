#include "db/log-wrapper.h"

#include <gtest/gtest.h>

#include <ctime>

#include "db/log-db.h"
#include "db/raw-database.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace {

class LogWrapperTest : public testing::Test {
protected:
    LogWrapperTest() { EXPECT_EQ(0, LogDB::GetInstance().Init(m_path)); }
    ~LogWrapperTest() override { LogDB::GetInstance().Close(); }

    std::string Raw(const std::string& sql) { return RawDatabase(m_path).Read(sql); }

    TempDir m_dir;
    const std::string m_path = m_dir / "log-db.sqlite";
};

TEST_F(LogWrapperTest, EventBecomesARowWithTheTimeOfTheCall) {
    LogInfo info;
    info.SetTaskId(7);
    ASSERT_EQ(0, info.SetDescription(LogDescription::LOG_DESC_TASK_RENAMED, "old", "new"));
    const time_t before = time(nullptr);
    EXPECT_EQ(0, AddLog(info));
    const time_t after = time(nullptr);
    EXPECT_LE(before, info.timestamp);
    EXPECT_GE(after, info.timestamp);
    EXPECT_EQ("7 1 10 [\"old\",\"new\"] 0",
              Raw("SELECT task_id || ' ' || log_type || ' ' || description_id || ' ' || "
                  "description_param || ' ' || error FROM log_info_table"));
    EXPECT_EQ(std::to_string(info.timestamp), Raw("SELECT timestamp FROM log_info_table"));
}

TEST_F(LogWrapperTest, FailedFileGivesARowOfItsTypeWithTheOutcome) {
    LogInfo info;
    info.SetTaskId(7);
    ASSERT_EQ(0, info.SetDescription(LogDescription::LOG_DESC_FILE_FAILED, "task", "a.jpg"));
    info.SetError(-10);
    EXPECT_EQ(0, AddLog(info));
    EXPECT_EQ("4 1000 -10", Raw("SELECT log_type || ' ' || description_id || ' ' || error FROM "
                                "log_info_table"));
}

TEST_F(LogWrapperTest, RecordForTaskZeroIsRefused) {
    LogInfo info;
    ASSERT_EQ(0, info.SetDescription(LogDescription::LOG_DESC_TASK_ADDED, "task"));
    const LogCapture log;
    EXPECT_EQ(-1, AddLog(info));
    EXPECT_EQ(std::vector<std::string>{"[ERR] Invalid parameter"}, log.Lines());
    EXPECT_EQ("0", Raw("SELECT COUNT(*) FROM log_info_table"));
}

TEST_F(LogWrapperTest, RecordWithoutAKnownDescriptionIsRefused) {
    LogInfo info;
    info.SetTaskId(7);
    EXPECT_EQ(-1, info.SetDescription(static_cast<LogDescription::ID>(4), "task"));
    const LogCapture log;
    EXPECT_EQ(-1, AddLog(info));
    EXPECT_EQ(std::vector<std::string>{"[ERR] Invalid parameter"}, log.Lines());
}

TEST_F(LogWrapperTest, RowThatCannotBeStoredIsAFailure) {
    LogDB::GetInstance().Close();
    LogInfo info;
    info.SetTaskId(18446744073709551615u);
    ASSERT_EQ(0, info.SetDescription(LogDescription::LOG_DESC_TASK_ADDED, "task"));
    const LogCapture log;
    EXPECT_EQ(-1, AddLog(info));
    EXPECT_TRUE(log.Has("[ERR] Failed to add log info to log db for task '18446744073709551615'"));
}

TEST_F(LogWrapperTest, NameThatIsNoUtf8StillGivesARow) {
    LogInfo info;
    info.SetTaskId(7);
    ASSERT_EQ(0, info.SetDescription(LogDescription::LOG_DESC_FILE_FAILED, "it's", "\xff\xfe%s\n"));
    EXPECT_EQ(0, AddLog(info));
    EXPECT_EQ("[\"it's\",\"\\ufffd\\ufffd%s\\n\"]",
              Raw("SELECT description_param FROM log_info_table"));
}

}  // namespace
