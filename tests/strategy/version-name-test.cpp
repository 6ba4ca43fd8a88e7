#include "strategy/version-name.h"

#include <gtest/gtest.h>

#include <random>

#include "support/temp-dir.h"
#include "version-fixture.h"

namespace {

constexpr int64_t LATE = 4000000000;

std::string NameAt(time_t seconds) {
    std::string name;
    EXPECT_EQ(0, NameVersion(seconds, name));
    return name;
}

int64_t TimeOf(const std::string& name, int64_t now = LATE) {
    const auto parsed = ParseVersionName(name);
    if (!parsed) {
        ADD_FAILURE() << name;
        return -1;
    }
    return VersionTime(*parsed, now);
}

TEST(VersionName, GoodAndBadNamesAreTold) {
    const auto good = ParseVersionName("Ferrix Copy_2024-03-09_141502");
    ASSERT_TRUE(good.has_value());
    EXPECT_FALSE(good->is_bad);
    EXPECT_EQ(124, good->fields.tm_year);
    EXPECT_EQ(2, good->fields.tm_mon);
    EXPECT_EQ(9, good->fields.tm_mday);
    EXPECT_EQ(14, good->fields.tm_hour);
    EXPECT_EQ(15, good->fields.tm_min);
    EXPECT_EQ(2, good->fields.tm_sec);
    const auto bad = ParseVersionName("Ferrix Copy_2024-03-09_141502.Bad");
    ASSERT_TRUE(bad.has_value());
    EXPECT_TRUE(bad->is_bad);
}

TEST(VersionName, TheWholeNameHasToBeATime) {
    for (const char* name : {
             "",
             "Ferrix Copy_",
             "Ferrix Copy_2024-03-09_141502.old",
             "Ferrix Copy_2024-03-09_141502.bad",
             "Ferrix Copy_2024-03-09_141502.Bad.Bad",
             "Ferrix Copy_2024-03-09_141502 ",
             " Ferrix Copy_2024-03-09_141502",
             "Ferrix Copy_2024-03-09_1415021",
             "ferrix copy_2024-03-09_141502",
             "Ferrix Copy_+2024-03-09_141502",
             "Ferrix Copy_2024-13-01_141502",
             "Ferrix Copy_2024-00-10_141502",
             "Ferrix Copy_2024-03-09_241502",
             "Ferrix Copy_2024-03-09_146002",
             "Ferrix Copy_2024-03-09_141502\n",
             "Ferrix Copy_2024-03-09",
         }) {
        EXPECT_FALSE(ParseVersionName(name).has_value()) << name;
    }
    EXPECT_FALSE(ParseVersionName(std::string("Ferrix Copy_2024-03-09_141502\0x", 31)));
    EXPECT_TRUE(ParseVersionName("Ferrix Copy_2024-02-29_000000").has_value());
}

TEST(VersionName, ATimeMayBeWrittenInOtherWays) {
    const TimeZone set("UTC");
    const struct {
        const char* name;
        const char* same;
    } cases[] = {
        {"Ferrix Copy_2024-3-9_141502",       "Ferrix Copy_2024-03-09_141502"},
        {"Ferrix Copy_2024-3-9_141502.Bad",   "Ferrix Copy_2024-03-09_141502"},
        {"FerrixCopy_2024-03-09_141502",      "Ferrix Copy_2024-03-09_141502"},
        {"Ferrix  Copy_ 2024-03-09_141502",   "Ferrix Copy_2024-03-09_141502"},
        {"Ferrix Copy_2024-03-09_14152",      "Ferrix Copy_2024-03-09_141502"},
        {"Ferrix Copy_2024-03-09_ 41502",     "Ferrix Copy_2024-03-09_041502"},
        {"Ferrix Copy_2024-02-31_141502",     "Ferrix Copy_2024-03-02_141502"},
        {"Ferrix Copy_2023-02-29_000000",     "Ferrix Copy_2023-03-01_000000"},
        {"Ferrix Copy_2024-03-09_141560",     "Ferrix Copy_2024-03-09_141600"},
        {"Ferrix Copy_2024-03-09_141561.Bad", "Ferrix Copy_2024-03-09_141601"},
    };
    for (const auto& c : cases) {
        EXPECT_EQ(TimeOf(c.same), TimeOf(c.name)) << c.name;
        const auto parsed = ParseVersionName(c.name);
        ASSERT_TRUE(parsed.has_value()) << c.name;
        EXPECT_EQ(std::string(c.name).ends_with(".Bad"), parsed->is_bad) << c.name;
    }
}

TEST(VersionName, ARunIsNamedByItsLocalStart) {
    const TimeZone set("Europe/Berlin");
    EXPECT_EQ("Ferrix Copy_2024-03-09_141502", NameAt(1709990102));
}

TEST(VersionName, TheTimeIsThatOfTheRunInEveryZone) {
    std::mt19937 random(1);
    for (const char* zone : {"UTC", "Europe/Berlin", "America/New_York", "Australia/Lord_Howe",
                             "Asia/Kolkata", "Pacific/Apia", "America/St_Johns"}) {
        const TimeZone set(zone);
        for (int n = 0; n < 2000; ++n) {
            const time_t start = static_cast<time_t>(random() % 2000000000U + 100000);
            // Just after the run's start an hour that comes twice can only be the first.
            EXPECT_EQ(start, TimeOf(NameAt(start), start)) << zone;
            EXPECT_EQ(start, TimeOf(NameAt(start) + ".Bad", start)) << zone;
        }
    }
}

TEST(VersionName, BothChangesOfSummerTimeAreCrossed) {
    const TimeZone set("Europe/Berlin");
    constexpr time_t SPRING = 1711846800;  // 2024-03-31 01:00 UTC: 02:00 becomes 03:00
    constexpr time_t AUTUMN = 1729990800;  // 2024-10-27 01:00 UTC: 03:00 becomes 02:00
    for (time_t start = SPRING - 7200; start <= SPRING + 7200; start += 300) {
        EXPECT_EQ(start, TimeOf(NameAt(start))) << start;
    }
    for (time_t start = AUTUMN - 7200; start <= AUTUMN + 7200; start += 300) {
        const bool is_first_of_two = start >= AUTUMN - 3600 && start < AUTUMN;
        EXPECT_EQ(start + (is_first_of_two ? 3600 : 0), TimeOf(NameAt(start))) << start;
        EXPECT_EQ(start, TimeOf(NameAt(start), start)) << "the other is still to come";
    }
}

TEST(VersionName, ATimeThatTheClockNeverShowedIsOneForAll) {
    const TimeZone set("Europe/Berlin");
    const int64_t first = TimeOf("Ferrix Copy_2024-03-31_023000");
    // What was asked before must not matter.
    TimeOf("Ferrix Copy_2024-07-01_120000");
    EXPECT_EQ(first, TimeOf("Ferrix Copy_2024-03-31_023000"));
    TimeOf("Ferrix Copy_2024-12-01_120000");
    EXPECT_EQ(first, TimeOf("Ferrix Copy_2024-03-31_023000"));
    EXPECT_EQ(1711848600, first) << "as standard time";
}

TEST(VersionName, ABadVersionGetsAFreeName) {
    const TempDir dir;
    const std::string path = dir / "Ferrix Copy_2024-12-31_235958";
    EXPECT_EQ(path + ".Bad", BadVersionPath(path));
    dir.MakeDir("Ferrix Copy_2024-12-31_235958.Bad");
    EXPECT_EQ(dir / "Ferrix Copy_2024-12-31_235959.Bad", BadVersionPath(path));
    dir.MakeDir("Ferrix Copy_2024-12-31_235959.Bad");
    EXPECT_EQ(dir / "Ferrix Copy_2025-01-01_000000.Bad", BadVersionPath(path));
    const std::string other = dir / "other";
    dir.MakeDir("other.Bad");
    EXPECT_EQ(other + ".Bad", BadVersionPath(other)) << "no name of a version";
}

}  // namespace
