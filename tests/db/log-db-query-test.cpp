// LogDB: what its filters select.
#include "db/log-db-fixture.h"

namespace {

TEST_F(LogDBTest, ListGivesTheNewestRowsFirst) {
    AddRows(1, 3);
    EXPECT_EQ((Times{3, 2, 1}), TimesOf(Everything()));
}

TEST_F(LogDBTest, ListAppendsToWhatIsThere) {
    AddRows(1, 2);
    std::vector<LogInfo> rows(1);
    ASSERT_EQ(0, m_db.ListLogInfo(Everything(), rows));
    EXPECT_EQ(3u, rows.size());
    EXPECT_EQ(0u, rows[0].timestamp);
}

TEST_F(LogDBTest, TaskSelectsItsRows) {
    Add(Row(1, 1));
    Add(Row(2, 2));
    LogFilter filter = Everything();
    filter.task_id = 2;
    EXPECT_EQ((Times{2}), TimesOf(filter));
}

TEST_F(LogDBTest, TimesAreIncludedOnBothEnds) {
    AddRows(1, 5);
    LogFilter filter = Everything();
    filter.from_time = 2;
    EXPECT_EQ((Times{5, 4, 3, 2}), TimesOf(filter));
    filter.to_time = 4;
    EXPECT_EQ((Times{4, 3, 2}), TimesOf(filter));
    filter.from_time = 0;
    EXPECT_EQ((Times{4, 3, 2, 1}), TimesOf(filter));
}

TEST_F(LogDBTest, LogTypeSelectsOneTypeAndAnyOtherNumberAll) {
    Add(Row(1, 1, LogDescription::LOG_DESC_TASK_DONE));
    Add(Row(1, 2, LogDescription::LOG_DESC_TASK_FAILED));
    Add(Row(1, 4, LogDescription::LOG_DESC_FILE_FAILED));
    LogFilter filter = Everything();
    for (const int type : {1, 2, 4}) {
        filter.log_type = type;
        EXPECT_EQ((Times{static_cast<uint32_t>(type)}), TimesOf(filter)) << type;
    }
    for (const int type : {-1, 0, 3, 5, 6, 7, 8}) {
        filter.log_type = type;
        EXPECT_EQ((Times{4, 2, 1}), TimesOf(filter)) << type;
    }
}

TEST_F(LogDBTest, DescriptionsSelectTheirRowsAndNoneSelectsNothing) {
    Add(Row(1, 1, LogDescription::LOG_DESC_TASK_ADDED));
    Add(Row(1, 2, LogDescription::LOG_DESC_TASK_DONE));
    Add(Row(1, 3, LogDescription::LOG_DESC_FILE_FAILED));
    LogFilter filter;
    EXPECT_EQ((Times{}), TimesOf(filter));
    filter.description_ids = {101};
    EXPECT_EQ((Times{2}), TimesOf(filter));
    filter.description_ids = {0, 1000, 7};
    EXPECT_EQ((Times{3, 1}), TimesOf(filter));
}

TEST_F(LogDBTest, KeywordMatchesPercentAndUnderscoreLiterally) {
    using enum LogDescription::ID;
    Add(Row(1, 1, LOG_DESC_TASK_ADDED, "100% done"));
    Add(Row(1, 2, LOG_DESC_TASK_ADDED, "100x done"));
    Add(Row(1, 3, LOG_DESC_TASK_ADDED, "a_b"));
    Add(Row(1, 4, LOG_DESC_TASK_ADDED, "axb"));
    LogFilter filter = Everything();
    filter.keyword = "0% d";
    EXPECT_EQ((Times{1}), TimesOf(filter));
    filter.keyword = "a_b";
    EXPECT_EQ((Times{3}), TimesOf(filter));
    filter.keyword = "done";
    EXPECT_EQ((Times{2, 1}), TimesOf(filter));
    filter.keyword = "nowhere";
    EXPECT_EQ((Times{}), TimesOf(filter));
}

TEST_F(LogDBTest, BackslashInTheKeywordTakesTheNextCharacterLiterally) {
    using enum LogDescription::ID;
    Add(Row(1, 1, LOG_DESC_TASK_ADDED, "a\\b"));  // stored as JSON, with two backslashes
    Add(Row(1, 2, LOG_DESC_TASK_ADDED, "ab"));
    LogFilter filter = Everything();
    filter.keyword = "a\\b";
    EXPECT_EQ((Times{2}), TimesOf(filter));
    filter.keyword = "a\\\\\\\\b";
    EXPECT_EQ((Times{1}), TimesOf(filter));
}

TEST_F(LogDBTest, KeywordMatchesAsciiLettersInEitherCase) {
    using enum LogDescription::ID;
    Add(Row(1, 1, LOG_DESC_TASK_ADDED, "Holiday"));
    LogFilter filter = Everything();
    filter.keyword = "hOLI";
    EXPECT_EQ((Times{1}), TimesOf(filter));
}

TEST_F(LogDBTest, QuoteInTheKeywordReachesTheStatementUnchanged) {
    AddRows(1, 1);
    LogFilter filter = Everything();
    filter.keyword = "it's";
    std::vector<LogInfo> rows;
    const LogCapture log;
    EXPECT_EQ(-1, m_db.ListLogInfo(filter, rows));
    EXPECT_TRUE(log.Contains("sqlite3_prepare_v2: [1] near \"s\""));
    filter.keyword = "it''s";
    EXPECT_EQ(0, m_db.ListLogInfo(filter, rows));
}

TEST_F(LogDBTest, AllClausesTogetherSelectTheOneRow) {
    using enum LogDescription::ID;
    Add(Row(1, 5, LOG_DESC_FILE_FAILED, "match"));
    Add(Row(2, 5, LOG_DESC_FILE_FAILED, "match"));
    Add(Row(1, 1, LOG_DESC_FILE_FAILED, "match"));
    Add(Row(1, 9, LOG_DESC_FILE_FAILED, "match"));
    Add(Row(1, 5, LOG_DESC_FILE_FAILED, "other"));
    Add(Row(1, 5, LOG_DESC_TASK_DONE, "match"));
    LogFilter filter;
    filter.task_id = 1;
    filter.from_time = 4;
    filter.to_time = 6;
    filter.keyword = "match";
    filter.log_type = LogDB::LOG_TYPE_FILE_ERROR;
    filter.description_ids = {101, 1000};
    filter.limit = 3;
    uint64_t count = 0;
    EXPECT_EQ(0, m_db.CountLogInfo(filter, count));
    EXPECT_EQ(1u, count);
    EXPECT_EQ((Times{5}), TimesOf(filter));
}

TEST_F(LogDBTest, LimitAndOffsetCutThePage) {
    AddRows(1, 10);
    LogFilter filter = Everything();
    filter.limit = 3;
    EXPECT_EQ((Times{10, 9, 8}), TimesOf(filter));
    filter.offset = 3;
    EXPECT_EQ((Times{7, 6, 5}), TimesOf(filter));
    filter.offset = 9;
    EXPECT_EQ((Times{1}), TimesOf(filter));
}

TEST_F(LogDBTest, LimitDoesNotLimitTheCount) {
    AddRows(1, 10);
    LogFilter filter = Everything();
    filter.limit = 3;
    uint64_t count = 0;
    EXPECT_EQ(0, m_db.CountLogInfo(filter, count));
    EXPECT_EQ(10u, count);
    filter.offset = 1;  // past the one row of the answer
    EXPECT_EQ(0, m_db.CountLogInfo(filter, count));
    EXPECT_EQ(0u, count);
}

TEST_F(LogDBTest, OffsetWithoutALimitIsRefused) {
    AddRows(1, 3);
    LogFilter filter = Everything();
    filter.offset = 1;
    std::vector<LogInfo> rows(1);
    uint64_t count = 5;
    const LogCapture log;
    EXPECT_EQ(-1, m_db.ListLogInfo(filter, rows));
    EXPECT_EQ(-1, m_db.CountLogInfo(filter, count));
    EXPECT_EQ(1u, rows.size());
    EXPECT_EQ(5u, count);
    EXPECT_EQ(2, log.Count("[ERR] sqlite3_prepare_v2: [1] near \"OFFSET\": syntax error"));
}

TEST_F(LogDBTest, ListKeepsWhatItReadBeforeAFailure) {
    AddRows(1, 3);
    RawDatabase(m_path).Run(
        "ALTER TABLE log_info_table RENAME TO broken; CREATE VIEW log_info_table AS SELECT id, "
        "task_id, log_type, timestamp, description_id, description_param, CASE id WHEN 1 THEN "
        "abs(-9223372036854775807 - 1) ELSE error END AS error FROM broken;");
    LogFilter filter;
    filter.description_ids = {LogDescription::LOG_DESC_TASK_ADDED};  // read in order, not sorted
    std::vector<LogInfo> rows;
    const LogCapture log;
    EXPECT_EQ(-1, m_db.ListLogInfo(filter, rows));
    EXPECT_EQ(2u, rows.size());
    EXPECT_TRUE(log.Has("[ERR] sqlite3_step: [1] integer overflow"));
}

}  // namespace
