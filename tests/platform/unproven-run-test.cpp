#include "platform/unproven-run.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <ctime>

#include "fake/fake-keld.h"
#include "platform/global-setting.h"
#include "platform/package-paths.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace {

class UnprovenRunTest : public testing::Test {
protected:
    UnprovenRunTest() {
        FakeKeld::Reset();
        m_dir.MakeDir("package/etc");
        m_dir.MakeDir("volume1/@Ferrix/task/7");
        SetPackageFolderForTest(m_dir / "package");
        EXPECT_TRUE(SetRepoVolPath(m_dir / "volume1"));
        m_file = m_dir.Write("volume1/photos/file", "copied just now");
    }
    ~UnprovenRunTest() override { SetPackageFolderForTest(""); }

    std::string RecordPath() const { return m_dir / "volume1/@Ferrix/task/7/unproven-run"; }
    void WriteRecord(const std::string& text) {
        m_dir.Write("volume1/@Ferrix/task/7/unproven-run", text);
    }
    std::string Record() const { return ReadWholeFile(RecordPath()); }
    bool HasRecord() const { return access(RecordPath().c_str(), F_OK) == 0; }
    bool IsUnproven() const { return UnprovenRun(7).IsUnproven(m_file); }
    // A record of a run that began `seconds` from now and was not ended.
    void WriteOpenRecord(int64_t seconds) {
        WriteRecord("0 0 " + std::to_string(time(nullptr) + seconds) + "\n");
    }

    TempDir m_dir;
    LogCapture m_log;
    std::string m_file;
};

TEST_F(UnprovenRunTest, WithoutARecordEverythingIsProven) {
    EXPECT_FALSE(UnprovenRun(7).HasUnproven());
    EXPECT_FALSE(IsUnproven());
}

TEST_F(UnprovenRunTest, AFirstRunPutsItselfOnRecordAndDoubtsNothing) {
    UnprovenRun run(7);
    ASSERT_EQ(0, run.Begin());
    EXPECT_TRUE(HasRecord());
    EXPECT_FALSE(IsUnproven());
}

TEST_F(UnprovenRunTest, AGoodRunLeavesNoRecord) {
    ASSERT_EQ(0, UnprovenRun(7).Begin());
    ASSERT_EQ(0, UnprovenRun(7).End(true));
    EXPECT_FALSE(HasRecord());
    ASSERT_EQ(0, UnprovenRun(7).End(true)) << "ending twice is no failure";
}

TEST_F(UnprovenRunTest, ARunThatDidNotEndMakesItsCopiesUnprovenForTheNext) {
    WriteOpenRecord(-100);
    EXPECT_FALSE(UnprovenRun(7).HasUnproven()) << "until the next run begins";
    ASSERT_EQ(0, UnprovenRun(7).Begin());
    EXPECT_TRUE(UnprovenRun(7).HasUnproven());
}

TEST_F(UnprovenRunTest, WhatTheLastRunCopiedUpToItsEndIsDoubtedByARunThatBeginsAtOnce) {
    WriteRecord("0 0 " + std::to_string(time(nullptr) - 100) + "\n");
    ASSERT_EQ(0, UnprovenRun(7).Begin());
    EXPECT_TRUE(IsUnproven());
}

TEST_F(UnprovenRunTest, TheDateOfAFileDoesNotMatter) {
    WriteRecord("2000 99999999999 99999999999\n");
    const timespec old[2] = {
        {1000, 0},
        {1000, 0}
    };
    ASSERT_EQ(0, utimensat(AT_FDCWD, m_file.c_str(), old, 0));
    EXPECT_TRUE(IsUnproven());
}

TEST_F(UnprovenRunTest, AFileFromOutsideTheUnprovenTimeIsProven) {
    const std::string now = std::to_string(time(nullptr));
    WriteRecord("1 " + std::to_string(time(nullptr) - 1000) + " " + now + "\n");
    EXPECT_FALSE(IsUnproven()) << "made after it";
    WriteRecord(std::to_string(time(nullptr) + 1000) + " 99999999999 " + now + "\n");
    EXPECT_FALSE(IsUnproven()) << "made before it";
    WriteRecord(std::to_string(time(nullptr) - 1000) + " " + std::to_string(time(nullptr) + 1000) +
                " " + now + "\n");
    EXPECT_TRUE(IsUnproven()) << "made in it";
}

