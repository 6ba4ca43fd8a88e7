// "set_filter_setting" and "get_filter_setting".
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <map>

#include "command-fixture.h"
#include "filter/file-filter.h"
#include "processor/task-entry-handler.h"

namespace {

constexpr const char* LISTS[] = {"custom_name", "custom_ext", "black_name",
                                 "black_ext",   "white_name", "white_ext"};

class FilterSettingTest : public CommandTest {
protected:
    FilterSettingTest() {
        PlugIn("a", "u-1");
        m_task_id = AddTask("a", "u-1");
        m_log.Clear();
    }
    PObject Setting(const std::map<std::string, std::vector<std::string>>& lists = {}) const {
        PObject request = ForTask(m_task_id);
        for (const char* key : LISTS) request[key] = List({});
        for (const auto& [key, texts] : lists) request[key] = List(texts);
        return request;
    }
    PObject Set(const PObject& request) { return Send("set_filter_setting", request); }
    PObject Get() { return Send("get_filter_setting", ForTask(m_task_id)); }
    std::string File(const std::string& name) const { return TaskFolder(m_task_id) + "/" + name; }
    std::vector<std::string> AllFiles() const {
        return {ReadWholeFile(File("user.config")), ReadWholeFile(File("blacklist.filter")),
                ReadWholeFile(File("whitelist.filter"))};
    }

