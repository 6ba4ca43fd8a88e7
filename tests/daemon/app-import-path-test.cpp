// Where an import may land.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "add-task-fixture.h"
#include "db/task-db.h"

using testing::IsEmpty;

namespace {

class ImportPathTest : public AddTaskTest {};

TEST_F(ImportPathTest, AnImportIntoAShareThatIsNotThereIsRefused) {
    EXPECT_THAT(Add([](PObject& request) { request["hub_share_name"] = "nobody"; }),
                IsError(11, "Failed to resolve import destination path."));
    EXPECT_TRUE(m_log.Has("[ERR] GetHubDirFullPath() failed."));
    EXPECT_THAT(Devices(), IsEmpty());
}

TEST_F(ImportPathTest, AnImportIntoAFolderThatIsNotThereIsRefused) {
    EXPECT_THAT(Add([](PObject& request) { request["hub_folder_path"] = "/missing"; }),
                IsError(10, "Import destination path does not exist."));
    EXPECT_TRUE(m_log.Has("[ERR] Import path does not exist."));
}

TEST_F(ImportPathTest, AnImportNeverLeavesItsShare) {
    AddShare("photos2");
    AddShare("music");
    m_dir.MakeDir("v1/photos/a");
    ASSERT_EQ(0, symlink("/etc", (m_volume + "/photos/out").c_str()));
    ASSERT_EQ(0, symlink("a", (m_volume + "/photos/link").c_str()));
    m_dir.MakeDir("v1/photos/a/b");
    const std::vector<std::pair<std::string, std::string>> hostile = {
        {"photos", "/../music"     },
        {"photos", "/a/../../music"},
        {"photos", "/.."           },
        {"photos", "2"             },
        {"photos", "/out"          },
        {"photos", "/out/cron.d"   },
        {"photos", "/link/b"       },
        {"photos", ".."            },
        {"photos", "/a/.."         },
    };
    for (const auto& [share, folder] : hostile) {
        EXPECT_THAT(Add([&share = share, &folder = folder](PObject& request) {
                        request["hub_share_name"] = share;
                        request["hub_folder_path"] = folder;
                    }),
                    IsError(11, "FSStat import path failed."))
            << folder;
    }
    for (const char* share : {"../v1/photos", "photos/a", "", "/", "photos/../music"}) {
        EXPECT_THAT(Add([share](PObject& request) { request["hub_share_name"] = share; }),
                    IsError(11, "Failed to resolve import destination path."))
            << share;
    }
    EXPECT_THAT(Devices(), IsEmpty());
}

TEST_F(ImportPathTest, ANulByteDoesNotHideAnOverlap) {
    m_dir.MakeDir("v1/photos/a");
    ASSERT_THAT(Add([](PObject& request) { request["hub_folder_path"] = "/a"; }), IsSuccess());
    EXPECT_THAT(
        AddOther("b",
                 [](PObject& request) { request["hub_folder_path"] = std::string("/a\0b", 4); }),
        IsError(9, "Duplicated destination path"));
}

TEST_F(ImportPathTest, FoldersThatOverlapAreRefusedAndOthersAreNot) {
    struct Case {
        const char* first;
        const char* second;
        bool is_free;
    };
    const std::vector<Case> cases = {
        {"/a",   "/a",   false},
        {"/a",   "/a/b", false},
        {"/a/b", "/a",   false},
        {"/a",   "/ab",  true },
        {"/ab",  "/a",   true },
        {"/",    "/a",   false},
        {"/a",   "/",    false},
        {"/a/b", "/a/c", true },
        {"/a/",  "/a/b", false},
        {"/a/b", "//a",  false},
        {"/./a", "/a",   false},
        {"//",   "/a",   false},
        {"/a/",  "/ab",  true },
    };
    for (const char* folder : {"v1/photos/a/b", "v1/photos/a/c", "v1/photos/ab"}) {
        m_dir.MakeDir(folder);
    }
    for (const Case& one : cases) {
        const PObject first =
            Add([&](PObject& request) { request["hub_folder_path"] = one.first; });
        ASSERT_THAT(first, IsSuccess()) << one.first;
        const PObject second =
            AddOther("b", [&](PObject& request) { request["hub_folder_path"] = one.second; });
        if (one.is_free) {
            EXPECT_THAT(second, IsSuccess()) << one.first << " and " << one.second;
            EXPECT_THAT(Send("remove_task", ForTask(second["task_id"].AsUInt64())), IsSuccess());
        } else {
            EXPECT_THAT(second, IsError(9, "Duplicated destination path"))
                << one.first << " and " << one.second;
        }
        EXPECT_THAT(Send("remove_task", ForTask(first["task_id"].AsUInt64())), IsSuccess());
    }
}

TEST_F(ImportPathTest, TheSameFolderOfAnotherShareIsFree) {
    AddShare("music");
    ASSERT_THAT(Add(), IsSuccess());
    EXPECT_THAT(AddOther("b", [](PObject& request) { request["hub_share_name"] = "music"; }),
                IsSuccess());
}

TEST_F(ImportPathTest, ExportsAreExemptOnBothSides) {
    const auto is_export = [](PObject& request) { request["task_type"] = 2; };
    ASSERT_THAT(Add(is_export), IsSuccess());
    EXPECT_THAT(AddOther("b", [](PObject&) {}), IsSuccess());
    EXPECT_THAT(AddOther("c", is_export), IsSuccess());
}

TEST_F(ImportPathTest, ADisabledDefaultTaskDoesNotBlockAPath) {
    const uint64_t default_id = AddDefaultTask(DEFAULT_USB_UUID, false);
    const PObject response = Add();
    ASSERT_THAT(response, IsSuccess());
    ASSERT_THAT(Send("remove_task", ForTask(response["task_id"].AsUInt64())), IsSuccess());
    ASSERT_EQ(0, TaskDB::GetInstance().SetTaskEnable(default_id, true));
    EXPECT_THAT(Add(), IsError(9, "Duplicated destination path"));
}

TEST_F(ImportPathTest, TasksThatCannotBeListedBlockEveryImport) {
    DropTable("task_info_table");
    EXPECT_THAT(Add(), IsError(2, "Failed to list tasks from DB"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to list all task info"));
}

}  // namespace
