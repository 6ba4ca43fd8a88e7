#include "event/event-manager.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>

#include "event/event-generator.h"
#include "event/event-text.h"
#include "processor/processor.h"
#include "support/log-capture.h"

namespace {

using testing::ElementsAre;

Event Copy(uint64_t task_id, const std::string& path) {
    return {EV_COPY, WAITTING, task_id, path, 0};
}

class EventManagerTest : public testing::Test {
protected:
    // The next event's path with its task in front; nothing without one.
    std::optional<std::string> Pull(Processor& worker) {
        m_event = Event{};
        if (m_manager.PullEvent(&worker, m_event) == 0) return std::nullopt;
        return std::to_string(m_event.task_id) + m_event.path;
    }

    LogCapture m_log;
    EventManager m_manager;
    Processor m_worker;
    Processor m_other_worker;
    Event m_event;
};

TEST_F(EventManagerTest, APathThatIsNotNfcLeavesNothingButTheWarning) {
    const Event event = Copy(7, "/e\xcc\x81");
    m_manager.PushEvent(event);
    EXPECT_THAT(m_log.Lines(),
                ElementsAre("[WARN] EVENT is not NFC Form '" + ToString(event) + "', skipping..."));
    EXPECT_EQ(0U, m_manager.GetEventCount(7));
    m_log.Clear();
    m_manager.Traverse();
    EXPECT_TRUE(m_log.Lines().empty());  // there is no pool either
}

TEST_F(EventManagerTest, AnInvalidUtf8PathIsAccepted) {
    m_manager.PushEvent(Copy(7, "/\xff"));
    EXPECT_EQ(1U, m_manager.GetEventCount(7));
    EXPECT_EQ("7/\xff", Pull(m_worker));
}

TEST_F(EventManagerTest, EmptyEventsAreRefusedWithAnError) {
    for (const Event& event : {
             Copy(0, "/a"), Copy(7, ""), Event{EV_EMPTY, WAITTING, 7, "/a", 0}
    }) {
        m_log.Clear();
        m_manager.PushEvent(event);
        EXPECT_THAT(m_log.Lines(), ElementsAre("[ERR] Invalid event '" + ToString(event) + "'."));
    }
    EXPECT_EQ(0U, m_manager.GetEventCount(7));
    EXPECT_EQ(std::nullopt, Pull(m_worker));
}

TEST_F(EventManagerTest, ThePathIsCheckedBeforeTheRest) {
    m_manager.PushEvent(Copy(0, "/e\xcc\x81"));
    EXPECT_TRUE(m_log.Contains("EVENT is not NFC Form"));
    EXPECT_FALSE(m_log.Contains("Invalid event"));
}

TEST_F(EventManagerTest, APushedEventIsPulledAndDone) {
    m_manager.PushEvent(Copy(7, "/a"));
    EXPECT_TRUE(m_log.Has("[DBG] EventManager::PushEvent = [" + ToString(Copy(7, "/a")) + "]."));
    EXPECT_EQ("7/a", Pull(m_worker));
    EXPECT_EQ(PROCESSING, m_event.status);
    const std::string text = ToString(m_event);
    EXPECT_TRUE(m_log.Has("[INFO] EventManager::PullEvent [" + text + "]"));
    EXPECT_EQ(1U, m_manager.GetEventCount(7));  // it is in work
    EXPECT_EQ(0, m_manager.DoneEvent(&m_worker));
    EXPECT_TRUE(m_log.Has("[DBG] EventManager::DoneEvent unregistry for [" + text + "]"));
    EXPECT_EQ(0U, m_manager.GetEventCount(7));
    EXPECT_EQ(-1, m_manager.DoneEvent(&m_worker));
    EXPECT_TRUE(m_log.Has("[ERR] Can not get event for current processor '-1'"));
}

TEST_F(EventManagerTest, TwoTasksAreServedInTurn) {
    for (const char* path : {"/a", "/b", "/c"}) {
        m_manager.PushEvent(Copy(1, path));
        m_manager.PushEvent(Copy(2, path));
    }
    std::vector<std::string> pulled;
    while (const auto event = Pull(m_worker)) {
        pulled.push_back(*event);
        m_manager.DoneEvent(&m_worker);
    }
    EXPECT_THAT(pulled, ElementsAre("1/a", "2/a", "1/b", "2/b", "1/c", "2/c"));
}

TEST_F(EventManagerTest, ABlockedPoolUsesUpItsTurnAndGoesToTheEnd) {
    m_manager.PushEvent(Copy(1, "/a"));
    EXPECT_EQ("1/a", Pull(m_other_worker));
    m_manager.PushEvent(Copy(2, "/b"));
    EXPECT_EQ(std::nullopt, Pull(m_worker));
    EXPECT_EQ("2/b", Pull(m_worker));
}

TEST_F(EventManagerTest, APoolThatRanEmptyComesBackWithTheNextPush) {
    m_manager.PushEvent(Copy(1, "/a"));
    EXPECT_EQ("1/a", Pull(m_worker));
    m_manager.DoneEvent(&m_worker);
    EXPECT_EQ(std::nullopt, Pull(m_worker));  // found empty
    EXPECT_EQ(std::nullopt, Pull(m_worker));
    m_manager.PushEvent(Copy(1, "/b"));
    EXPECT_EQ("1/b", Pull(m_worker));
}

TEST_F(EventManagerTest, AnEventGivenBackIsPulledAgain) {
    m_manager.PushEvent(Copy(1, "/a"));
    EXPECT_EQ("1/a", Pull(m_worker));
    EXPECT_EQ(0, m_manager.RedoEvent(&m_worker, m_event));
    EXPECT_TRUE(m_log.Has("[DBG] EventManager::RedoEvent = [" + ToString(m_event) + "], ret= [0]"));
    EXPECT_EQ(-1, m_manager.DoneEvent(&m_worker));  // it holds nothing any more
    EXPECT_EQ("1/a", Pull(m_worker));
}

TEST_F(EventManagerTest, ARefusedRedoIsReported) {
    m_manager.PushEvent(Copy(1, "/a"));
    EXPECT_EQ(-1, m_manager.RedoEvent(&m_worker, Copy(1, "/a")));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to Reset event status to watting in event tree '/a'."));
    EXPECT_EQ("1/a", Pull(m_worker));
}

TEST_F(EventManagerTest, DoneAfterRemoveTaskFailsAndClearsTheEntry) {
    m_manager.PushEvent(Copy(7, "/a"));
    EXPECT_EQ("7/a", Pull(m_worker));
    m_manager.RemoveTask(7);
    EXPECT_TRUE(m_log.Has("[INFO] EventManager: task '7' removed"));
    EXPECT_EQ(0U, m_manager.GetEventCount(7));
    EXPECT_EQ(-1, m_manager.DoneEvent(&m_worker));
    EXPECT_TRUE(m_log.Has("[ERR] Can not get event pool for current task '7'"));
    EXPECT_EQ(-1, m_manager.DoneEvent(&m_worker));
    EXPECT_TRUE(m_log.Contains("Can not get event for current processor"));
}

TEST_F(EventManagerTest, RedoAfterRemoveTaskFailsAndLeavesTheEntry) {
    m_manager.PushEvent(Copy(7, "/a"));
    EXPECT_EQ("7/a", Pull(m_worker));
    m_manager.RemoveTask(7);
    EXPECT_EQ(-1, m_manager.RedoEvent(&m_worker, m_event));
    EXPECT_TRUE(m_log.Has("[ERR] Can not find event pool"));
    EXPECT_TRUE(m_log.Contains("ret= [-1]"));
    EXPECT_EQ(-1, m_manager.DoneEvent(&m_worker));
    EXPECT_TRUE(m_log.Contains("Can not get event pool"));  // so there still was an entry
}

TEST_F(EventManagerTest, ARemovedTaskLeavesTheQueueAndOthersKeepTheirTurn) {
    for (const uint64_t task_id : {1, 2, 3}) m_manager.PushEvent(Copy(task_id, "/a"));
    m_manager.RemoveTask(2);
    EXPECT_EQ("1/a", Pull(m_worker));
    EXPECT_EQ("3/a", Pull(m_worker));
    m_log.Clear();
    m_manager.RemoveTask(99);
    EXPECT_TRUE(m_log.Lines().empty());
}

TEST_F(EventManagerTest, CountsAreOfOneTaskAndZeroForAnUnknownOne) {
    m_manager.PushEvent(Copy(1, "/a"));
    m_manager.PushEvent({EV_CREATE, WAITTING, 1, "/b", 3});
    EXPECT_EQ(2U, m_manager.GetEventCount(1));
    EXPECT_EQ(1U, m_manager.GetScanEventCount(1));
    EXPECT_EQ(0U, m_manager.GetEventCount(2));
    EXPECT_EQ(0U, m_manager.GetScanEventCount(2));
}

TEST_F(EventManagerTest, TraverseDumpsThePoolsInTheOrderOfTheirTasks) {
    m_manager.PushEvent(Copy(2, "/b"));
    m_manager.PushEvent(Copy(1, "/a"));
    m_log.Clear();
    m_manager.Traverse();
    const auto lines = m_log.Lines();
    ASSERT_EQ(8U, lines.size());
    EXPECT_EQ("[INFO] **************** Traverse task '1' ****************", lines[0]);
    EXPECT_EQ("[INFO]       > " + ToString(Copy(1, "/a")), lines[3]);
    EXPECT_EQ("[INFO] **************** Traverse task '2' ****************", lines[4]);
}

class EventGeneratorTest : public testing::Test {
protected:
    ~EventGeneratorTest() override { EventManager::GetInstance().RemoveTask(70); }
    Event Next() {
        Event event;
        EXPECT_EQ(1, EventManager::GetInstance().PullEvent(&m_worker, event));
        EventManager::GetInstance().DoneEvent(&m_worker);
        return event;
    }

