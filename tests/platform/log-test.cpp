#include "utils/log.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <string>

#include "support/log-capture.h"

namespace {

std::string g_line;
int g_priority;

void Keep(int priority, std::string_view line) {
    g_priority = priority;
    g_line = line;
}

class LogTest : public testing::Test {
protected:
    void SetUp() override { LogSetSink(Keep); }
    void TearDown() override { LogSetSink(nullptr); }
};

TEST_F(LogTest, LineCarriesTagFileAndLineNumberBeforeTheText) {
    SLOG_ERR("disk %d of %s\n", 2, "box");
    const int line = __LINE__ - 1;
    EXPECT_EQ("[ERR] " __FILE__ "(" + std::to_string(line) + "): disk 2 of box\n", g_line);
    EXPECT_EQ(LOG_ERR, g_priority);
}

TEST_F(LogTest, EveryTagGoesOutAtItsPriority) {
    const auto expect = [](const char* tag, int priority) {
        EXPECT_EQ(0U, g_line.find(tag)) << g_line;
        EXPECT_EQ(priority, g_priority);
    };
    SLOG_DBG("x");
    expect("[DBG] ", LOG_DEBUG);
    SLOG_INFO("x");
    expect("[INFO] ", LOG_INFO);
    SLOG_NOTICE("x");
    expect("[NOTICE] ", LOG_NOTICE);
    SLOG_WARN("x");
    expect("[WARN] ", LOG_WARNING);
    SLOG_ERR("x");
    expect("[ERR] ", LOG_ERR);
    SLOG_CRIT("x");
    expect("[CRIT] ", LOG_CRIT);
}

TEST_F(LogTest, ANameWithPercentSignsAndNewlinesPassesUnharmed) {
    const std::string name = "100%s\n%n\xff\xfe'\"";
    SLOG_INFO("file '%s'", name.c_str());
    EXPECT_NE(std::string::npos, g_line.find("file '" + name + "'"));
}

TEST_F(LogTest, ALineLongerThanTheStackBufferIsWhole) {
    const std::string name(100000, 'n');
    SLOG_INFO("<%s>", name.c_str());
    EXPECT_NE(std::string::npos, g_line.find("<" + name + ">"));
}

TEST_F(LogTest, ErrnoIsTheCallersAfterALine) {
    errno = ENOSPC;
    SLOG_ERR("%s", "text");
    EXPECT_EQ(ENOSPC, errno);
}

TEST(LogCaptureTest, GivesTagAndTextWithoutPlaceAndNewline) {
    const LogCapture capture;
    SLOG_WARN("one\n");
    EXPECT_TRUE(capture.Has("[WARN] one"));
    EXPECT_EQ(1, capture.Count("[WARN] one"));
}

}  // namespace
