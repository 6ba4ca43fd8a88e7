// Incremental tasks come into the registry with their file database, or not at all.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>

#include "command-fixture.h"
#include "daemon/task-folder.h"
#include "db/file-db.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/inc-backup-handler.h"

namespace fs = std::filesystem;

namespace {

class IncrementalLoadTest : public CommandTest {
protected:
    IncrementalLoadTest() {
        AddShare("photos");
        PlugIn("a", "u-1");
        PObject request = AddRequest("a", "u-1");
        request["copy_strategy"] = 3;
        const PObject response = Send("add_task", request);
        EXPECT_THAT(response, IsSuccess());
        m_task_id = response["task_id"].AsUInt64();
        m_path = FileDBPath(m_task_id);
    }
    bool HasFailureLine() const {
        return m_log.Has("[ERR] Failed to initiailize file db for task '" +
                         std::to_string(m_task_id) + "' at '" + m_path + "'.");
    }

    uint64_t m_task_id = 0;
    std::string m_path;
};

TEST_F(IncrementalLoadTest, AnEntryHasItsStrategyAndItsFileDatabase) {
    const TaskRunInfo entry = Entry(m_task_id);
    EXPECT_NE(nullptr, dynamic_cast<IncBackupHandler*>(entry.strategy_handler.get()));
    ASSERT_NE(nullptr, entry.file_db);
    EXPECT_TRUE(fs::exists(m_path));
    EXPECT_TRUE(
        m_log.Has("[INFO] File db is initialized successfully at location '" + m_path + "'"));
    EXPECT_EQ(entry.file_db, Entry(m_task_id).file_db) << "one for all copies of the entry";
}

TEST_F(IncrementalLoadTest, RecordsOutliveTheEntry) {
    const auto records = Entry(m_task_id).file_db;
    ASSERT_EQ(0, records->SetFileInfoBySourcePath({"/d", "/d", FILE_INFO_DIR, 0, 0}));
    int64_t mark = 0;
    ASSERT_EQ(0, records->GetUnprovenMark(mark));
    ASSERT_EQ(0, records->ProveFileInfo(mark));
    ForgetEntries();
    ASSERT_EQ(0, PostMount("a"));
    FileInfo info;
    EXPECT_EQ(1, Entry(m_task_id).file_db->GetFileInfoBySourcePath("/d", info));
}

TEST_F(IncrementalLoadTest, ADatabaseThatIsNoneKeepsTheTaskOut) {
    ForgetEntries();
    fs::remove(m_path + "-wal");
    fs::remove(m_path + "-shm");
    const std::string rubbish(5000, 'x');
    m_dir.Write(m_path.substr(m_dir.Path().size() + 1), rubbish);
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_FALSE(IsLoaded(m_task_id));
    EXPECT_TRUE(HasFailureLine());
    EXPECT_EQ(rubbish, ReadWholeFile(m_path));
}

TEST_F(IncrementalLoadTest, AMissingTaskFolderKeepsTheTaskOut) {
    ForgetEntries();
    fs::remove_all(fs::path(m_path).parent_path());
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_FALSE(IsLoaded(m_task_id));
    EXPECT_TRUE(HasFailureLine());
}

}  // namespace
