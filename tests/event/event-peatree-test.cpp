#include "event/event-peatree.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "event/event-text.h"
#include "support/log-capture.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr uint32_t DIR_BIT = EVENT_FLAG_DIR;

Event Copy(const std::string& path) { return {EV_COPY, WAITTING, 7, path, 0}; }
Event Create(const std::string& path) { return {EV_CREATE, WAITTING, 7, path, DIR_BIT}; }
Event Remove(const std::string& path) { return {EV_REMOVE, WAITTING, 7, path, 0}; }
Event RemoveDir(const std::string& path) { return {EV_REMOVE, WAITTING, 7, path, DIR_BIT}; }
Event Scan(const std::string& path) {
    return {EV_CREATE, WAITTING, 7, path, DIR_BIT | EVENT_FLAG_SCAN};
}

class NoteTaker : public EventPeaTree::ObserverType {
public:
    void OnNotify(EventPeaTree*, EventTreeNotification what, const Event* event) override {
        notes.emplace_back(what, ToString(*event));
    }
    std::vector<std::pair<int, std::string>> notes;
};

class EventPeaTreeTest : public testing::Test {
protected:
    // "path" of the next event, with its type in words; nothing when none can run.
    std::optional<std::string> Pop() {
        Event event;
        if (m_tree.Pop(event) == 0) return std::nullopt;
        EXPECT_EQ(PROCESSING, event.status);
        m_last = event;
        return Word(event) + event.path;
    }
    std::string PopAndDone() {
        const std::string popped = Pop().value_or("nothing");
        EXPECT_EQ(1, m_tree.Done(m_last));
        return popped;
    }
    static std::string Word(const Event& event) {
        if (event.IsScan()) return "scan ";
        if (event.type == EV_REMOVE) return "remove ";
        return event.type == EV_CREATE ? "create " : "copy ";
    }

    LogCapture m_log;
    EventPeaTree m_tree;
    Event m_last;
};

TEST_F(EventPeaTreeTest, AnEmptyTreeGivesNothing) {
    EXPECT_EQ(std::nullopt, Pop());
    EXPECT_TRUE(m_log.Has("[DBG] No available event can be pop."));
    EXPECT_TRUE(m_tree.IsEmpty());
    EXPECT_EQ(0U, m_tree.Size());
}

TEST_F(EventPeaTreeTest, FollowsTheWorkedExample) {
    m_tree.Push(Scan("/"));
    EXPECT_EQ(1U, m_tree.Size());
    EXPECT_EQ("scan /", Pop());
    EXPECT_EQ(std::nullopt, Pop());
    m_tree.Push(Scan("/a"));
    m_tree.Push(Copy("/f"));
    m_tree.Push(Create("/b"));
    EXPECT_EQ(
        "* / - event count: {file_op: 0, scan:1, tfile_op:2, tscan:2, tfile_op_p:0, tscan_p:1, "
        "tfile_op_nr:2, tscan_nr:2}\n"
        "    > Event<EV_CREATE> (PROCESSING): [7] / (scan,dir)\n"
        "  * a - event count: {file_op: 0, scan:1, tfile_op:0, tscan:1, tfile_op_p:0, tscan_p:0, "
        "tfile_op_nr:0, tscan_nr:1}\n"
        "      > Event<EV_CREATE> (WAITTING): [7] /a (scan,dir)\n"
        "  * f - event count: {file_op: 1, scan:0, tfile_op:1, tscan:0, tfile_op_p:0, tscan_p:0, "
        "tfile_op_nr:1, tscan_nr:0}\n"
        "      > Event<EV_COPY> (WAITTING): [7] /f (file_op,file)\n"
        "  * b - event count: {file_op: 1, scan:0, tfile_op:1, tscan:0, tfile_op_p:0, tscan_p:0, "
        "tfile_op_nr:1, tscan_nr:0}\n"
        "      > Event<EV_CREATE> (WAITTING): [7] /b (file_op,dir)\n",
        m_tree.ToString());
    EXPECT_EQ(std::nullopt, Pop());
    EXPECT_EQ(1, m_tree.Done(Scan("/")));
    EXPECT_EQ(1U, m_tree.ScanCount());
    EXPECT_EQ(3U, m_tree.Size());
    EXPECT_EQ("scan /a", Pop());
    EXPECT_EQ("copy /f", Pop());
    const std::string text = m_tree.ToString();
    EXPECT_LT(text.find("* b "), text.find("* a "));  // the order is now b, a, f
    EXPECT_LT(text.find("* a "), text.find("* f "));
    EXPECT_EQ(1, m_tree.Done(Copy("/f")));
    EXPECT_EQ(std::string::npos, m_tree.ToString().find("* f "));
    m_tree.Push(RemoveDir("/a"));
    EXPECT_EQ("create /b", Pop());
    EXPECT_EQ(std::nullopt, Pop());  // the scan of /a runs
    EXPECT_EQ(1, m_tree.Done(Scan("/a")));
    m_tree.Push(Copy("/a/x"));
    EXPECT_EQ("remove /a", Pop());
    EXPECT_EQ(std::nullopt, Pop());
}

