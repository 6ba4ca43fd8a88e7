#include "client/refusal.h"

#include <gmock/gmock.h>

#include <map>
#include <sstream>

#include "client/ctl.h"

using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

namespace {

struct Answer {
    const char* action;
    int code;
    const char* text;
};

// All that the daemon can refuse a command with.
constexpr Answer ANSWERS[] = {
    {"add_task",                 1,  "Invalid parameter"                         },
    {"add_task",                 1,  "Failed to PrepareTaskInfo"                 },
    {"add_task",                 2,  "Failed to AddUSBInfo to DB"                },
    {"add_task",                 2,  "Failed to AddTaskInfo to DB"               },
    {"add_task",                 2,  "Failed to list tasks from DB"              },
    {"add_task",                 2,  "Failed to update task info"                },
    {"add_task",                 2,  "Failed to add log info to log db"          },
    {"add_task",                 3,  "USB info has already existed"              },
    {"add_task",                 4,  "Task info has already existed"             },
    {"add_task",                 9,  "Duplicated destination path"               },
    {"add_task",                 10, "Import destination path does not exist."   },
    {"add_task",                 11, "Failed to resolve import destination path."},
    {"add_task",                 11, "FSStat import path failed."                },
    {"add_task",                 11, "Failed to InitTaskEnv"                     },
    {"add_task",                 11, "Failed to WriteFilterSetting"              },
    {"add_task",                 11, "Failed to LoadUSBTaskEntryByUSBID"         },
    {"add_task",                 11, "Failed to CreateSchedule"                  },
    {"remove_task",              1,  "Invalid parameter"                         },
    {"remove_task",              2,  "Failed to RemoveTaskInfo from DB"          },
    {"remove_task",              2,  "Failed to RemoveUSBInfo from DB"           },
    {"remove_task",              2,  "Failed to add log info to log db"          },
    {"remove_task",              6,  "Task id does not exist"                    },
    {"remove_task",              11, "Default Task can not be removed"           },
    {"remove_task",              11, "Failed to remove schedule"                 },
    {"remove_task",              11, "Failed to remove task folder"              },
    {"remove_task",              11, "Failed to get device path"                 },
    {"remove_task",              11, "Failed to get uuid for device"             },
    {"remove_task",              11, "Failed to register usb for device"         },
    {"list_task",                2,  "Failed to list tasks  from DB"             },
    {"run_task",                 1,  "Invalid parameter"                         },
    {"run_task",                 11, "Task is not runnable"                      },
    {"cancel_task",              1,  "Invalid parameter"                         },
    {"cancel_task",              8,  "Task does not match"                       },
    {"set_task_setting",         1,  "Invalid parameter"                         },
    {"set_task_setting",         2,  "Failed to list tasks from DB"              },
    {"set_task_setting",         2,  "Failed to update task info"                },
    {"set_task_setting",         2,  "Failed to add log info to log db"          },
    {"set_task_setting",         6,  "Task id does not exist"                    },
    {"set_task_setting",         9,  "Duplicated destination path"               },
    {"set_task_setting",         10, "Import destination path does not exist."   },
    {"set_task_setting",         11, "Failed to resolve import destination path."},
    {"set_task_setting",         11, "FSStat import path failed."                },
    {"set_task_setting",         11, "Failed to UpdateScheduleName"              },
    {"get_task_setting",         1,  "Invalid parameter"                         },
    {"get_task_setting",         6,  "Task id does not exist"                    },
    {"get_task_setting",         11, "Failed to get task response"               },
    {"set_trigger_time_setting", 1,  "Invalid parameter"                         },
    {"set_trigger_time_setting", 2,  "Failed to update usb info"                 },
    {"set_trigger_time_setting", 2,  "Failed to add log info to log db"          },
    {"set_trigger_time_setting", 5,  "USB id does not exist"                     },
    {"set_trigger_time_setting", 6,  "Task id does not exist"                    },
    {"set_trigger_time_setting", 11, "Failed to UpdateScheduleContent"           },
    {"enable_task",              1,  "Invalid parameter"                         },
    {"enable_task",              2,  "Failed to list tasks from DB"              },
    {"enable_task",              2,  "Failed to update task info"                },
    {"enable_task",              2,  "Failed to add log info to log db"          },
    {"enable_task",              6,  "Task id does not exist"                    },
    {"enable_task",              9,  "Duplicated destination path"               },
    {"enable_task",              10, "Import destination path does not exist."   },
    {"enable_task",              11, "Failed to resolve import destination path."},
    {"enable_task",              11, "FSStat import path failed."                },
    {"enable_task",              11, "Failed to LoadUSBTaskEntryByUSBID"         },
    {"disable_task",             1,  "Invalid parameter"                         },
    {"disable_task",             2,  "Failed to update task info"                },
    {"disable_task",             2,  "Failed to add log info to log db"          },
    {"disable_task",             5,  "USB id does not exist"                     },
    {"disable_task",             6,  "Task id does not exist"                    },
    {"set_filter_setting",       1,  "Invalid parameter"                         },
    {"set_filter_setting",       11, "Failed to WriteFilterSetting"              },
    {"set_filter_setting",       11, "Failed to set filter setting"              },
    {"set_filter_setting",       11, "Failed to load black list"                 },
    {"set_filter_setting",       11, "Failed to load white list"                 },
    {"get_filter_setting",       1,  "Invalid parameter"                         },
    {"get_filter_setting",       11, "Failed to ReadFilterSetting"               },
};

// The command that asks for each action.
const std::map<std::string, std::string> COMMANDS = {
    {"add_task",                 "task add"        },
    {"remove_task",              "task remove"     },
    {"list_task",                "task list"       },
    {"run_task",                 "task run"        },
    {"cancel_task",              "task cancel"     },
    {"set_task_setting",         "task set"        },
    {"get_task_setting",         "task show"       },
    {"set_trigger_time_setting", "task trigger"    },
    {"enable_task",              "task enable"     },
    {"disable_task",             "task disable"    },
    {"set_filter_setting",       "task filter set" },
    {"get_filter_setting",       "task filter show"},
};

class RefusalTest : public testing::Test {
protected:
    // The option "--name" of a word, without what stands around it; nothing for any other word.
    static std::string OptionIn(const std::string& word) {
        const size_t begin = word.find("--");
        if (begin == std::string::npos) return "";
        return word.substr(begin,
                           word.find_first_not_of("-abcdefghijklmnopqrstuvwxyz", begin) - begin);
    }
    static bool HoldsCommands(const CLI::App* command) {
        return !command->get_subcommands([](const CLI::App*) { return true; }).empty();
    }
    // The command that the words begin with, "task set" for example; every option among them has
    // to be one of it.
    const CLI::App* Find(const std::string& words) const {
        const CLI::App* command = m_program.get();
        std::istringstream stream(words);
        for (std::string word; stream >> word;) {
            if (HoldsCommands(command)) {
                command = command->get_subcommand(word);  // throws: there is no such command
            } else {
                CheckOption(command, word);
            }
        }
        EXPECT_FALSE(HoldsCommands(command)) << words << " is no whole command";
        return command;
    }
    static void CheckOption(const CLI::App* command, const std::string& word) {
        const std::string option = OptionIn(word);
        if (option.empty()) return;
        EXPECT_NE(nullptr, command->get_option_no_throw(option))
            << command->get_name() << " has no option " << option;
    }
    // What stands between quotes has to be a command line; an option elsewhere one of the command
    // that was refused.
    void CheckAdvice(const std::string& action, const std::string& advice) const {
        const CLI::App* refused = Find(COMMANDS.at(action));
        const std::string program = "ferrixctl ";
        std::istringstream parts(advice);
        bool is_quoted = false;
        for (std::string part; std::getline(parts, part, '"'); is_quoted = !is_quoted) {
            if (is_quoted) {
                ASSERT_THAT(part, StartsWith(program));
                (void)Find(part.substr(program.size()));
                continue;
            }
            std::istringstream words(part);
            for (std::string word; words >> word;) CheckOption(refused, word);
        }
    }