    uint64_t m_task_id = 0;
};

TEST_F(FilterSettingTest, TheSixListsComeBackInTheirOrder) {
    const PObject request = Setting({
        {"custom_name", {"z", "a", "my file"}                    },
        {"custom_ext",  {"raw"}                                  },
        {"black_name",  {"tmp", "cache", "b", "c", "d", "e", "f"}},
        {"black_ext",   {"iso", "bak"}                           },
        {"white_name",  {"*"}                                    },
        {"white_ext",   {"jpg", "png"}                           }
    });
    EXPECT_EQ("null", Set(request).ToText());
    const PObject response = Get();
    EXPECT_THAT(response, IsSuccess());
    EXPECT_EQ(m_task_id, response["id"].AsUInt64());
    EXPECT_EQ(7u, response.AsMap().size());
    for (const char* key : LISTS) EXPECT_EQ(request[key].ToText(), response[key].ToText()) << key;
}

TEST_F(FilterSettingTest, SixEmptyListsAreValid) {
    EXPECT_EQ("null", Set(Setting()).ToText());
    const PObject response = Get();
    for (const char* key : LISTS) {
        EXPECT_TRUE(response[key].IsArray()) << key;
        EXPECT_TRUE(response[key].IsEmpty()) << key;
    }
    EXPECT_EQ("{\"user_defined_extensions\":[],\"user_defined_names\":[]}\n",
              ReadWholeFile(File("user.config")));
}

TEST_F(FilterSettingTest, TheUsersOwnNamesStandInOneLineOfJson) {
    Set(Setting({
        {"custom_name", {"a \"b\"", "c"}},
        {"custom_ext",  {"raw"}         }
    }));
    EXPECT_EQ(
        "{\"user_defined_extensions\":[\"raw\"],\"user_defined_names\":[\"a \\\"b\\\"\",\"c\"]}\n",
        ReadWholeFile(File("user.config")));
}

TEST_F(FilterSettingTest, NamesOfAnyBytesSurvive) {
    const std::vector<std::string> names = {"new\nline", "quote\"back\\slash", "100%s", "\xff\xfe",
                                            "caf\xc3\xa9"};
    const PObject request = Setting({
        {"custom_name", names},
        {"black_name",  names},
        {"white_name",  names}
    });
    EXPECT_EQ("null", Set(request).ToText());
    const PObject response = Get();
    for (const char* key : {"custom_name", "black_name", "white_name"}) {
        EXPECT_EQ(request[key].ToText(), response[key].ToText()) << key;
    }
}

TEST_F(FilterSettingTest, ARunningTaskSeesTheNewListsAtOnce) {
    const std::shared_ptr<FileFilter> filter = Entry(m_task_id).task_filter;
    EXPECT_EQ(0, filter->Check("/a.iso", false));
    Set(Setting({
        {"black_ext",  {"iso"}},
        {"white_name", {"*"}  },
        {"white_ext",  {"*"}  }
    }));
    EXPECT_NE(0, filter->Check("/a.iso", false));
    EXPECT_EQ(0, filter->Check("/a.jpg", false));
    EXPECT_EQ(filter, Entry(m_task_id).task_filter);
}

TEST_F(FilterSettingTest, TheRunStateOfATaskIsNotTouched) {
    ASSERT_EQ(0, TaskEntryHandler::GetInstance().SetTaskState(m_task_id, TASK_RUN_STATE_RUNNING));
    Set(Setting());
    EXPECT_EQ(TASK_RUN_STATE_RUNNING, Entry(m_task_id).status);
}

TEST_F(FilterSettingTest, AnUnpluggedDeviceTakesTheListsAtItsNextMount) {
    ASSERT_EQ(0, PreUnmount("a"));
    EXPECT_EQ("null", Set(Setting({
                              {"black_ext",  {"iso"}},
                              {"white_name", {"*"}  },
                              {"white_ext",  {"*"}  }
    }))
                          .ToText());
    EXPECT_TRUE(m_log.Has("[INFO] Task '1' does not match"));
    ASSERT_EQ(0, PostMount("a"));
    EXPECT_NE(0, Entry(m_task_id).task_filter->Check("/a.iso", false));
}

TEST_F(FilterSettingTest, WithoutATaskIdBothAreRefused) {
    PObject request = Setting();
    request.AsMap().erase("task_id");
    EXPECT_THAT(Set(request), IsError(1, "Invalid parameter"));
    EXPECT_THAT(Send("get_filter_setting"), IsError(1, "Invalid parameter"));
}

TEST_F(FilterSettingTest, EachOfTheSixKeysIsRequiredAndNothingIsWrittenWithoutIt) {
    const std::vector<std::string> before = AllFiles();
    for (const char* key : LISTS) {
        PObject request = Setting({
            {"black_name",  {"new"}},
            {"custom_name", {"new"}}
        });
        request.AsMap().erase(key);
        EXPECT_THAT(Set(request), IsError(11, "Failed to WriteFilterSetting")) << key;
        EXPECT_EQ(before, AllFiles()) << key;
    }
    EXPECT_TRUE(m_log.Has("[ERR] Invalid parameter"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to WriteFilterSetting for '1'"));
}

TEST_F(FilterSettingTest, AListThatIsNoneIsRefusedAndNothingIsWritten) {
    const std::vector<std::string> before = AllFiles();
    for (const char* key : LISTS) {
        PObject request = Setting({
            {"custom_name", {"new"}}
        });
        request[key] = "iso";
        EXPECT_THAT(Set(request), IsError(11, "Failed to WriteFilterSetting")) << key;
        request[key] = 7;
        EXPECT_THAT(Set(request), IsError(11, "Failed to WriteFilterSetting")) << key;
        EXPECT_EQ(before, AllFiles()) << key;
    }
}

TEST_F(FilterSettingTest, AListThatCouldNotBeReadBackIsRefusedAndNothingIsWritten) {
    const std::vector<std::string> before = AllFiles();
    for (const char* key : {"black_name", "black_ext", "white_name", "white_ext"}) {
        for (const std::string& bad : {std::string(), std::string(100000, 'x')}) {
            PObject request = Setting({
                {"custom_name", {"new"}},
                {"black_name",  {"new"}}
            });
            request[key] = List({"good", bad});
            EXPECT_THAT(Set(request), IsError(11, "Failed to WriteFilterSetting")) << key;
            EXPECT_EQ(before, AllFiles()) << key;
        }
    }
}

TEST_F(FilterSettingTest, AFailureHalfwayLeavesTheEarlierFilesChanged) {
    const std::string black_list = File("blacklist.filter");
    ASSERT_EQ(0, unlink(black_list.c_str()));
    ASSERT_EQ(0, mkdir(black_list.c_str(), 0755));
    EXPECT_THAT(Set(Setting({
                    {"custom_name", {"new"}}
    })),
                IsError(11, "Failed to WriteFilterSetting"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to write black list"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set black list config for task '1'"));
    EXPECT_NE(std::string::npos, ReadWholeFile(File("user.config")).find("new"));
    ASSERT_EQ(0, rmdir(black_list.c_str()));

    const std::string white_list = File("whitelist.filter");
    ASSERT_EQ(0, unlink(white_list.c_str()));
    ASSERT_EQ(0, mkdir(white_list.c_str(), 0755));
    EXPECT_THAT(Set(Setting({
                    {"black_name", {"newer"}}
    })),
                IsError(11, "Failed to WriteFilterSetting"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to write white list"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set white list config for task '1'"));
    EXPECT_NE(std::string::npos, ReadWholeFile(black_list).find("newer"));
}

TEST_F(FilterSettingTest, AnUnknownTaskHasNoFolderToWriteTo) {
    PObject request = Setting();
    request["task_id"] = 99;
    EXPECT_THAT(Set(request), IsError(11, "Failed to WriteFilterSetting"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to open file '" + TaskFolder(99) + "/user.config'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to SetUserConfig for task '99'"));
    EXPECT_THAT(Send("get_filter_setting", ForTask(99)),
                IsError(11, "Failed to ReadFilterSetting"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to ReadFilterSetting for '99'"));
    EXPECT_THAT(Send("get_filter_setting", ForTask(0)), IsError(11, "Failed to ReadFilterSetting"));
    EXPECT_TRUE(m_log.Has("[ERR] Invalid parameter"));
}

TEST_F(FilterSettingTest, APlantedLinkIsReplacedAndNotWrittenThrough) {
    const std::string target = m_dir.Write("elsewhere", "precious");
    for (const char* name : {"user.config", "blacklist.filter", "whitelist.filter"}) {
        ASSERT_EQ(0, unlink(File(name).c_str()));
        ASSERT_EQ(0, symlink(target.c_str(), File(name).c_str()));
    }
    EXPECT_EQ("null", Set(Setting()).ToText());
    EXPECT_EQ("precious", ReadWholeFile(target));
}

// Half a black list would let the next mirror remove what the whole one protected.
TEST_F(FilterSettingTest, AFileThatCannotBeWrittenKeepsItsOldList) {
    const PObject full = Setting({
        {"custom_name", {"mine"}},
        {"black_name",  {"keep"}},
        {"white_name",  {"only"}}
    });
    const std::vector<std::string> files = {"user.config", "blacklist.filter", "whitelist.filter"};
    for (size_t failing = 0; failing < files.size(); ++failing) {
        ASSERT_EQ("null", Set(full).ToText());
        const std::string before = AllFiles()[failing];
        const std::string in_the_way = File(files[failing]) + ".new";
        ASSERT_EQ(0, mkdir(in_the_way.c_str(), 0755));
        EXPECT_THAT(Set(Setting()), IsError(11, "Failed to WriteFilterSetting")) << files[failing];
        ASSERT_EQ(0, rmdir(in_the_way.c_str()));
        EXPECT_EQ(before, AllFiles()[failing]) << files[failing];
    }
}

TEST_F(FilterSettingTest, AnEntryWithoutAFilterIsAnError) {
    TaskRunInfo entry = Entry(m_task_id);
    entry.task_filter = nullptr;
    TaskEntryHandler::GetInstance().AddTaskEntry(entry);
    EXPECT_THAT(Set(Setting()), IsError(11, "Failed to set filter setting"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set filter setting for task '1'."));
}

TEST_F(FilterSettingTest, AListThatCannotBeLoadedAgainIsAnError) {
    for (const char* which : {"black", "white"}) {
        // The file goes between its writing and its loading: three paths are made for the writing,
        // the fourth and the fifth for the loading.
        const std::string file = File(std::string(which) + "list.filter");
        const int load = which == std::string("black") ? 4 : 5;
        int calls = 0;
        m_fake.OnCall("KLIBCFileGetKeyValue", [&calls, &file, load] {
            if (++calls != load) return;
            ASSERT_EQ(0, unlink(file.c_str()));
        });
        EXPECT_THAT(Set(Setting()), IsError(11, std::string("Failed to load ") + which + " list"));
        EXPECT_TRUE(
            m_log.Has(std::string("[ERR] Failed to load ") + which + " list at '" + file + "'"));
        m_fake.OnCall("KLIBCFileGetKeyValue", {});
        ASSERT_EQ("null", Set(Setting()).ToText());
    }
}

TEST_F(FilterSettingTest, AMissingFileIsAFailureAndNotEmpty) {
    const std::map<std::string, std::string> lines = {
        {"user.config",      "[ERR] Failed to open file '" + File("user.config") + "'"},
        {"blacklist.filter", "[ERR] Failed to read black list"                        },
        {"whitelist.filter", "[ERR] Failed to read white list"                        },
    };
    for (const auto& [name, line] : lines) {
        ASSERT_EQ(0, rename(File(name).c_str(), File(name + ".away").c_str()));
        EXPECT_THAT(Get(), IsError(11, "Failed to ReadFilterSetting")) << name;
        EXPECT_TRUE(m_log.Has(line)) << name;
        ASSERT_EQ(0, rename(File(name + ".away").c_str(), File(name).c_str()));
    }
    EXPECT_THAT(Get(), IsSuccess());
}

TEST_F(FilterSettingTest, WhatIsNoTextInTheUsersListsIsSkipped) {
    m_dir.Write(
        "v1/@Ferrix/task/1/user.config",
        R"({"user_defined_names":["a",7,"b",null,["c"]],"user_defined_extensions":{"x":1}})");
    const PObject response = Get();
    EXPECT_EQ("[\"a\", \"b\"]", response["custom_name"].ToText());
    EXPECT_EQ("[]", response["custom_ext"].ToText());
}

TEST_F(FilterSettingTest, AUserConfigThatIsNoJsonIsAFailure) {
    for (const std::string& text : {std::string("{broken"), std::string(), std::string(200000, '['),
                                    std::string("\0\0\0", 3)}) {
        m_dir.Write("v1/@Ferrix/task/1/user.config", text);
        EXPECT_THAT(Get(), IsError(11, "Failed to ReadFilterSetting"));
    }
    EXPECT_TRUE(m_log.Has("[ERR] Failed to parse user config '" + File("user.config") + "'"));
    for (const std::string& text : {std::string("[]"), std::string("7"), std::string("{}")}) {
        m_dir.Write("v1/@Ferrix/task/1/user.config", text);
        EXPECT_EQ("[]", Get()["custom_name"].ToText()) << text;
    }
}

}  // namespace
