// Random histories, each step compared with the plainest form of the tree.

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <utility>
#include <vector>

#include "event/event-peatree.h"
#include "event/event-text.h"
#include "naive-event-tree.h"
#include "null-log.h"

namespace {

using Notes = std::vector<std::string>;

class NoteTaker : public EventPeaTree::ObserverType {
public:
    void OnNotify(EventPeaTree*, EventTreeNotification what, const Event* event) override {
        m_notes.push_back(std::to_string(what) + " " + ToString(*event) + " " +
                          std::to_string(event->flags));
    }
    Notes TakeNotes() { return std::exchange(m_notes, {}); }

private:
    Notes m_notes;
};

// What makes one family of histories.
struct Shape {
    const char* name;
    int names;      // different names in a folder
    int max_depth;  // components of a path
    int workers;    // events in work at once
    int steps;
    int histories;
    int push_weight;  // of 100 steps, how many push
};

class History {
public:
    History(const Shape& shape, uint32_t seed) : m_shape(shape), m_random(seed) {
        m_tree.Attach(&m_taker);
    }

    // False, with a failed expectation, at the first step where the two differ.
    bool Run() {
        for (int step = 0; step < m_shape.steps; ++step) {
            Step();
            EXPECT_EQ(m_naive.TakeNotes(), m_taker.TakeNotes()) << m_story;
            EXPECT_EQ(m_naive.Size(), m_tree.Size()) << m_story;
            EXPECT_EQ(m_naive.ScanCount(), m_tree.ScanCount()) << m_story;
            // The whole text at times only: it is what costs the time.
            if (step % 16 == 15 || step + 1 == m_shape.steps) {
                EXPECT_EQ(m_naive.ToString(), m_tree.ToString()) << m_story;
            }
            if (testing::Test::HasFailure()) return false;
        }
        return true;
    }
    int PoppedCount() const { return m_popped; }

private:
    uint32_t Upto(int bound) { return m_random() % static_cast<uint32_t>(bound); }
    bool Chance(int percent) { return Upto(100) < static_cast<uint32_t>(percent); }

    std::string RandomPath() {
        std::string path;
        const uint32_t depth = Upto(m_shape.max_depth + 1);
        for (uint32_t i = 0; i < depth; ++i) {
            path += Chance(2) ? "//" : "/";
            path += "n" + std::to_string(Upto(m_shape.names));
        }
        if (depth == 0 || Chance(2)) path += "/";
        if (Chance(1)) path.erase(0, 1);
        return path;
    }
    Event RandomEvent() {
        Event event;
        event.path = RandomPath();
        event.task_id = Chance(2) ? 8 : 7;
        event.type = static_cast<EventType>(1 + Upto(3));
        if (event.type == EV_REMOVE && Chance(60)) event.type = EV_COPY;
        event.flags = Upto(4);
        if (Chance(1)) event.flags |= Chance(50) ? 0x4U : 0x80000000U;
        return event;
    }
    void Tell(const char* what, const Event& event) {
        m_story += std::string(what) + " " + ToString(event) + "\n";
    }

    void Step() {
        const bool can_pop = m_in_work.size() < static_cast<size_t>(m_shape.workers);
        if (Chance(m_shape.push_weight)) {
            const Event event = RandomEvent();
            Tell("push", event);
            EXPECT_EQ(m_naive.Push(event), m_tree.Push(event));
        } else if (can_pop && Chance(60)) {
            PopBoth();
        } else if (!m_in_work.empty() && !Chance(3)) {
            FinishBoth();
        } else if (Chance(1)) {
            m_story += "clear\n";
            m_naive.Clear();
            m_tree.Clear();
            m_in_work.clear();
        } else {
            // Something that need not be in work, or anywhere.
            const Event event = RandomEvent();
            Tell("wrong", event);
            if (Chance(50)) {
                EXPECT_EQ(m_naive.Done(event), m_tree.Done(event));
            } else {
                EXPECT_EQ(m_naive.Redo(event), m_tree.Redo(event));
            }
        }
    }
    void PopBoth() {
        Event expected;
        Event event;
        const int result = m_naive.Pop(expected);
        EXPECT_EQ(result, m_tree.Pop(event)) << m_story;
        if (result == 0) return;
        Tell("pop", expected);
        EXPECT_EQ(ToString(expected), ToString(event)) << m_story;
        EXPECT_EQ(expected.flags, event.flags) << m_story;
        m_in_work.push_back(event);
        ++m_popped;
    }
    void FinishBoth() {
        const size_t which = Upto(static_cast<int>(m_in_work.size()));
        const Event event = m_in_work[which];
        m_in_work.erase(m_in_work.begin() + static_cast<std::ptrdiff_t>(which));
        if (Chance(15)) {
            Tell("redo", event);
            EXPECT_EQ(m_naive.Redo(event), m_tree.Redo(event));
        } else {
            Tell("done", event);
            EXPECT_EQ(m_naive.Done(event), m_tree.Done(event));
        }
    }

    const Shape m_shape;
    std::mt19937 m_random;
    NaiveEventTree m_naive;
    EventPeaTree m_tree;
    NoteTaker m_taker;
    std::vector<Event> m_in_work;
    std::string m_story;
    int m_popped = 0;
};

class RandomHistories : public testing::TestWithParam<Shape> {
protected:
    NullLog m_null_log;
};

TEST_P(RandomHistories, GiveTheSameAsThePlainestForm) {
    const Shape shape = GetParam();
    int popped = 0;
    for (int i = 0; i < shape.histories; ++i) {
        History history(shape, static_cast<uint32_t>(i) * 7919U + 17U);
        ASSERT_TRUE(history.Run()) << "history " << i;
        popped += history.PoppedCount();
    }
    // The histories are about something.
    EXPECT_GT(popped, shape.histories * shape.steps / 12);
}

INSTANTIATE_TEST_SUITE_P(Shapes, RandomHistories,
                         testing::Values(Shape{"SmallTreesOneWorker", 2, 3, 1, 80, 1000, 45},
                                         Shape{"SmallTreesManyWorkers", 3, 3, 6, 80, 1000, 45},
                                         Shape{"DeepTrees", 2, 9, 4, 112, 200, 50},
                                         Shape{"WideFolders", 40, 2, 5, 240, 150, 50},
                                         Shape{"WideAndDrainedAgain", 25, 3, 3, 400, 100, 38}),
                         [](const auto& shape) { return std::string(shape.param.name); });

}  // namespace
