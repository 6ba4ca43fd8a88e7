// Trees of a depth and width that recursion or a walk for each event would not survive. None of
// these tests looks at a clock: what is quadratic runs into the time limit of the test program.

#include <gtest/gtest.h>

#include <string>

#include "event/event-peatree.h"
#include "null-log.h"

namespace {

Event Copy(const std::string& path) { return {EV_COPY, WAITTING, 7, path, 0}; }

std::string DeepPath(int depth) {
    std::string path;
    for (int i = 0; i < depth; ++i) path += "/d";
    return path;
}

class EventPeaTreeSizeTest : public testing::Test {
protected:
    NullLog m_null_log;
    EventPeaTree m_tree;
};

TEST_F(EventPeaTreeSizeTest, AnEvent100000FoldersDeepIsPushedPoppedAndPruned) {
    const std::string path = DeepPath(100000);
    m_tree.Push(Copy(path));
    Event event;
    ASSERT_EQ(1, m_tree.Pop(event));
    EXPECT_EQ(path, event.path);
    EXPECT_EQ(1, m_tree.Redo(event));
    ASSERT_EQ(1, m_tree.Pop(event));
    EXPECT_EQ(1, m_tree.Done(event));
    EXPECT_TRUE(m_tree.IsEmpty());
}

TEST_F(EventPeaTreeSizeTest, ATree100000FoldersDeepIsCleared) {
    m_tree.Push(Copy(DeepPath(100000)));
    m_tree.Push(Copy(DeepPath(99999) + "/e"));
    m_tree.Clear();
    EXPECT_TRUE(m_tree.IsEmpty());
    m_tree.Push(Copy(DeepPath(100000)));  // and by the destructor
}

TEST_F(EventPeaTreeSizeTest, ARemovalClearsADeepTreeWithAnEventOnEveryLevel) {
    constexpr int kDepth = 4000;
    for (int i = 1; i <= kDepth; ++i) m_tree.Push(Copy(DeepPath(i)));
    m_tree.Push(Copy(DeepPath(100000)));
    EXPECT_EQ(static_cast<size_t>(kDepth) + 1, m_tree.Size());
    m_tree.Push({EV_REMOVE, WAITTING, 7, "/d", EVENT_FLAG_DIR});
    EXPECT_EQ(1U, m_tree.Size());
    Event event;
    ASSERT_EQ(1, m_tree.Pop(event));
    EXPECT_EQ("/d", event.path);
}

TEST_F(EventPeaTreeSizeTest, ADeepTreeIsDumped) {
    constexpr int kDepth = 2500;
    m_tree.Push(Copy(DeepPath(kDepth)));
    m_tree.Dump();
    const std::string text = m_tree.ToString();
    size_t lines = 0;
    for (const char c : text) lines += c == '\n' ? 1 : 0;
    EXPECT_EQ(static_cast<size_t>(kDepth) + 2, lines);
}

TEST_F(EventPeaTreeSizeTest, AFolderWith200000FilesIsWorkedOffInOrder) {
    constexpr int kFiles = 200000;
    for (int i = 0; i < kFiles; ++i) m_tree.Push(Copy("/f/" + std::to_string(i)));
    Event event;
    // The first goes; it moves to the end but has left before its turn comes.
    for (int i = 0; i < kFiles; ++i) {
        ASSERT_EQ(1, m_tree.Pop(event));
        ASSERT_EQ("/f/" + std::to_string(i), event.path);
        ASSERT_EQ(1, m_tree.Done(event));
    }
    EXPECT_TRUE(m_tree.IsEmpty());
}

TEST_F(EventPeaTreeSizeTest, FinishedFoldersDoNotHoldUpTheSearch) {
    constexpr int kFolders = 20000;
    for (int i = 0; i < kFolders; ++i) {
        m_tree.Push(Copy("/" + std::to_string(i) + "/x"));
        m_tree.Push(Copy("/" + std::to_string(i) + "/y"));
    }
    Event event;
    int popped = 0;
    while (m_tree.Pop(event) == 1) {
        ASSERT_EQ(1, m_tree.Done(event));
        ++popped;
    }
    EXPECT_EQ(2 * kFolders, popped);
}

TEST_F(EventPeaTreeSizeTest, ManyBlockedFoldersAreSkipped) {
    constexpr int kFolders = 20000;
    for (int i = 0; i < kFolders; ++i) m_tree.Push(Copy("/" + std::to_string(i)));
    Event event;
    for (int i = 0; i < kFolders; ++i) ASSERT_EQ(1, m_tree.Pop(event));
    for (int i = 0; i < kFolders; ++i) {
        m_tree.Push(Copy("/" + std::to_string(i) + "/below"));
        ASSERT_EQ(0, m_tree.Pop(event));
    }
    m_tree.Push(Copy("/last"));
    ASSERT_EQ(1, m_tree.Pop(event));
    EXPECT_EQ("/last", event.path);
}

TEST_F(EventPeaTreeSizeTest, AListOfManyEventsOnOnePathIsNotWalked) {
    constexpr int kEvents = 100000;
    for (int i = 0; i < kEvents; ++i) {
        m_tree.Push({i % 2 == 0 ? EV_COPY : EV_CREATE, WAITTING, 7, "/a", 0});
    }
    EXPECT_EQ(static_cast<size_t>(kEvents), m_tree.Size());
    Event event;
    for (int i = 0; i < kEvents; ++i) {
        ASSERT_EQ(1, m_tree.Pop(event));
        ASSERT_EQ(i % 2 == 0 ? EV_COPY : EV_CREATE, event.type);
        ASSERT_EQ(1, m_tree.Done(event));
    }
    EXPECT_TRUE(m_tree.IsEmpty());
}

}  // namespace
