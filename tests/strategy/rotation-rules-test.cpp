#include "strategy/rotation-rules.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <limits>
#include <random>

#include "naive-rotation.h"
#include "support/log-capture.h"
#include "utils/error-code.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr uint32_t NOW = 1700000000;
constexpr uint32_t HOUR = 3600;
constexpr uint32_t DAY = 86400;
constexpr uint32_t WEEK = 7 * DAY;
constexpr uint64_t MANY = 1000;

VersionInfo Version(const std::string& path, uint32_t age, bool is_bad = false,
                    uint32_t now = NOW) {
    VersionInfo version;
    version.path = path;
    version.timestamp = now - age;
    version.is_bad = is_bad;
    return version;
}

class RotationRulesTest : public testing::Test {
protected:
    // The paths that go under the policy, in their order.
    std::vector<std::string> Rotate(std::vector<VersionInfo>& versions, uint64_t max_count,
                                    int policy, uint32_t now = NOW) {
        const RotationRules rules(now, 7, max_count, &m_abort);
        std::vector<std::string> removed;
        if (versions.size() <= max_count) return removed;
        if (policy == 1) {
            rules.OldestRotation(versions);
        } else {
            EXPECT_EQ(0, rules.ConditionalMark(versions));
        }
        EXPECT_EQ(0, rules.DeleteVersionList(versions, [&](const VersionInfo& version) {
            removed.push_back(version.path);
            return 0;
        }));
        return removed;
    }
    std::vector<std::string> Reserved(std::vector<VersionInfo> versions, uint64_t max_count = MANY,
                                      uint32_t now = NOW) {
        EXPECT_EQ(0, RotationRules(now, 7, max_count, &m_abort).ConditionalMark(versions));
        std::vector<std::string> paths;
        for (const VersionInfo& version : versions) {
            if (version.reserve) paths.push_back(version.path);
        }
        return paths;
    }

    LogCapture m_log;
    std::atomic<int> m_abort{0};
};

// --- Oldest first ---

TEST_F(RotationRulesTest, TheOldestGoUntilTheCountIsReached) {
    std::vector<VersionInfo> versions = {Version("5", 1), Version("4", 2), Version("3", 3),
                                         Version("2", 4), Version("1", 5)};
    EXPECT_THAT(Rotate(versions, 3, 1), ElementsAre("1", "2"));
    EXPECT_TRUE(m_log.Has("[INFO] OldestRotation: count = '3', max_version_count = '3'"));
}

TEST_F(RotationRulesTest, BadVersionsGoBeforeGoodOnesAndAreNotCountedAsKept) {
    std::vector<VersionInfo> versions = {Version("5", 1), Version("4", 2, true), Version("3", 3),
                                         Version("2", 4, true), Version("1", 5)};
    EXPECT_THAT(Rotate(versions, 4, 1), ElementsAre("2"));
    versions.erase(versions.begin() + 3);
    for (VersionInfo& version : versions) version.reserve = false;
    EXPECT_THAT(Rotate(versions, 3, 1), ElementsAre("4"));
}

TEST_F(RotationRulesTest, WithACountOfOneOnlyTheNewestStaysEvenABadOne) {
    for (const int policy : {1, 2}) {
        std::vector<VersionInfo> versions = {Version("3", 1, true), Version("2", 2),
                                             Version("1", 3)};
        EXPECT_THAT(Rotate(versions, 1, policy), ElementsAre("1", "2"));
    }
}

TEST_F(RotationRulesTest, WithACountOfZeroTheNewestStaysUnderBothPolicies) {
    for (const int policy : {1, 2}) {
        std::vector<VersionInfo> versions = {Version("3", 1), Version("2", 2 * HOUR),
                                             Version("1", WEEK)};
        EXPECT_THAT(Rotate(versions, 0, policy), ElementsAre("1", "2"));
        std::vector<VersionInfo> one = {Version("1", 1)};
        EXPECT_THAT(Rotate(one, 0, policy), IsEmpty());
    }
}

TEST_F(RotationRulesTest, AnEmptyListIsReportedAndNothingMore) {
    std::vector<VersionInfo> none;
    const RotationRules rules(NOW, 7, 3, &m_abort);
    rules.OldestRotation(none);
    EXPECT_EQ(0, rules.ConditionalMark(none));
    EXPECT_THAT(m_log.Lines(), ElementsAre("[INFO] version info list is empty for task '7'",
                                           "[INFO] version info list is empty for task '7'"));
    EXPECT_EQ(0, rules.DeleteVersionList(none, nullptr));
}

// --- A spread over time ---

