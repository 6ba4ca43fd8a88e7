#include "service/usage-report.h"

#include <json/value.h>

#include <atomic>
#include <memory>
#include <thread>

#include "db/raw-database.h"
#include "db/task-db.h"
#include "platform/json-util.h"
#include "service/repository.h"
#include "service/service-fixture.h"
#include "service/service-lock.h"

namespace fs = std::filesystem;

namespace {

class UsageReportTest : public ServiceTest {
protected:
    UsageReportTest() {
        EXPECT_EQ(0, MakeRepo(m_v1));
        EXPECT_EQ(0, RegisterVolume(m_v1));
    }
    // The text that was printed.
    static std::string Print(int wanted) {
        testing::internal::CaptureStdout();
        EXPECT_EQ(wanted, PrintUsageReport());
        return testing::internal::GetCapturedStdout();
    }

    std::string m_db_path = m_v1 + "/@Ferrix/db/task-db.sqlite";
};

TEST_F(UsageReportTest, DevicesAndTasksAreReportedWithoutTheirNames) {
    TaskDB db;
    ASSERT_EQ(0, db.Init(m_db_path));
    uint64_t first = 0;
    uint64_t second = 0;
    ASSERT_EQ(0, db.AddUSBInfo({0, "uuid-a", true, false, "Maker", "Stick \"1\""}, first));
    ASSERT_EQ(0, db.AddUSBInfo({0, "uuid-b", false, true, "", ""}, second));
    TaskInfo task{0,
                  first,
                  12,
                  true,
                  "secret task",
                  2,
                  "/secret usb",
                  "/secret folder",
                  "secret share",
                  1700000000,
                  3,
                  false,
                  true,
                  true,
                  true,
                  2,
                  true,
                  18,
                  2,
                  -3};
    uint64_t id = 0;
    ASSERT_EQ(0, db.AddTaskInfo(task, id));
    ASSERT_TRUE(SetBeep(true));
    const std::string text = Print(0);
    EXPECT_EQ(std::string::npos, text.find("secret"));
    Json::Value report;
    ASSERT_EQ(0, ParseJson(text, report));
    EXPECT_EQ(report.toStyledString(), text);
    Json::Value wanted;
    ASSERT_EQ(0, ParseJson(R"({"collect_version": 1, "package_version": "0037", "beep": true,
        "collect_data": [
        {"usb_id": 1, "uuid": "uuid-a", "run_when_plug_in": true, "eject_when_task_done": false,
         "producer": "Maker", "product": "Stick \"1\"", "task_info": [
           {"task_type": 2, "is_enable": true, "last_copied_time": 1700000000, "copy_strategy": 3,
            "keep_dir_structure": false, "smart_create_date_dir": true,
            "rename_photo_video": true, "remove_src_file": true, "conflict_policy": 2,
            "enable_rotation": true, "max_version_count": 18, "rotation_policy": 2}]},
        {"usb_id": 2, "uuid": "uuid-b", "run_when_plug_in": false, "eject_when_task_done": true,
         "producer": "", "product": "", "task_info": []}]})",
                           wanted));
    EXPECT_EQ(wanted.toStyledString(), text);
}

TEST_F(UsageReportTest, AnEmptyRepositoryHasAnEmptyReport) {
    TaskDB db;
    ASSERT_EQ(0, db.Init(m_db_path));
    const std::string text = Print(0);
    EXPECT_NE(std::string::npos, text.find("\"collect_data\" : []"));
    EXPECT_NE(std::string::npos, text.find("\"beep\" : false"));
}

// It would count as a repository in use, and the default tasks would never be made.
TEST_F(UsageReportTest, NoDatabaseIsMadeForAReport) {
    EXPECT_EQ("", Print(-1));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to init task db at '" + m_db_path + "'"));
    EXPECT_FALSE(fs::exists(m_db_path));
}

// An upgrade puts another database in place of the one that would be read.
TEST_F(UsageReportTest, AReportWaitsForTheOperationOfAnotherProgram) {
    {
        TaskDB db;
        ASSERT_EQ(0, db.Init(m_db_path));
    }
    auto operation = std::make_unique<ServiceLock>();
    std::atomic<bool> is_printed = false;
    testing::internal::CaptureStdout();
    std::thread report([&] {
        EXPECT_EQ(0, PrintUsageReport());
        is_printed = true;
    });
    LetOtherThreadMeetTheLock();
    EXPECT_FALSE(is_printed);
    operation.reset();
    report.join();
    EXPECT_NE("", testing::internal::GetCapturedStdout());
}

TEST_F(UsageReportTest, RowsThatCannotBeReadAreAFailure) {
    {
        TaskDB db;
        ASSERT_EQ(0, db.Init(m_db_path));
    }
    RawDatabase(m_db_path).Run("ALTER TABLE task_info_table RENAME COLUMN schedule_id TO other;");
    EXPECT_EQ("", Print(-1));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to list all task info"));
    RawDatabase(m_db_path).Run("ALTER TABLE usb_info_table RENAME COLUMN product TO other;");
    EXPECT_EQ("", Print(-1));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to list all usb info"));
    fs::remove(m_db_path);
    m_dir.Write("v1/@Ferrix/db/task-db.sqlite", std::string(5000, 'x'));
    EXPECT_EQ("", Print(-1));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to init task db at '" + m_db_path + "'"));
}

}  // namespace
