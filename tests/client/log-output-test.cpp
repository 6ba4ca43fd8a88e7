#include "client/log-output.h"

#include <gtest/gtest.h>
#include <json/reader.h>

#include <cstdlib>
#include <ctime>
#include <sstream>

#include "client/json-output.h"
#include "client/terminal.h"
#include "db/log-db.h"
#include "db/log-info.h"
#include "utils/error-code.h"

namespace {

class LogOutputTest : public testing::Test {
protected:
    LogOutputTest() {
        const char* zone = getenv("TZ");
        m_had_zone = zone != nullptr;
        if (m_had_zone) m_zone = zone;
        SetZone("CET-1CEST,M3.5.0,M10.5.0/3");
        m_row.SetTaskId(18446744073709551615U);
        EXPECT_EQ(0, m_row.SetDescription(LogDescription::LOG_DESC_FILE_FAILED, "Camera",
                                          "\033[31m\"Ü\".jpg\xFF"));
        m_row.SetError(ERR_DST_QUOTA_FULL);
        m_row.timestamp = 1795284273;
    }
    ~LogOutputTest() override {
        m_had_zone ? setenv("TZ", m_zone.c_str(), 1) : unsetenv("TZ");
        tzset();
    }
    static void SetZone(const char* zone) {
        setenv("TZ", zone, 1);
        tzset();
    }

    LogInfo m_row;

private:
    bool m_had_zone = false;
    std::string m_zone;
};

TEST_F(LogOutputTest, LineHasTimeKindAndSentence) {
    const Terminal pipe(-1);
    EXPECT_EQ(
        "2026-11-21 19:04:33  file  \"\\x1b[31m\\\"Ü\\\".jpg\xEF\xBF\xBD\" could not be copied by "
        "task \"Camera\": the destination is full\n",
        LogLine(m_row, pipe));
    ASSERT_EQ(0, m_row.SetDescription(LogDescription::LOG_DESC_TASK_DONE, "Camera"));
    EXPECT_EQ("2026-11-21 19:04:33  info  Task \"Camera\" finished\n", LogLine(m_row, pipe));
    ASSERT_EQ(0, m_row.SetDescription(LogDescription::LOG_DESC_TASK_STOPPED, "Camera"));
    EXPECT_EQ("2026-11-21 19:04:33  task  Task \"Camera\" was stopped before its end\n",
              LogLine(m_row, pipe));
    m_row.log_type = 8;
    EXPECT_EQ("2026-11-21 19:04:33  8     Task \"Camera\" was stopped before its end\n",
              LogLine(m_row, pipe));
}

TEST_F(LogOutputTest, JsonHoldsTheWholeRow) {
    Json::Value json;
    std::istringstream(JsonLine(LogJson(m_row))) >> json;
    EXPECT_EQ("2026-11-21T19:04:33+01:00", json["time"].asString());
    EXPECT_EQ(1795284273U, json["timestamp"].asUInt());
    EXPECT_EQ(18446744073709551615U, json["task_id"].asUInt64());
    EXPECT_EQ("file", json["type"].asString());
    EXPECT_EQ(1000, json["description_id"].asInt());
    ASSERT_EQ(2U, json["parameters"].size());
    EXPECT_EQ("Camera", json["parameters"][0].asString());
    EXPECT_EQ("\033[31m\"Ü\".jpg\xEF\xBF\xBD", json["parameters"][1].asString());
    EXPECT_EQ(-19, json["error"].asInt());
    EXPECT_EQ("Destination quota full", json["error_text"].asString());
    EXPECT_TRUE(json["sentence"].asString().ends_with(": the destination is full"));
    EXPECT_EQ(9U, json.size());
}

TEST_F(LogOutputTest, JsonLineIsOneLine) {
    ASSERT_EQ(0, m_row.SetDescription(LogDescription::LOG_DESC_TASK_ADDED, "a\nb\r\u2028"));
    EXPECT_EQ(std::string::npos, JsonLine(LogJson(m_row)).find_first_of("\n\r"));
}

TEST_F(LogOutputTest, OffsetIsThatOfTheTime) {
    m_row.timestamp = 1785000000;
    EXPECT_EQ("2026-07-25T19:20:00+02:00", LogJson(m_row)["time"].asString());
    SetZone("<-0330>3:30");
    EXPECT_EQ("2026-07-25T13:50:00-03:30", LogJson(m_row)["time"].asString());
    SetZone("UTC0");
    EXPECT_EQ("2026-07-25T17:20:00+00:00", LogJson(m_row)["time"].asString());
}

TEST_F(LogOutputTest, DamagedParametersAreNull) {
    m_row.description_param = "[\"Camera\"";
    const Json::Value json = LogJson(m_row);
    EXPECT_TRUE(json["parameters"].isNull());
    EXPECT_TRUE(json["sentence"].asString().starts_with("Damaged record of event 1000 of task"));
}

TEST_F(LogOutputTest, NumberThatIsNoOutcomeHasAText) {
    m_row.SetError(5);
    EXPECT_EQ("Unknown error", LogJson(m_row)["error_text"].asString());
}

}  // namespace
