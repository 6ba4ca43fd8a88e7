#include "client/log-tail.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <random>

#include "client/exit-status.h"
#include "client/log-fixture.h"
#include "client/log-query.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class LogTailTest : public LogFixture {
protected:
    void Begin() { m_tail.Begin(ReadNewest(m_db, LogQuery::Everything(), LogTail::LongEnough)); }
    void AddFile(const std::string& name, uint32_t time) { Add(FileRow("Camera", name, time)); }
    // Oldest first.
    std::vector<std::string> News(LogDB& db) {
        std::vector<std::string> names;
        for (const LogInfo& row : m_tail.NewRows(db)) {
            names.insert(names.begin(), row.description_param.substr(11));
        }
        return names;
    }
    std::vector<std::string> News() { return News(m_db); }

    LogTail m_tail;
};

TEST_F(LogTailTest, EmptyLogGetsItsFirstRows) {
    Begin();
    EXPECT_THAT(News(), IsEmpty());
    AddFile("a", 1);
    AddFile("b", 2);
    EXPECT_THAT(News(), ElementsAre("a\"]", "b\"]"));
    EXPECT_THAT(News(), IsEmpty());
}

TEST_F(LogTailTest, RowsOfTheSameSecondAreNeitherLostNorDoubled) {
    AddFile("a", 1);
    AddFile("b", 2);
    Begin();
    EXPECT_THAT(News(), IsEmpty());
    AddFile("c", 2);
    EXPECT_THAT(News(), ElementsAre("c\"]"));
    EXPECT_THAT(News(), IsEmpty());
}

TEST_F(LogTailTest, EqualRowsOfTheSameSecondAreCounted) {
    Begin();
    for (size_t round = 1; round < 20; ++round) {
        for (size_t i = 0; i < round; ++i) AddFile("Thumbs.db", 7);
        EXPECT_EQ(round, News().size());
        EXPECT_THAT(News(), IsEmpty());
    }
}

TEST_F(LogTailTest, ClockThatIsSetBackHidesNothing) {
    AddFile("a", 1000);
    AddFile("b", 2000);
    Begin();
    AddFile("c", 50);
    AddFile("d", 60);
    EXPECT_THAT(News(), ElementsAre("c\"]", "d\"]"));
    AddFile("e", 60);
    AddFile("f", 1000);
    EXPECT_THAT(News(), ElementsAre("e\"]", "f\"]"));
    EXPECT_THAT(News(), IsEmpty());
}

TEST_F(LogTailTest, ManyRowsAtOnceAreAllFound) {
    AddFile("a", 1);
    Begin();
    for (uint32_t i = 0; i < 3000; ++i) AddFile("x", 2 + i / 1000);
    EXPECT_EQ(3000U, News().size());
    for (uint32_t i = 0; i < 256; ++i) AddFile("x", 4);
    EXPECT_EQ(256U, News().size()) << "after a second of 1000 equal rows";
}

// A look at the log begins with 256 rows: the last of them looks like the newest that was seen.
TEST_F(LogTailTest, RowThatOnlyLooksLikeASeenOneIsNews) {
    AddFile("x", 3);
    AddFile("x", 4);
    Begin();
    for (uint32_t i = 0; i < 10; ++i) AddFile("x", 4);
    for (uint32_t i = 0; i < 255; ++i) AddFile("x", 5);
    EXPECT_EQ(265U, News().size());
    EXPECT_THAT(News(), IsEmpty());
}

TEST_F(LogTailTest, RowsThatOnlyLookLikeTheWholeSeenLogAreNews) {
    for (uint32_t i = 0; i < 5; ++i) AddFile("x", 4);
    Begin();
    for (uint32_t i = 0; i < 20; ++i) AddFile("x", 4);
    for (uint32_t i = 0; i < 251; ++i) AddFile("x", 5);
    EXPECT_EQ(271U, News().size());
    EXPECT_THAT(News(), IsEmpty());
}

TEST_F(LogTailTest, RowsThatAreRotatedAwayAreNoNews) {
    ASSERT_EQ(0, m_db.SetRotateCount(10));
    for (uint32_t i = 1; i <= 10; ++i) AddFile("a" + std::to_string(i), i);
    Begin();
    AddFile("b", 11);
    EXPECT_THAT(News(), ElementsAre("b\"]"));
    ASSERT_EQ(0, m_db.SetRotateCount(5));
    EXPECT_THAT(News(), IsEmpty());
    for (uint32_t i = 0; i < 4; ++i) AddFile("c", 11);
    EXPECT_EQ(4U, News().size()) << "all but one of what was seen is gone";
    for (uint32_t i = 0; i < 7; ++i) AddFile("d", 12);
    EXPECT_EQ(5U, News().size()) << "the others went before anyone could see them";
    EXPECT_THAT(News(), IsEmpty());
}

TEST_F(LogTailTest, RotationDuringOneSecondIsFollowed) {
    ASSERT_EQ(0, m_db.SetRotateCount(5));
    for (const char* name : {"a", "b", "c", "d", "e"}) AddFile(name, 1);
    Begin();
    AddFile("f", 1);
    AddFile("g", 1);
    EXPECT_THAT(News(), ElementsAre("f\"]", "g\"]"));
    EXPECT_THAT(News(), IsEmpty());
}

TEST_F(LogTailTest, AnotherLogIsAllNewAndACopyIsNot) {
    AddFile("a", 1);
    AddFile("b", 2);
    Begin();
    LogDB other;
    ASSERT_EQ(0, other.Init(m_dir / "other.sqlite"));
    ASSERT_EQ(0, other.AddLogInfo(FileRow("Camera", "a", 1)));
    ASSERT_EQ(0, other.AddLogInfo(FileRow("Camera", "b", 2)));
    EXPECT_THAT(News(other), IsEmpty());
    LogDB fresh;
    ASSERT_EQ(0, fresh.Init(m_dir / "fresh.sqlite"));
    ASSERT_EQ(0, fresh.AddLogInfo(FileRow("Camera", "x", 3)));
    EXPECT_THAT(News(fresh), ElementsAre("x\"]"));
}

TEST_F(LogTailTest, LogThatCannotBeReadIsARefusal) {
    Begin();
    m_db.Close();
    EXPECT_THROW((void)m_tail.NewRows(m_db), CommandError);
}

// Few names and times, so that equal rows abound.
TEST_F(LogTailTest, EveryRowIsToldOnceAtRandom) {
    std::mt19937 random(4711);
    std::vector<std::string> added;
    std::vector<std::string> told;
    uint32_t time = 100;
    Begin();
    for (int round = 0; round < 300; ++round) {
        for (unsigned i = random() % 6; i > 0; --i) {
            if (random() % 3 == 0) ++time;
            const std::string name(1, static_cast<char>('a' + random() % 2));
            AddFile(name, time);
            added.push_back(name + "\"]");
        }
        for (const std::string& name : News()) told.push_back(name);
        ASSERT_EQ(added, told) << "round " << round;
    }
    EXPECT_GT(told.size(), 500U);
}

}  // namespace