TEST_F(UnprovenRunTest, AFileThatCannotBeAskedIsUnproven) {
    WriteRecord("1 2 3\n");
    EXPECT_TRUE(UnprovenRun(7).IsUnproven(m_dir / "volume1/photos/gone"));
}

TEST_F(UnprovenRunTest, ManyRunsWithoutAGoodEndAddUp) {
    WriteRecord("1000 2000 3000\n");
    ASSERT_EQ(0, UnprovenRun(7).Begin());
    long long from = 0;
    long long until = 0;
    long long open = 0;
    ASSERT_EQ(3, sscanf(Record().c_str(), "%lld %lld %lld", &from, &until, &open));
    EXPECT_EQ(1000, from);
    EXPECT_EQ(open + 4, until) << "too wide rather than too narrow, on both sides";
    EXPECT_NEAR(static_cast<double>(time(nullptr)), static_cast<double>(open), 60);
}

TEST_F(UnprovenRunTest, AFinishedRunWithFailedFilesKeepsTheDoubtsAboutEarlierRunsAlone) {
    WriteRecord("1000 2000 3000\n");
    ASSERT_EQ(0, UnprovenRun(7).End(false));
    EXPECT_EQ("1000 2000 0\n", Record());
    ASSERT_EQ(0, UnprovenRun(7).Begin());
    long long from = 0;
    long long until = 0;
    ASSERT_EQ(2, sscanf(Record().c_str(), "%lld %lld", &from, &until));
    EXPECT_EQ(1000, from);
    EXPECT_EQ(2000, until) << "what the finished run copied is proven";
    ASSERT_EQ(0, UnprovenRun(7).End(true));
    EXPECT_FALSE(HasRecord());
}

TEST_F(UnprovenRunTest, AFinishedFirstRunWithFailedFilesLeavesNoDoubts) {
    ASSERT_EQ(0, UnprovenRun(7).Begin());
    ASSERT_EQ(0, UnprovenRun(7).End(false));
    EXPECT_FALSE(HasRecord());
}

TEST_F(UnprovenRunTest, AFlushOfABrokenOffRunProvesWhatCameBeforeIt) {
    WriteOpenRecord(-5000);
    const int64_t flush_start = time(nullptr) + 500;  // after the file was made
    ASSERT_EQ(0, UnprovenRun(7).KeepSince(flush_start));
    EXPECT_EQ("0 0 " + std::to_string(flush_start - 2) + "\n", Record());
}

TEST_F(UnprovenRunTest, AClockThatWasSetBackMakesAllOfTheRunUnproven) {
    WriteOpenRecord(+100000);
    ASSERT_EQ(0, UnprovenRun(7).Begin());
    const std::string later = m_dir.Write("volume1/photos/later", "x");
    UnprovenRun run(7);
    EXPECT_TRUE(run.IsUnproven(m_file));
    EXPECT_TRUE(run.IsUnproven(later));
}

TEST_F(UnprovenRunTest, ARecordThatCannotBeUnderstoodMakesEverythingUnproven) {
    for (const char* text : {"", "1 2\n", "a b c\n", "1 2 3", "1 2 3 4\n", "1 2 x\n"}) {
        WriteRecord(text);
        EXPECT_TRUE(IsUnproven()) << "'" << text << "'";
    }
    unlink(RecordPath().c_str());
    ASSERT_EQ(0, mkdir(RecordPath().c_str(), 0700));
    EXPECT_TRUE(IsUnproven()) << "a folder in its place";
}

TEST_F(UnprovenRunTest, AFolderThatIsNotThereIsReported) {
    UnprovenRun run(8);
    EXPECT_EQ(-1, run.Begin());
    EXPECT_TRUE(m_log.Contains("[ERR] Failed to write the record of unproven copies in '" +
                               m_dir / "volume1/@Ferrix/task/8" + "': No such file or directory"));
    EXPECT_FALSE(UnprovenRun(8).HasUnproven());
}

TEST_F(UnprovenRunTest, TheRecordIsPrivateAndWrittenWhole) {
    ASSERT_EQ(0, UnprovenRun(7).Begin());
    struct stat info {};
    ASSERT_EQ(0, stat(RecordPath().c_str(), &info));
    EXPECT_EQ(0600U, info.st_mode & 0777U);
    EXPECT_NE(0, access((RecordPath() + ".new").c_str(), F_OK));
}

}  // namespace