TEST_F(EventPeaTreeTest, AnEventOnTheRootIsNeitherRotatedNorPruned) {
    m_tree.Push(Copy("/a"));
    m_tree.Push(Copy("/b"));
    m_tree.Push(Scan("/"));
    EXPECT_EQ("scan /", PopAndDone());
    EXPECT_EQ("copy /a", PopAndDone());
    EXPECT_EQ("copy /b", PopAndDone());
    m_tree.Push(Scan("/"));
    EXPECT_EQ("scan /", PopAndDone());
    EXPECT_EQ(
        "* / - event count: {file_op: 0, scan:0, tfile_op:0, tscan:0, tfile_op_p:0, tscan_p:0, "
        "tfile_op_nr:0, tscan_nr:0}\n",
        m_tree.ToString());
}

TEST_F(EventPeaTreeTest, AParentRunsBeforeItsChild) {
    m_tree.Push(Copy("/a/b/c"));
    m_tree.Push(Create("/a/b"));
    m_tree.Push(Create("/a"));
    EXPECT_EQ("create /a", PopAndDone());
    EXPECT_EQ("create /a/b", PopAndDone());
    EXPECT_EQ("copy /a/b/c", PopAndDone());
}

TEST_F(EventPeaTreeTest, NothingRunsBelowARunningEvent) {
    m_tree.Push(Create("/a"));
    EXPECT_EQ("create /a", Pop());
    m_tree.Push(Copy("/a/x"));
    EXPECT_EQ(std::nullopt, Pop());
    m_tree.Done(Create("/a"));
    EXPECT_EQ("copy /a/x", Pop());
}

TEST_F(EventPeaTreeTest, ARemovalWaitsForRunningWorkBelow) {
    m_tree.Push(Copy("/a/x"));
    m_tree.Push(Copy("/a/y"));
    EXPECT_EQ("copy /a/x", Pop());
    m_tree.Push(RemoveDir("/a"));
    EXPECT_EQ(2U, m_tree.Size());  // y is obsolete
    EXPECT_EQ(std::nullopt, Pop());
    EXPECT_EQ(1, m_tree.Done(Copy("/a/x")));
    EXPECT_EQ("remove /a", Pop());
}

TEST_F(EventPeaTreeTest, AFileOperationGoesBeforeAScanOfTheSameFolder) {
    m_tree.Push(Scan("/a"));
    m_tree.Push(Create("/a"));
    EXPECT_EQ("create /a", Pop());
    EXPECT_EQ(std::nullopt, Pop());
    m_tree.Done(Create("/a"));
    EXPECT_EQ("scan /a", Pop());
}

TEST_F(EventPeaTreeTest, ACreationAfterARemovalOfOnePathRunsAfterIt) {
    m_tree.Push(Remove("/a"));
    m_tree.Push(Create("/a"));
    EXPECT_EQ("remove /a", PopAndDone());
    EXPECT_EQ("create /a", PopAndDone());
}

TEST_F(EventPeaTreeTest, ACopyBehindARunningCopyIsAppendedAndAThirdMerged) {
    m_tree.Push(Copy("/a"));
    EXPECT_EQ("copy /a", Pop());
    m_tree.Push(Copy("/a"));
    EXPECT_EQ(2U, m_tree.Size());
    m_tree.Push(Copy("/a"));
    EXPECT_EQ(2U, m_tree.Size());
    EXPECT_EQ(std::nullopt, Pop());
    m_tree.Done(Copy("/a"));
    EXPECT_EQ("copy /a", Pop());
}

TEST_F(EventPeaTreeTest, AMergeTakesAllFieldsOfTheNewerEvent) {
    m_tree.Push(Copy("/a"));
    Event newer = Copy("//a/");
    newer.task_id = 9;
    m_tree.Push(newer);
    Event event;
    ASSERT_EQ(1, m_tree.Pop(event));
    EXPECT_EQ("//a/", event.path);
    EXPECT_EQ(9U, event.task_id);
    EXPECT_EQ(1U, m_tree.Size());
}