    Ctl m_ctl{DaemonClient("/nowhere"), Terminal(-1)};
    std::unique_ptr<CLI::App> m_program = MakeCtlProgram(m_ctl);
};

}  // namespace

TEST_F(RefusalTest, EveryAnswerOfTheDaemonComesWithAdviceThatCanBeFollowed) {
    for (const auto& [action, code, text] : ANSWERS) {
        SCOPED_TRACE(std::string(action) + ": " + text);
        const std::string said = ExplainRefusal(action, code, text);
        ASSERT_THAT(said, StartsWith(std::string(text) + ": "));
        CheckAdvice(action, said.substr(std::string(text).size() + 2));
    }
}

TEST_F(RefusalTest, EachCommandIsToldWhatItCanDoItself) {
    const auto missing = [](const char* action) {
        return ExplainRefusal(action, 10, "Import destination path does not exist.");
    };
    EXPECT_THAT(missing("add_task"), HasSubstr("--make-folder"));
    EXPECT_THAT(missing("set_task_setting"), HasSubstr("with --to"));
    EXPECT_THAT(missing("enable_task"), HasSubstr("\"ferrixctl task set TASK --to SHARE/FOLDER\""));
    const auto used = [](const char* action) {
        return ExplainRefusal(action, 9, "Duplicated destination path");
    };
    EXPECT_THAT(used("add_task"), HasSubstr("with --to"));
    EXPECT_THAT(used("enable_task"), HasSubstr("\"ferrixctl task set TASK --to SHARE/FOLDER\""));
}

TEST_F(RefusalTest, ATaskThatStandsAfterARefusalIsToBeRemoved) {
    for (const auto& [text, code] : std::map<std::string, int>{
             {"Failed to InitTaskEnv",             11},
             {"Failed to WriteFilterSetting",      11},
             {"Failed to LoadUSBTaskEntryByUSBID", 11},
             {"Failed to CreateSchedule",          11},
             {"Failed to update task info",        2 },
    }) {
        EXPECT_THAT(
            ExplainRefusal("add_task", code, text),
            testing::AllOf(HasSubstr("the task stands"), HasSubstr("\"ferrixctl task remove\"")));
    }
    EXPECT_THAT(ExplainRefusal("set_filter_setting", 11, "Failed to WriteFilterSetting"),
                Not(HasSubstr("task remove")));
}

TEST_F(RefusalTest, WhatIsNotKnownIsPassedOnWithTheCommandThatWasRefused) {
    EXPECT_EQ("No such thing (run_task)", ExplainRefusal("run_task", 99, "No such thing"));
    const Refusal refusal("add_task", 10, "Import destination path does not exist.");
    EXPECT_EQ(10, refusal.Code());
    EXPECT_EQ(EXIT_REFUSED, refusal.Status());
}
