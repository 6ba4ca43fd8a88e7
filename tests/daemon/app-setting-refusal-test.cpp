// "set_task_setting" and "get_task_setting": what is refused, and values of every kind and range.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <tuple>

#include "db/task-db.h"
#include "setting-fixture.h"

using testing::IsEmpty;

namespace {

class SettingRefusalTest : public SettingTest {};

// --- Refusals

TEST_F(SettingRefusalTest, WithoutATaskIdBothAreRefused) {
    EXPECT_THAT(Set(PObject()), IsError(1, "Invalid parameter"));
    EXPECT_THAT(Send("get_task_setting"), IsError(1, "Invalid parameter"));
    EXPECT_EQ(2, m_log.Count("[ERR] Invalid parameter"));
}

TEST_F(SettingRefusalTest, AnUnknownTaskIsRefused) {
    PObject request = Import({});
    request["task_id"] = 99;
    request["hub_folder_path"] = "/";
    request["task_type"] = 2;
    EXPECT_THAT(Set(request), IsError(6, "Task id does not exist"));
    EXPECT_THAT(Send("get_task_setting", ForTask(99)), IsError(6, "Task id does not exist"));
    EXPECT_THAT(Send("get_task_setting", ForTask(0)), IsError(6, "Task id does not exist"));
}

TEST_F(SettingRefusalTest, ADestinationThatCannotBeUsedIsRefusedAndNothingIsWritten) {
    PlugIn("b", "u-2");
    ASSERT_THAT(Set(Import({
                    {"hub_folder_path", "/in"}
    })),
                IsSuccess());
    PObject other = AddRequest("b", "u-2");
    other["hub_folder_path"] = "/other";
    ASSERT_THAT(Send("add_task", other), IsSuccess());
    const TaskInfo before = Task(m_task_id);
    const std::vector<std::tuple<std::string, std::string, int, std::string>> cases = {
        {"photos",  "/other",   9,  "Duplicated destination path"               },
        {"photos",  "/",        9,  "Duplicated destination path"               },
        {"photos",  "/missing", 10, "Import destination path does not exist."   },
        {"photos",  "/../etc",  11, "FSStat import path failed."                },
        {"photos",  "in",       11, "FSStat import path failed."                },
        {"nowhere", "/",        11, "Failed to resolve import destination path."},
        {"../etc",  "/",        11, "Failed to resolve import destination path."},
    };
    for (const auto& [share, folder, code, text] : cases) {
        EXPECT_THAT(
            Set(Import({
                {"task_name",       "New" },
                {"hub_share_name",  share },
                {"hub_folder_path", folder}
        })),
            IsError(code, text))
            << share << folder;
    }
    EXPECT_EQ(before, Task(m_task_id));
}

TEST_F(SettingRefusalTest, ATaskIsNotInItsOwnWay) {
    EXPECT_THAT(Set(Import({
                    {"hub_folder_path", "/in"}
    })),
                IsSuccess());
    EXPECT_THAT(Set(Import({
                    {"hub_folder_path", "/in/deep"}
    })),
                IsSuccess());
    EXPECT_EQ("/in/deep", Task(m_task_id).hub_folder_path);
}

// The kind of the request decides whether the destination is checked, that of the row what is
// changed: neither may lead out of the share or the device.
TEST_F(SettingRefusalTest, AFolderThatLeadsOutIsRefusedWhateverKindIsSent) {
    const uint64_t export_id = AddExport();
    const TaskInfo before = Task(m_task_id);
    const TaskInfo export_before = Task(export_id);
    for (const char* folder : {"/../../etc", "/in/..", "..", "in"}) {
        EXPECT_THAT(Set(Export(m_task_id,
                               {
                                   {"hub_folder_path", folder},
                                   {"task_name",       "New" }
        })),
                    IsError(1, "Invalid parameter"))
            << folder;
        EXPECT_THAT(Set(Export(export_id,
                               {
                                   {"usb_folder_path", folder},
                                   {"task_name",       "New" }
        })),
                    IsError(1, "Invalid parameter"))
            << folder;
    }
    EXPECT_EQ(before, Task(m_task_id));
    EXPECT_EQ(export_before, Task(export_id));
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_TASK_RENAMED));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set task info for task '1'"));
}

