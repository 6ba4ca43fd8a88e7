#include "db/side-files.h"

#include <gtest/gtest.h>

#include <filesystem>

#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace fs = std::filesystem;

namespace {

constexpr const char* SIDE_FILES[] = {"-wal", "-shm", "-journal"};

class SideFilesTest : public testing::Test {
protected:
    void WriteAll() const {
        m_dir.Write("task.db", "x");
        for (const char* part : SIDE_FILES) m_dir.Write("task.db" + std::string(part), "x");
    }

    TempDir m_dir;
    std::string m_path = m_dir / "task.db";
    LogCapture m_log;
};

TEST_F(SideFilesTest, AllOfADatabaseIsRemoved) {
    WriteAll();
    const std::string other = m_dir.Write("task.db-other", "x");
    EXPECT_EQ(0, RemoveDatabase(m_path));
    EXPECT_TRUE(IsMissing(m_path));
    EXPECT_TRUE(IsSingleFile(m_path));
    EXPECT_TRUE(fs::exists(other));
    EXPECT_EQ(0, RemoveDatabase(m_path));
    EXPECT_TRUE(m_log.Lines().empty());
}

TEST_F(SideFilesTest, TheDatabaseCanStay) {
    WriteAll();
    EXPECT_EQ(0, RemoveSideFiles(m_path));
    EXPECT_TRUE(IsSingleFile(m_path));
    EXPECT_EQ("x", ReadWholeFile(m_path));
}

TEST_F(SideFilesTest, WhatCannotBeRemovedIsToldAndTheRestGoes) {
    for (const char* part : {"", "-wal", "-shm", "-journal"}) {
        WriteAll();
        const std::string kept = m_path + part;
        fs::remove(kept);
        fs::create_directory(kept);
        m_log.Clear();
        EXPECT_EQ(-1, RemoveDatabase(m_path)) << part;
        EXPECT_EQ((std::vector<std::string>{"[ERR] '" + kept +
                                            "' cannot be removed: Is a directory (21)"}),
                  m_log.Lines());
        for (const char* other : {"", "-wal", "-shm", "-journal"}) {
            EXPECT_EQ(kept == m_path + other, fs::exists(m_path + other)) << part << other;
        }
        fs::remove(kept);
    }
}

TEST_F(SideFilesTest, ALinkThatLeadsNowhereIsNotNothing) {
    fs::create_symlink("none", m_path + "-journal");
    EXPECT_FALSE(IsMissing(m_path + "-journal"));
    EXPECT_TRUE(HasJournal(m_path));
    EXPECT_FALSE(IsSingleFile(m_path));
    EXPECT_EQ(0, RemoveSideFiles(m_path));
    EXPECT_TRUE(IsSingleFile(m_path));
}

TEST_F(SideFilesTest, WhatCannotBeToldIsNotNothing) {
    const std::string below_a_file = m_dir.Write("file", "x") + "/task.db";
    EXPECT_FALSE(IsMissing(below_a_file));
    EXPECT_FALSE(IsSingleFile(below_a_file));
    EXPECT_EQ(-1, RemoveDatabase(below_a_file));
}

TEST_F(SideFilesTest, AnEmptyPathIsRefused) {
    EXPECT_EQ(-1, RemoveDatabase(""));
    EXPECT_EQ(-1, RemoveSideFiles(""));
}

}  // namespace
