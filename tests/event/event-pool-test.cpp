#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "event/event-pool-peatree.h"
#include "support/log-capture.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

Event Copy(const std::string& path) { return {EV_COPY, WAITTING, 7, path, 0}; }

class EventPoolTest : public testing::Test {
protected:
    LogCapture m_log;
    EventPoolPeaTree m_pool{7};
};

TEST_F(EventPoolTest, AFreshPoolIsEmpty) {
    EXPECT_EQ(7U, m_pool.GetTaskId());
    EXPECT_TRUE(m_pool.IsEmpty());
    EXPECT_THAT(m_log.Lines(), IsEmpty());
    EXPECT_EQ(0U, m_pool.Size());
    EXPECT_EQ(0U, m_pool.GetScanEventCount());
    EXPECT_THAT(m_log.Lines(), ElementsAre("[DBG] Size [0]", "[DBG] GetScanEventCount [0]"));
}

TEST_F(EventPoolTest, EmptyEventsAreSilentlyRefused) {
    m_pool.Push({EV_COPY, WAITTING, 0, "/a", 0});
    m_pool.Push({EV_EMPTY, WAITTING, 7, "/a", 0});
    m_pool.Push({EV_COPY, WAITTING, 7, "", 0});
    EXPECT_TRUE(m_pool.IsEmpty());
    EXPECT_THAT(m_log.Lines(), IsEmpty());
}

TEST_F(EventPoolTest, PopByPathIsNotSupportedAndLeavesThePoolAsItIs) {
    m_pool.Push(Copy("/a"));
    Event event;
    EXPECT_EQ(-1, m_pool.PopByPath("/a", event));
    EXPECT_TRUE(m_log.Has("[CRIT] Pop by path is not supported."));
    EXPECT_TRUE(event.IsEmpty());
    EXPECT_EQ(1, m_pool.Pop(event));
}

TEST_F(EventPoolTest, AnEmptyTreeIsNotAskedButTheLineIsLogged) {
    Event event;
    EXPECT_EQ(0, m_pool.Pop(event));
    EXPECT_THAT(m_log.Lines(),
                ElementsAre("[DBG] Pop event [Event<EV_EMPTY> (WAITTING): [0]  (file_op,file)]."));
}

TEST_F(EventPoolTest, CountsWhatIsInWork) {
    m_pool.Push(Copy("/a"));
    m_pool.Push({EV_CREATE, WAITTING, 7, "/b", 3});
    Event event;
    ASSERT_EQ(1, m_pool.Pop(event));
    EXPECT_EQ(2U, m_pool.Size());
    EXPECT_EQ(1U, m_pool.GetScanEventCount());
    EXPECT_EQ(0, m_pool.Done(event));
    EXPECT_EQ(1U, m_pool.Size());
    m_pool.Clear();
    EXPECT_TRUE(m_pool.IsEmpty());
}

TEST_F(EventPoolTest, LogsEachOperationOnSuccessOnly) {
    const std::string waiting = "Event<EV_COPY> (WAITTING): [7] /a (file_op,file)";
    const std::string running = "Event<EV_COPY> (PROCESSING): [7] /a (file_op,file)";
    Event event;
    m_pool.Push(Copy("/a"));
    EXPECT_EQ(-1, m_pool.Done(Copy("/a")));
    EXPECT_EQ(-1, m_pool.Redo(Copy("/a")));
    EXPECT_TRUE(m_log.Has("[DBG] Push event event [" + waiting + "]."));
    EXPECT_FALSE(m_log.Contains("Done event ["));
    EXPECT_FALSE(m_log.Contains("Redo event ["));
    ASSERT_EQ(1, m_pool.Pop(event));
    EXPECT_TRUE(m_log.Has("[DBG] Pop event [" + running + "]."));
    EXPECT_EQ(0, m_pool.Redo(event));
    EXPECT_TRUE(m_log.Has("[DBG] Redo event [" + running + "]"));
    ASSERT_EQ(1, m_pool.Pop(event));
    EXPECT_EQ(0, m_pool.Done(event));
    EXPECT_TRUE(m_log.Has("[DBG] Done event [" + running + "]."));
}

TEST_F(EventPoolTest, DumpsItsTree) {
    m_pool.Push(Copy("/a"));
    m_log.Clear();
    m_pool.Dump();
    EXPECT_EQ(3U, m_log.Lines().size());
    EXPECT_TRUE(m_log.Has("[INFO]       > Event<EV_COPY> (WAITTING): [7] /a (file_op,file)"));
}

}  // namespace