TEST_F(EventPeaTreeTest, EventsOfOtherTypesOrFlagsAreNotMerged) {
    m_tree.Push(Copy("/a"));
    m_tree.Push(Create("/a"));
    Event other_flags = Create("/a");
    other_flags.flags |= 1U << 9;
    m_tree.Push(other_flags);
    m_tree.Push(other_flags);
    EXPECT_EQ(3U, m_tree.Size());
}

TEST_F(EventPeaTreeTest, AnEventComesOutAsItWentIn) {
    const Event odd[] = {
        {EV_COPY,                       WAITTING, 7,      "/x",                            0                     },
        {EV_COPY,                       WAITTING, 7,      "x//y",                          0                     },
        {EV_COPY,                       WAITTING, 8,      "/z/",                           0                     },
        {static_cast<EventType>(70000), WAITTING, 7,      "/t",                            0x80000001U           },
        {EV_COPY,                       WAITTING, 7,      "/" + std::string(1500,          'l'),                   0},
        {EV_COPY,                             WAITTING,                               7, "/" + std::string(1500, 'm') + "/", 0},
        {EV_COPY,                            WAITTING,                                    7,                                    "/new\nline %s \"q\" \xff",                                0                 },
    };
    for (const Event& in : odd) {
        EventPeaTree tree;
        tree.Push(Copy("/other"));
        tree.Push(in);
        Event out;
        ASSERT_EQ(1, tree.Pop(out));
        if (out.path == "/other") {
            ASSERT_EQ(1, tree.Pop(out));
        }
        EXPECT_EQ(in.path, out.path);
        EXPECT_EQ(in.task_id, out.task_id);
        EXPECT_EQ(in.type, out.type);
        EXPECT_EQ(in.flags, out.flags);
        EXPECT_EQ(1, tree.Done(out));
    }
}

TEST_F(EventPeaTreeTest, SeparatorsAtTheEndsAndRepeatedOnesProduceNothing) {
    m_tree.Push(Copy("/a//b/"));
    EXPECT_NE(std::string::npos, m_tree.ToString().find("    * b - "));
    Event event;
    ASSERT_EQ(1, m_tree.Pop(event));
    EXPECT_EQ(1, m_tree.Done(Copy("a/b")));
}

TEST_F(EventPeaTreeTest, AComponentOfMoreThan1023BytesIsSplit) {
    const std::string name = std::string(1023, 'x');
    m_tree.Push(Copy("/" + name + "yz"));
    EXPECT_NE(std::string::npos, m_tree.ToString().find("\n  * " + name + " - "));
    EXPECT_NE(std::string::npos, m_tree.ToString().find("\n    * yz - "));
    EXPECT_EQ("copy /" + name + "yz", Pop());
    EXPECT_EQ(1, m_tree.Redo(Copy("/" + name + "/yz")));
    EXPECT_EQ("copy /" + name + "yz", Pop());
    EXPECT_EQ(1, m_tree.Done(Copy("/" + name + "yz")));
    EXPECT_TRUE(m_tree.IsEmpty());
    m_tree.Push(Copy("/" + name));
    EXPECT_EQ("copy /" + name, PopAndDone());
}

TEST_F(EventPeaTreeTest, ARemovalOverAWaitingRemovalLeavesOne) {
    NoteTaker taker;
    m_tree.Attach(&taker);
    m_tree.Push(Remove("/a"));
    m_tree.Push(Remove("/a"));
    EXPECT_EQ(1U, m_tree.Size());
    const std::string text = ToString(Remove("/a"));
    using Note = std::pair<int, std::string>;
    EXPECT_THAT(taker.notes, ElementsAre(Note(NOTIFY_LIST_STARTED, text), Note(NOTIFY_PUSHED, text),
                                         Note(NOTIFY_DROPPED, text), Note(NOTIFY_PUSHED, text)));
}

TEST_F(EventPeaTreeTest, ARemovalAbortsARunningCopyOfItsPathAndRunsAfterIt) {
    m_tree.Push(Copy("/a"));
    EXPECT_EQ("copy /a", Pop());
    m_tree.Push(Remove("/a"));
    EXPECT_NE(std::string::npos,
              m_tree.ToString().find("> Event<EV_COPY> (ABORT): [7] /a (file_op,file)\n"));
    EXPECT_EQ(std::nullopt, Pop());
    EXPECT_EQ(1, m_tree.Done(Copy("/a")));
    EXPECT_EQ("remove /a", Pop());
}