TEST_F(SettingRefusalTest, ATextEndsAtItsFirstNul) {
    const uint64_t export_id = AddExport();
    EXPECT_THAT(Set(Export(export_id,
                           {
                               {"usb_folder_path", std::string("/in\0/../..", 10)},
                               {"task_name",       std::string("My\0task",    7) }
    })),
                IsSuccess());
    EXPECT_EQ("/in", Task(export_id).usb_folder_path);
    EXPECT_EQ("My", Task(export_id).task_name);
    EXPECT_EQ(MountPath("x") + "/in", Entry(export_id).dst_dir_path);
    EXPECT_THAT(Set(Export(export_id,
                           {
                               {"task_name", std::string("\0x", 2)}
    })),
                IsSuccess());
    EXPECT_EQ("My", Task(export_id).task_name);
}

// --- Values of other kinds and ranges

TEST_F(SettingRefusalTest, AValueOfAnotherKindIsReadByTheRuleOfItsKey) {
    PObject map;
    map["x"] = 1;
    TaskInfo expected = Task(m_task_id);
    // A number gives its digits as a text; a map, a list and nothing give no text.
    EXPECT_THAT(Set(Import({
                    {"task_name", 42}
    })),
                IsSuccess());
    expected.task_name = "42";
    EXPECT_EQ(expected, Task(m_task_id));
    for (const PObject& value : {map, List({"x"}), PObject()}) {
        EXPECT_THAT(Set(Import({
                        {"task_name", value}
        })),
                    IsSuccess());
        EXPECT_EQ(expected, Task(m_task_id)) << value.ToText();
    }
    // What is no number is 0 as one, and what is not empty is true as a flag.
    for (const PObject& value : {PObject("7"), map, List({"x"})}) {
        EXPECT_THAT(Set(Import({
                        {"conflict_policy",       value},
                        {"rotation_policy",       value},
                        {"max_version_count",     value},
                        {"smart_create_date_dir", value}
        })),
                    IsSuccess());
        expected.conflict_policy = 0;
        expected.rotation_policy = 0;
        expected.max_version_count = 0;
        expected.smart_create_date_dir = true;
        EXPECT_EQ(expected, Task(m_task_id)) << value.ToText();
    }
    EXPECT_THAT(Set(Import({
                    {"smart_create_date_dir", PObject()}
    })),
                IsSuccess());
    expected.smart_create_date_dir = false;
    EXPECT_EQ(expected, Task(m_task_id));
}

TEST_F(SettingRefusalTest, AShareOrFolderThatIsNoTextIsNone) {
    const TaskInfo before = Task(m_task_id);
    EXPECT_THAT(Set(Import({
                    {"hub_share_name", List({"photos"})}
    })),
                IsError(11, "Failed to resolve import destination path."));
    EXPECT_THAT(Set(Import({
                    {"hub_folder_path", 7}
    })),
                IsError(11, "FSStat import path failed."));
    EXPECT_THAT(Set(Import({
                    {"hub_folder_path", List({"/in"})}
    })),
                IsSuccess());
    EXPECT_EQ(before, Task(m_task_id));
}

TEST_F(SettingRefusalTest, NumbersOutOfRangeAreStoredAsFarAsTheColumnGoes) {
    const std::vector<std::pair<PObject, int>> numbers = {
        {PObject(-1),              -1       },
        {PObject(INT32_MIN),       INT32_MIN},
        {PObject(INT32_MAX),       INT32_MAX},
        {PObject((1LL << 32) + 5), 5        }, // the low 32 bits
    };
    for (const auto& [sent, stored] : numbers) {
        EXPECT_THAT(Set(Import({
                        {"conflict_policy", sent},
                        {"rotation_policy", sent}
        })),
                    IsSuccess());
        EXPECT_EQ(stored, Task(m_task_id).conflict_policy);
        EXPECT_EQ(stored, Task(m_task_id).rotation_policy);
    }
    for (const uint64_t count : {uint64_t{0}, uint64_t{1}, uint64_t{INT64_MAX}, UINT64_MAX}) {
        EXPECT_THAT(Set(Import({
                        {"max_version_count", count}
        })),
                    IsSuccess());
        EXPECT_EQ(std::min<uint64_t>(count, INT64_MAX), Task(m_task_id).max_version_count);
    }
}

TEST_F(SettingRefusalTest, ARequestThatIsNoMapIsRefused) {
    for (const PObject& request : {PObject("text"), PObject(7), List({"task_id"}), PObject()}) {
        EXPECT_THAT(Set(request), IsError(1, "Invalid parameter"));
    }
}

}  // namespace
