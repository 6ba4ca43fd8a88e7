#include "client/log-file.h"

#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>

#include "client/exit-status.h"
#include "db/log-info.h"
#include "fake/fake-keld.h"
#include "platform/global-setting.h"
#include "platform/package-paths.h"
#include "support/temp-dir.h"

namespace {

class LogFileTest : public testing::Test {
protected:
    LogFileTest() {
        m_dir.MakeDir("package/etc");
        SetPackageFolderForTest(m_dir / "package");
        UseVolume("volume1");
    }
    ~LogFileTest() override { SetPackageFolderForTest(""); }

    void UseVolume(const std::string& name) {
        m_path = m_dir.MakeDir(name + "/@Ferrix/db") + "/log-db.sqlite";
        EXPECT_TRUE(SetRepoVolPath(m_dir / name));
    }
    static void AddRow(const std::string& path) {
        LogDB db;
        ASSERT_EQ(0, db.Init(path));
        LogInfo row;
        row.SetTaskId(1);
        ASSERT_EQ(0, row.SetDescription(LogDescription::LOG_DESC_TASK_ADDED, "Camera"));
        row.timestamp = 1;
        ASSERT_EQ(0, db.AddLogInfo(row));
    }
    // As if nothing had been written for so long.
    static void MakeOld(const std::string& path, int hours) {
        std::filesystem::last_write_time(
            path, std::filesystem::file_time_type::clock::now() - std::chrono::hours(hours));
    }
    static uint64_t RowsOf(LogFile& file) {
        LogFilter filter;
        filter.description_ids = {LogDescription::LOG_DESC_TASK_ADDED};
        uint64_t count = 0;
        EXPECT_EQ(0, file.Db().CountLogInfo(filter, count));
        return count;
    }
    static std::string Refusal() {
        try {
            const LogFile file;
        } catch (const CommandError& error) {
            EXPECT_EQ(EXIT_REFUSED, error.Status());
            return error.what();
        }
        return "none";
    }

    FakeKeld& m_fake = FakeKeld::Reset();
    TempDir m_dir;
    std::string m_path;
};

TEST_F(LogFileTest, MissingLogIsRefusedAndNotMade) {
    EXPECT_TRUE(Refusal().starts_with("there is no log yet: " + m_path + " is not there"));
    EXPECT_FALSE(std::filesystem::exists(m_path));
    EXPECT_TRUE(std::filesystem::is_empty(m_dir / "volume1/@Ferrix/db"));
    EXPECT_TRUE(SetRepoVolPath(m_dir / "no-such-volume"));
    EXPECT_TRUE(Refusal().starts_with("there is no log yet: "));
    EXPECT_FALSE(std::filesystem::exists(m_dir / "no-such-volume"));
    EXPECT_TRUE(SetRepoVolPath(""));
    EXPECT_TRUE(
        Refusal().starts_with("there is no log yet: the service has no repository; \"ferrixctl"));
}

TEST_F(LogFileTest, FileThatIsNoLogIsRefused) {
    m_dir.Write("volume1/@Ferrix/db/log-db.sqlite", std::string(5000, 'x'));
    EXPECT_EQ("the log " + m_path + " cannot be opened", Refusal());
    EXPECT_EQ(std::string(5000, 'x'), ReadWholeFile(m_path));
}

TEST_F(LogFileTest, NewRowIsNewsAndAnOldLogIsNot) {
    AddRow(m_path);
    LogFile file;
    EXPECT_EQ(1U, RowsOf(file));
    EXPECT_TRUE(file.HasNews()) << "a row may have come within the same tick of the clock";
    const std::string journal = m_path + "-wal";
    MakeOld(m_path, 2);
    MakeOld(journal, 2);
    EXPECT_TRUE(file.HasNews()) << "the times changed";
    EXPECT_FALSE(file.HasNews());
    EXPECT_FALSE(file.HasNews());
    AddRow(m_path);
    EXPECT_TRUE(file.HasNews());
    EXPECT_EQ(2U, RowsOf(file));
    MakeOld(m_path, 2);
    MakeOld(journal, 2);
    EXPECT_TRUE(file.HasNews());
    MakeOld(journal, 1);
    EXPECT_TRUE(file.HasNews()) << "written to long before this look, but after the last";
    MakeOld(m_path, 1);
    EXPECT_TRUE(file.HasNews());
    EXPECT_FALSE(file.HasNews());
}

TEST_F(LogFileTest, LogThatWasReplacedIsOpenedAnew) {
    AddRow(m_path);
    LogFile file;
    for (const char* suffix : {"", "-wal", "-shm"}) std::filesystem::remove(m_path + suffix);
    EXPECT_FALSE(file.HasNews()) << "none is there, and none is made";
    EXPECT_FALSE(std::filesystem::exists(m_path));
    for (int i = 0; i < 3; ++i) AddRow(m_path);
    EXPECT_TRUE(file.HasNews());
    EXPECT_EQ(3U, RowsOf(file));
}

TEST_F(LogFileTest, RepositoryThatMovesIsFollowed) {
    AddRow(m_path);
    LogFile file;
    UseVolume("volume2");
    EXPECT_FALSE(file.HasNews());
    AddRow(m_path);
    AddRow(m_path);
    EXPECT_TRUE(file.HasNews());
    EXPECT_EQ(2U, RowsOf(file));
}

}  // namespace