TEST_F(RotationRulesTest, OfEachHourOfTheLastDayTheOldestStays) {
    // Slots are hours back from now.
    EXPECT_THAT(
        Reserved({Version("now", 10), Version("a", 20), Version("b", HOUR - 1), Version("c", HOUR),
                  Version("d", 2 * HOUR - 1), Version("e", 2 * HOUR), Version("f", 9 * HOUR)}),
        ElementsAre("now", "b", "d", "e", "f"));
}

TEST_F(RotationRulesTest, OfEachDayOfThirtyAndOfEachWeekBeforeTheOldestStays) {
    EXPECT_THAT(Reserved({Version("now", 0), Version("d1", 2 * DAY), Version("d1b", 2 * DAY + HOUR),
                          Version("d2", 3 * DAY), Version("w", 40 * DAY), Version("w2", 41 * DAY),
                          Version("x", 60 * DAY)}),
                ElementsAre("now", "d1b", "d2", "w2", "x"));
}

TEST_F(RotationRulesTest, AVersionJustInsideARangeIsInIt) {
    // Two of one hour at the border of the last day; the older belongs to it or not by a second.
    EXPECT_THAT(Reserved({Version("now", 0), Version("a", DAY - 1), Version("border", DAY)}),
                ElementsAre("now", "a", "border"));
    EXPECT_THAT(Reserved({Version("now", 0), Version("a", DAY), Version("b", DAY + 1),
                          Version("c", 2 * DAY - 1)}),
                ElementsAre("now", "a", "c"))
        << "'a' is just inside the last day, 'b' is not";
}

TEST_F(RotationRulesTest, ABadVersionTakesThePlaceOfItsHourAndIsNotKept) {
    EXPECT_THAT(Reserved({Version("now", 0), Version("good", 2 * HOUR),
                          Version("bad", 2 * HOUR + 1, true), Version("old", 3 * HOUR)}),
                ElementsAre("now", "old"))
        << "and yet 'good' may stay by the rule for days";
    EXPECT_THAT(Reserved({Version("now", 0), Version("bad", 2 * HOUR, true),
                          Version("good", 2 * HOUR + 1), Version("old", 3 * HOUR)}),
                ElementsAre("now", "good", "old"));
}

TEST_F(RotationRulesTest, TheNewestOfTheReservedStayUpToTheCount) {
    EXPECT_THAT(Reserved({Version("a", 0), Version("b", 2 * HOUR), Version("c", 3 * HOUR),
                          Version("d", 4 * HOUR)},
                         2),
                ElementsAre("a", "b"));
    EXPECT_TRUE(m_log.Has("[INFO] reserve_count = '3', max_version_count = '2'"));
    EXPECT_TRUE(m_log.Has("[INFO] vinfo path = 'c', reserve = '0'"));
    EXPECT_TRUE(m_log.Has("[INFO] ConditionalMark '86400', '3600', '1', '1700000000'"));
    EXPECT_TRUE(m_log.Has("[INFO] ConditionalMark '1700000000', '604800', '1', '1700000000'"));
}

TEST_F(RotationRulesTest, MoreThanTheCountStaysOnlyWhileItIsReserved) {
    // All four may stay, by hours; the limit leaves two, and the others go, the oldest first.
    std::vector<VersionInfo> versions = {Version("a", 0), Version("b", 2 * HOUR),
                                         Version("c", 3 * HOUR), Version("d", 4 * HOUR)};
    EXPECT_THAT(Rotate(versions, 2, 2), ElementsAre("d", "c"));
    const RotationRules rules(NOW, 7, 2, &m_abort);
    for (VersionInfo& version : versions) version.reserve = true;
    EXPECT_EQ(0, rules.DeleteVersionList(versions, nullptr)) << "reserved ones are never removed";
}

TEST_F(RotationRulesTest, TimesAreUnsignedAndWrapSoonAfter1970) {
    // In the first day after 1970 the border of the day lies far in the future: only the rule for
    // all time, whose border is 0, marks anything.
    EXPECT_THAT(Reserved({Version("c", 100, false, 50000), Version("b", HOUR * 3, false, 50000),
                          Version("a", HOUR * 4, false, 50000)},
                         MANY, 50000),
                ElementsAre("c", "a"));
}

// --- Removal ---

TEST_F(RotationRulesTest, AFailedRemovalEndsItWithItsResult) {
    const std::vector<VersionInfo> versions = {Version("3", 1), Version("2", 2), Version("1", 3)};
    std::vector<std::string> tried;
    const RotationRules rules(NOW, 7, 0, &m_abort);
    EXPECT_EQ(ERR_FILE_OPERATION,
              rules.DeleteVersionList(versions, [&](const VersionInfo& version) {
                  tried.push_back(version.path);
                  return version.path == "2" ? ERR_FILE_OPERATION : ERR_SUCCESS;
              }));
    EXPECT_THAT(tried, ElementsAre("1", "2"));
    EXPECT_TRUE(m_log.Has("[ERR] faile to DeleteVersionList '2'"));
}