TEST_F(EventPeaTreeTest, ARunningRemovalBelowANewRemovalStaysInWork) {
    m_tree.Push(Remove("/a/b"));
    EXPECT_EQ("remove /a/b", Pop());
    m_tree.Push(RemoveDir("/a"));
    EXPECT_NE(std::string::npos,
              m_tree.ToString().find("> Event<EV_REMOVE> (PROCESSING): [7] /a/b"));
    EXPECT_EQ(std::nullopt, Pop());
    EXPECT_EQ(1, m_tree.Done(Remove("/a/b")));
    EXPECT_EQ("remove /a", Pop());
}

TEST_F(EventPeaTreeTest, ARemovalLeavesScansAlone) {
    m_tree.Push(Scan("/a/b"));
    m_tree.Push(Copy("/a/b/c"));
    m_tree.Push(RemoveDir("/a"));
    EXPECT_EQ("remove /a", PopAndDone());
    EXPECT_EQ("scan /a/b", PopAndDone());
    EXPECT_EQ(std::nullopt, Pop());
}

TEST_F(EventPeaTreeTest, AnAbortedEventThatIsRedoneRunsAgainBeforeTheRemoval) {
    m_tree.Push(Copy("/a"));
    EXPECT_EQ("copy /a", Pop());
    m_tree.Push(Remove("/a"));
    EXPECT_EQ(1, m_tree.Redo(Copy("/a")));
    EXPECT_EQ("copy /a", PopAndDone());
    EXPECT_EQ("remove /a", PopAndDone());
}

TEST_F(EventPeaTreeTest, DoneAndRedoOfAnUnknownPathFail) {
    m_tree.Push(Copy("/a"));
    EXPECT_EQ(0, m_tree.Done(Copy("/b")));
    EXPECT_TRUE(m_log.Has("[CRIT] Done an event on nonexistent path '/b'."));
    EXPECT_EQ(0, m_tree.Redo(Copy("/a/b")));
    EXPECT_TRUE(m_log.Has("[CRIT] Redo an event on nonexistent path '/a/b'."));
    EXPECT_EQ(1U, m_tree.Size());
}

TEST_F(EventPeaTreeTest, DoneAndRedoOfAWaitingEventFail) {
    m_tree.Push(Copy("/a"));
    EXPECT_EQ(0, m_tree.Done(Copy("/a")));
    EXPECT_TRUE(m_log.Has("[WARN] Done an event not in processing/abort state."));
    EXPECT_EQ(0, m_tree.Redo(Copy("/a")));
    EXPECT_TRUE(m_log.Has("[CRIT] Redo an event not in processing/abort state."));
    EXPECT_EQ("copy /a", Pop());
}

TEST_F(EventPeaTreeTest, DoneLooksAtTheListOfTheEventsKindOnly) {
    m_tree.Push(Create("/a"));
    EXPECT_EQ("create /a", Pop());
    EXPECT_EQ(0, m_tree.Done(Scan("/a")));
    EXPECT_TRUE(m_log.Has("[WARN] Done an event not in processing/abort state."));
    EXPECT_EQ(1, m_tree.Done(Create("/a")));
}

TEST_F(EventPeaTreeTest, DonePrunesUpToTheFirstFolderThatHasMore) {
    m_tree.Push(Copy("/a/b/c/d"));
    m_tree.Push(Copy("/a/x"));
    EXPECT_EQ("copy /a/x", Pop());
    EXPECT_EQ("copy /a/b/c/d", Pop());
    m_tree.Done(Copy("/a/b/c/d"));
    const std::string text = m_tree.ToString();
    EXPECT_EQ(std::string::npos, text.find("* b "));
    EXPECT_NE(std::string::npos, text.find("* a "));
}

TEST_F(EventPeaTreeTest, ClearDropsAllWithoutNotifyingAndTheTreeCanBeUsedAgain) {
    m_tree.Push(Copy("/a/b"));
    m_tree.Push(Scan("/"));
    EXPECT_EQ("scan /", Pop());
    NoteTaker taker;
    m_tree.Attach(&taker);
    m_tree.Clear();
    EXPECT_THAT(taker.notes, IsEmpty());
    EXPECT_TRUE(m_tree.IsEmpty());
    EXPECT_EQ(std::nullopt, Pop());
    m_tree.Push(Copy("/c"));
    EXPECT_EQ("copy /c", Pop());
}

