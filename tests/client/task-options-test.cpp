#include "client/task-options.h"

#include <gtest/gtest.h>

#include "client/exit-status.h"
#include "db/task-info.h"
#include "ipc/pobject.h"

namespace {

TaskOptions Options(const std::vector<std::string>& words) {
    CLI::App app;
    TaskOptions options;
    AddTaskOptions(app, options);
    app.parse(std::vector<std::string>(words.rbegin(), words.rend()));
    return options;
}

PObject Parsed(const std::vector<std::string>& words) {
    PObject request;
    SetTaskKeys(Options(words), request);
    return request;
}

// The strategies that the options are refused for, one digit each.
std::string Refusing(const std::vector<std::string>& words) {
    std::string strategies;
    for (const int strategy :
         {COPY_STRATEGY_VERSION, COPY_STRATEGY_MIRROR, COPY_STRATEGY_INCREMENTAL}) {
        try {
            CheckStrategy(Options(words), strategy);
        } catch (const CommandError& error) {
            EXPECT_EQ(EXIT_USAGE, error.Status());
            strategies += std::to_string(strategy);
        }
    }
    return strategies;
}

}  // namespace

TEST(TaskOptionsTest, NothingSaidSetsNothing) { EXPECT_TRUE(Parsed({}).IsNull()); }

TEST(TaskOptionsTest, EachOptionSetsItsKeys) {
    EXPECT_EQ("Camera", Parsed({"--name", "Camera"})["task_name"].AsString());
    EXPECT_EQ(1, Parsed({"--conflict", "rename"})["conflict_policy"].AsInt32());
    EXPECT_EQ(2, Parsed({"--conflict", "overwrite"})["conflict_policy"].AsInt32());
    EXPECT_EQ(1, Parsed({"--rotation", "oldest"})["rotation_policy"].AsInt32());
    EXPECT_EQ(2, Parsed({"--rotation", "smart"})["rotation_policy"].AsInt32());
    EXPECT_TRUE(Parsed({"--move"})["remove_src_file"].AsBool());
    const PObject stays = Parsed({"--no-move"});
    EXPECT_TRUE(stays.HasMember("remove_src_file"));
    EXPECT_FALSE(stays["remove_src_file"].AsBool());
}

TEST(TaskOptionsTest, VersionsSwitchRotationOnAndOff) {
    const PObject kept = Parsed({"--versions", "30"});
    EXPECT_TRUE(kept["enable_rotation"].AsBool());
    EXPECT_EQ(30U, kept["max_version_count"].AsUInt64());
    const PObject all = Parsed({"--all-versions"});
    EXPECT_TRUE(all.HasMember("enable_rotation"));
    EXPECT_FALSE(all["enable_rotation"].AsBool());
    EXPECT_FALSE(all.HasMember("max_version_count"));
}

TEST(TaskOptionsTest, ARotationThatIsNamedIsSwitchedOn) {
    for (const char* rotation : {"oldest", "smart"}) {
        const PObject request = Parsed({"--rotation", rotation});
        EXPECT_TRUE(request["enable_rotation"].AsBool()) << rotation;
        EXPECT_FALSE(request.HasMember("max_version_count")) << rotation;
    }
}

TEST(TaskOptionsTest, EachOptionFitsOneStrategy) {
    EXPECT_EQ("", Refusing({}));
    EXPECT_EQ("", Refusing({"--name", "Camera"}));
    EXPECT_EQ("12", Refusing({"--conflict", "rename"}));
    for (const char* sorts : {"--date-folders", "--no-date-folders", "--rename", "--no-rename",
                              "--keep-folders", "--flat", "--move", "--no-move"}) {
        EXPECT_EQ("12", Refusing({sorts})) << sorts;
    }
    EXPECT_EQ("23", Refusing({"--versions", "3"}));
    EXPECT_EQ("23", Refusing({"--all-versions"}));
    EXPECT_EQ("23", Refusing({"--rotation", "smart"}));
}

TEST(TaskOptionsTest, SortedFilesDoNotKeepTheFoldersOfTheSource) {
    for (const char* option : {"--date-folders", "--rename"}) {
        const PObject request = Parsed({option});
        EXPECT_TRUE(request.HasMember("keep_dir_structure")) << option;
        EXPECT_FALSE(request["keep_dir_structure"].AsBool()) << option;
        EXPECT_THROW(Parsed({option, "--keep-folders"}), CommandError) << option;
    }
    EXPECT_FALSE(Parsed({"--no-rename"}).HasMember("keep_dir_structure"));
    EXPECT_TRUE(Parsed({"--keep-folders"})["keep_dir_structure"].AsBool());
    EXPECT_FALSE(Parsed({"--flat"})["keep_dir_structure"].AsBool());
}

TEST(TaskOptionsTest, WhatContradictsItselfOrIsOutOfRangeIsRefused) {
    for (const std::vector<std::string>& words : std::vector<std::vector<std::string>>{
             {"--move",               "--no-move"  },
             {"--rename",             "--no-rename"},
             {"--versions",           "5",           "--all-versions"},
             {"--rotation",                      "smart",                        "--all-versions"},
             {"--versions",      "0"},
             {"--versions",              "-1"                               },
             {"--versions",     "9223372036854775808"},
             {"--conflict","keep"                       },
             {"--rotation",                    "none"         }
    }) {
        EXPECT_THROW(Parsed(words), CLI::ParseError) << words.back();
    }
}