TEST_F(RotationRulesTest, AnAbortIsNoticedBetweenVersions) {
    std::vector<VersionInfo> versions = {Version("4", 1), Version("3", 2, true),
                                         Version("2", 2, true), Version("1", 3)};
    const RotationRules rules(NOW, 7, 0, &m_abort);
    for (const char* const last : {"2", "3", "1"}) {
        m_abort = 0;
        m_log.Clear();
        std::string removed;
        EXPECT_EQ(ERR_INTERRUPTED, rules.DeleteVersionList(versions, [&](const VersionInfo& gone) {
            removed = gone.path;
            if (removed == last) m_abort = 1;
            return 0;
        }));
        EXPECT_EQ(last, removed);
        EXPECT_TRUE(m_log.Has("[WARN] DeleteVersionList: user stopped"));
    }
    EXPECT_EQ(ERR_INTERRUPTED, rules.ConditionalMark(versions));
    EXPECT_TRUE(m_log.Has("[WARN] ConditionalMark: user stopped"));
}

TEST_F(RotationRulesTest, WithoutAnAbortFlagNothingIsAborted) {
    std::vector<VersionInfo> versions = {Version("2", 1), Version("1", 2)};
    const RotationRules rules(NOW, 7, 1, nullptr);
    EXPECT_EQ(0, rules.ConditionalMark(versions));
    int removed = 0;
    EXPECT_EQ(0, rules.DeleteVersionList(versions, [&](const VersionInfo&) { return removed++; }));
    EXPECT_EQ(1, removed);
}

// --- The rules twice ---

// Ages that lie on, just before and just behind every border, and anywhere else.
uint32_t RandomAge(std::mt19937& random, uint32_t now) {
    const uint32_t borders[] = {0, HOUR, DAY, 30 * DAY, WEEK};
    uint32_t age = borders[random() % std::size(borders)];
    switch (random() % 4) {
        case 0:
            age *= random() % 12;
            break;
        case 1:
            age = random() % (2 * DAY);
            break;
        case 2:
            age = random() % (60 * DAY);
            break;
        default:
            age = random() % (400 * DAY);
            break;
    }
    age += random() % 3 - 1;
    return age > now ? now : age;
}

std::vector<VersionInfo> RandomHistory(std::mt19937& random, uint32_t now) {
    std::vector<VersionInfo> versions;
    const size_t count = random() % 40;
    const unsigned bad_of_ten = random() % 8;
    for (size_t n = 0; n < count; ++n) {
        const uint32_t age = !versions.empty() && random() % 6 == 0
                                 ? now - versions.back().timestamp  // equal times
                                 : RandomAge(random, now);
        versions.push_back(Version(std::to_string(n), age, random() % 10 < bad_of_ten, now));
    }
    std::stable_sort(versions.begin(), versions.end(), [](const auto& left, const auto& right) {
        return left.timestamp > right.timestamp;
    });
    return versions;
}

TEST_F(RotationRulesTest, ThousandsOfHistoriesAgreeWithTheRulesWrittenDownNaively) {
    std::mt19937 random(20240309);
    const uint64_t counts[] = {0, 1, 2, 3, 5, 8, 20, std::numeric_limits<uint64_t>::max()};
    const uint32_t nows[] = {NOW, 5000, DAY, DAY + 1, 31 * DAY, 4294967295U};
    int removals = 0;
    for (int n = 0; n < 6000; ++n) {
        const uint32_t now = random() % 3 == 0 ? nows[random() % std::size(nows)] : NOW;
        const uint64_t max_count = counts[random() % std::size(counts)];
        const int policy = random() % 3 == 0 ? 1 : 2;
        std::vector<VersionInfo> versions = RandomHistory(random, now);
        const auto expected = NaiveRotation(versions, now, max_count, policy);
        const auto removed = Rotate(versions, max_count, policy, now);
        ASSERT_EQ(expected, removed) << "history " << n << " policy " << policy;
        if (!versions.empty()) {
            ASSERT_EQ(0, std::count(removed.begin(), removed.end(), versions.front().path));
        }
        removals += static_cast<int>(removed.size());
        if (n % 50 == 0) m_log.Clear();
    }
    EXPECT_GT(removals, 20000) << "else it says nothing";
}

}  // namespace