TEST_F(EventPeaTreeTest, TellsObserversInOrderWhatAClearingDoes) {
    m_tree.Push(Copy("/a/b/run"));
    Event event;
    ASSERT_EQ(1, m_tree.Pop(event));
    m_tree.Push(Copy("/a/b/wait"));
    m_tree.Push(Create("/a/c"));
    m_tree.Push(Scan("/a/c"));
    NoteTaker taker;
    m_tree.Attach(&taker);
    m_tree.Push(RemoveDir("/a"));
    using Note = std::pair<int, std::string>;
    EXPECT_THAT(
        taker.notes,
        ElementsAre(Note(NOTIFY_ABORTED, "Event<EV_COPY> (ABORT): [7] /a/b/run (file_op,file)"),
                    Note(NOTIFY_DROPPED, ToString(Copy("/a/b/wait"))),
                    Note(NOTIFY_CLEARED_EMPTY, ToString(Copy("/a/b/wait"))),
                    Note(NOTIFY_DROPPED, ToString(Create("/a/c"))),
                    Note(NOTIFY_LIST_STARTED, ToString(RemoveDir("/a"))),
                    Note(NOTIFY_PUSHED, ToString(RemoveDir("/a")))));
    // The last event of a node: two notes, and the caller's event is told.
    taker.notes.clear();
    Event mine = Copy("/a/b/run/");
    EXPECT_EQ(1, m_tree.Done(mine));
    EXPECT_THAT(taker.notes, ElementsAre(Note(NOTIFY_DONE, ToString(mine)),
                                         Note(NOTIFY_NODE_EMPTIED, ToString(mine))));
    taker.notes.clear();
    EXPECT_EQ("remove /a", Pop());
    EXPECT_EQ(1, m_tree.Redo(RemoveDir("/a")));
    EXPECT_THAT(
        taker.notes,
        ElementsAre(Note(NOTIFY_POPPED, "Event<EV_REMOVE> (PROCESSING): [7] /a (file_op,dir)"),
                    Note(NOTIFY_REDONE, ToString(RemoveDir("/a")))));
}

// An observer that brings another one along in the middle of a round.
TEST_F(EventPeaTreeTest, AnObserverAttachedDuringANoticeHearsIt) {
    struct Bringer : NoteTaker {
        void OnNotify(EventPeaTree* tree, EventTreeNotification what, const Event* event) override {
            NoteTaker::OnNotify(tree, what, event);
            if (notes.size() == 1) tree->Attach(&friend_of_mine);
        }
        NoteTaker friend_of_mine;
    } bringer;
    m_tree.Attach(&bringer);
    m_tree.Push(Copy("/a"));
    EXPECT_EQ(2U, bringer.notes.size());
    EXPECT_EQ(2U, bringer.friend_of_mine.notes.size());
}

TEST_F(EventPeaTreeTest, LogsEachOperationWithTheEvent) {
    m_tree.Push(Copy("/a"));
    Event event;
    ASSERT_EQ(1, m_tree.Pop(event));
    m_tree.Redo(event);
    ASSERT_EQ(1, m_tree.Pop(event));
    m_tree.Done(event);
    const std::string running = "Event<EV_COPY> (PROCESSING): [7] /a (file_op,file)";
    EXPECT_THAT(m_log.Lines(),
                ElementsAre("[INFO] Push event: Event<EV_COPY> (WAITTING): [7] /a (file_op,file)",
                            "[INFO] Pop event: " + running, "[INFO] Redo event: " + running,
                            "[INFO] Pop event: " + running, "[INFO] Done event: " + running));
}

TEST_F(EventPeaTreeTest, DumpsTheTreeToTheLog) {
    m_tree.Push(Create("/a"));
    m_tree.Push(Scan("/a"));
    Event event;
    ASSERT_EQ(1, m_tree.Pop(event));
    m_log.Clear();
    m_tree.Dump();
    EXPECT_THAT(
        m_log.Lines(),
        ElementsAre("[INFO] * / - event count: {file_op: 0, scan: 0, tfile_op: 1, tscan: 1, "
                    "tfile_op_p: 1, tscan_p: 0, tfile_op_nr: 1, tscan_nr: 1}",
                    "[INFO]   * a - event count: {file_op: 1, scan: 1, tfile_op: 1, tscan: 1, "
                    "tfile_op_p: 1, tscan_p: 0, tfile_op_nr: 1, tscan_nr: 1}",
                    "[INFO]       > Event<EV_CREATE> (WAITTING): [7] /a (scan,dir)",
                    "[INFO]       > Event<EV_CREATE> (PROCESSING): [7] /a (file_op,dir)"));
}

}  // namespace