    LogCapture m_log;
    Processor m_worker;
    EventGenerator m_generator{70};
};

TEST_F(EventGeneratorTest, BuildsTheFourKindsOfEvents) {
    const struct {
        void (*push)(const EventGenerator&);
        const char* name;
        const char* text;
    } cases[] = {
        {[](const EventGenerator& g) { g.PushScanEvent("/"); },           "PushScanEvent",
         "Event<EV_CREATE> (WAITTING): [70] / (scan,dir)"     },
        {[](const EventGenerator& g) { g.PushCreateDirEvent("/d"); },     "PushCreateDirEvent",
         "Event<EV_CREATE> (WAITTING): [70] /d (file_op,dir)" },
        {[](const EventGenerator& g) { g.PushCopyFileEvent("/f"); },      "PushCopyFileEvent",
         "Event<EV_COPY> (WAITTING): [70] /f (file_op,file)"  },
        {[](const EventGenerator& g) { g.PushRemoveEvent("/r", true); },  "PushRemoveEvent",
         "Event<EV_REMOVE> (WAITTING): [70] /r (file_op,dir)" },
        {[](const EventGenerator& g) { g.PushRemoveEvent("/r", false); }, "PushRemoveEvent",
         "Event<EV_REMOVE> (WAITTING): [70] /r (file_op,file)"},
    };
    for (const auto& c : cases) {
        m_log.Clear();
        c.push(m_generator);
        const std::string line =
            std::string("[DBG] Event Genetator: ") + c.name + " at [70], ev=[" + c.text + "]";
        EXPECT_EQ(line, m_log.Lines().back());
        Event event = Next();
        event.status = WAITTING;
        EXPECT_EQ(c.text, ToString(event));
    }
}

TEST_F(EventManagerTest, EventsInHandAreCountedByTask) {
    m_manager.PushEvent(Copy(7, "/a"));
    m_manager.PushEvent(Copy(8, "/b"));
    EXPECT_EQ(0U, m_manager.GetHeldEventCount(7));
    EXPECT_EQ("7/a", Pull(m_worker));
    const Event first = m_event;
    EXPECT_EQ("8/b", Pull(m_other_worker));
    EXPECT_EQ(1U, m_manager.GetHeldEventCount(7));
    EXPECT_EQ(1U, m_manager.GetHeldEventCount(8));
    EXPECT_EQ(0, m_manager.RedoEvent(&m_worker, first));
    EXPECT_EQ(0, m_manager.DoneEvent(&m_other_worker));
    EXPECT_EQ(0U, m_manager.GetHeldEventCount(7));
    EXPECT_EQ(0U, m_manager.GetHeldEventCount(8));
}

}  // namespace
