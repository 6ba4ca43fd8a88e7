#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <json/reader.h>
#include <json/value.h>
#include <keld/error.h>
#include <keld/sched.h>
#include <sys/stat.h>
#include <unistd.h>

#include <climits>
#include <mutex>
#include <set>
#include <sstream>
#include <thread>

#include "host/host-paths.h"
#include "host/sched-cron.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace {

using Lines = std::vector<std::string>;

bool Convert(const std::string& members, KELDSchedTask* entry) {
    const std::string json = "{\"schedule\":{" + members + "}}";
    return KELDSchedTaskConvertFromJson_Schedule(json.c_str(), entry);
}

class KeldSchedTest : public ::testing::Test {
protected:
    KeldSchedTest() {
        keld_host::HostPaths paths;
        paths.hostConf = m_dir / "host.conf";
        paths.schedFolder = m_dir / "lib/keld/sched";
        paths.cronFile = m_dir / "etc/cron.d/keld-sched";
        keld_host::SetPaths(paths);
    }
    ~KeldSchedTest() override {
        for (KELDSchedTask* entry : m_entries) KELDSchedTaskFree(entry);
        keld_host::SetPaths({});
    }

    // An entry that is freed with the test.
    KELDSchedTask* New() {
        m_entries.push_back(KELDSchedTaskAlloc());
        return m_entries.back();
    }
    // One that runs `command`, stored; its id.
    int Store(const std::string& command, const std::string& members = "\"hour\":3") {
        KELDSchedTask* entry = New();
        KELDSchedCTaskSetApp(entry, "test.app");
        KELDSchedCTaskSetName(entry, "name");
        KELDSchedCTaskSetCommand(entry, command.c_str());
        KELDSchedCTaskSetState(entry, 1);
        EXPECT_TRUE(Convert(members, entry)) << members;
        EXPECT_EQ(0, KELDSchedTaskSave(entry)) << command;
        int id = -1;
        EXPECT_EQ(0, KELDSchedCTaskGetID(&id, entry));
        return id;
    }
    KELDSchedTask* Load(int id) {
        KELDSchedTask* entry = New();
        EXPECT_EQ(0, KELDSchedTaskLoad(id, entry)) << id;
        return entry;
    }
    std::string CronFile() { return ReadWholeFile(m_dir / "etc/cron.d/keld-sched"); }
    // The lines that cron runs, without the comments and settings.
    Lines CronLines() {
        Lines lines;
        std::stringstream file(CronFile());
        for (std::string line; std::getline(file, line);) {
            if (!line.empty() && isdigit(static_cast<unsigned char>(line[0])) != 0) {
                lines.push_back(line);
            }
        }
        return lines;
    }
    std::string EntryFile(int id) {
        return m_dir / ("lib/keld/sched/" + std::to_string(id) + ".json");
    }

    TempDir m_dir;
    std::vector<KELDSchedTask*> m_entries;
};

TEST_F(KeldSchedTest, AnEntryIsStoredUnderANewIdAndLoadedAgain) {
    const int id = Store("/bin/true");
    EXPECT_EQ(1, id);
    EXPECT_EQ(2, Store("/bin/false"));
    KELDSchedTask* entry = Load(id);
    int loaded = 0;
    char app[16];
    EXPECT_EQ(0, KELDSchedCTaskGetID(&loaded, entry));
    EXPECT_EQ(id, loaded);
    EXPECT_EQ(0, KELDSchedCTaskGetApp(app, sizeof(app), entry));
    EXPECT_STREQ("test.app", app);
    EXPECT_EQ(1, KELDSchedTaskIsListable(entry));
    EXPECT_EQ((Lines{"0 3 * * * root /bin/true", "0 3 * * * root /bin/false"}), CronLines());
}

TEST_F(KeldSchedTest, EveryFieldReachesTheStore) {
    KELDSchedTask* entry = New();
    EXPECT_EQ(0, KELDSchedCTaskSetApp(entry, "a"));
    EXPECT_EQ(0, KELDSchedCTaskSetAppName(entry, "b"));
    EXPECT_EQ(0, KELDSchedCTaskSetName(entry, "c"));
    EXPECT_EQ(0, KELDSchedCTaskSetAction(entry, "d"));
    EXPECT_EQ(0, KELDSchedCTaskSetCommand(entry, "e"));
    EXPECT_EQ(0, KELDSchedCTaskSetState(entry, 1));
    EXPECT_EQ(0, KELDSchedCTaskSetCanRunAppSameTime(entry, 1));
    EXPECT_EQ(0, KELDSchedCTaskSetCanRunTaskSameTime(entry, 1));
    EXPECT_EQ(0, KELDSchedCTaskSetCanRunFromUI(entry, 1));
    EXPECT_EQ(0, KELDSchedCTaskSetOwner(entry, 0));
    EXPECT_EQ(0, KELDSchedCTaskSetCanEditName(entry, 1));
    EXPECT_EQ(0, KELDSchedCTaskSetCanEditOwner(entry, 1));
    EXPECT_EQ(0, KELDSchedCTaskSetCanDeleteFromUI(entry, 1));
    EXPECT_EQ(0, KELDSchedCTaskSetListable(entry, 0));
    ASSERT_EQ(0, KELDSchedTaskSave(entry));
    Json::Value stored;
    std::stringstream(ReadWholeFile(EntryFile(1))) >> stored;
    const std::pair<const char*, Json::Value> expected[] = {
        {"id",                     1  },
        {"app",                    "a"},
        {"app_name",               "b"},
        {"name",                   "c"},
        {"action",                 "d"},
        {"command",                "e"},
        {"state",                  1  },
        {"can_run_app_same_time",  1  },
        {"can_run_task_same_time", 1  },
        {"can_run_from_ui",        1  },
        {"owner",                  0  },
        {"can_edit_name",          1  },
        {"can_edit_owner",         1  },
        {"can_delete_from_ui",     1  },
        {"listable",               0  },
    };
    for (const auto& [key, value] : expected) EXPECT_EQ(value, stored[key]) << key;
    EXPECT_EQ(std::size(expected), stored.size()) << "no timetable was given";
}

TEST_F(KeldSchedTest, IdsAreNeverGivenTwice) {
    Store("a");
    const int id = Store("b");
    ASSERT_EQ(0, KELDSchedTaskRemove(id));
    EXPECT_EQ(id + 1, Store("c"));
    ASSERT_EQ(0, KELDSchedTaskRemove(id + 1));
    ASSERT_EQ(0, unlink((m_dir / "lib/keld/sched/last-id").c_str()));
    EXPECT_EQ(2, Store("d")) << "without the note the stored ones count";
    m_dir.Write("lib/keld/sched/last-id", std::to_string(INT_MAX) + "\n");
    KELDSchedTask* entry = New();
    EXPECT_GT(0, KELDSchedTaskSave(entry)) << "none is left";
}

TEST_F(KeldSchedTest, ARemovedEntryIsGoneFromStoreAndTimetable) {
    const int id = Store("a");
    const int other = Store("b");
    EXPECT_EQ(0, KELDSchedTaskRemove(id));
    EXPECT_EQ((Lines{"0 3 * * * root b"}), CronLines());
    EXPECT_GT(0, KELDSchedTaskRemove(id));
    EXPECT_EQ(KELDERR_SRC_MISS, KLIBCErrGet());
    EXPECT_GT(0, KELDSchedTaskLoad(id, New()));
    EXPECT_EQ(0, KELDSchedTaskLoad(other, New()));
    EXPECT_GT(0, KELDSchedTaskRemove(-1));
    EXPECT_GT(0, KELDSchedTaskRemove(0));
}

TEST_F(KeldSchedTest, UnknownIdsAndNullEntriesAreFailures) {
    KELDSchedTask* entry = New();
    EXPECT_GT(0, KELDSchedTaskLoad(-1, entry)) << "the id of a task without an entry";
    EXPECT_GT(0, KELDSchedTaskLoad(0, entry));
    EXPECT_GT(0, KELDSchedTaskLoad(7, entry));
    EXPECT_GT(0, KELDSchedTaskLoad(7, nullptr));
    EXPECT_GT(0, KELDSchedTaskSave(nullptr));
    EXPECT_GT(0, KELDSchedCTaskSetName(nullptr, "x"));
    EXPECT_GT(0, KELDSchedCTaskSetName(entry, nullptr));
    EXPECT_GT(0, KELDSchedCTaskSetState(nullptr, 1));
    int id = 0;
    EXPECT_GT(0, KELDSchedCTaskGetID(&id, entry)) << "never stored";
    EXPECT_FALSE(KELDSchedTaskConvertFromJson_Schedule(nullptr, entry));
    EXPECT_FALSE(KELDSchedTaskConvertFromJson_Schedule("{\"schedule\":{}}", nullptr));
    KELDSchedTaskFree(nullptr);
    KELDSchedTaskListFree(nullptr);
    EXPECT_EQ(nullptr, KELDSchedTaskNext(nullptr));
}

TEST_F(KeldSchedTest, ABufferThatIsTooSmallForTheApplicationIsAFailure) {
    KELDSchedTask* entry = New();
    KELDSchedCTaskSetApp(entry, "12345");
    char buffer[6];
    EXPECT_GT(0, KELDSchedCTaskGetApp(buffer, 5, entry));
    EXPECT_EQ(0, KELDSchedCTaskGetApp(buffer, 6, entry));
    EXPECT_STREQ("12345", buffer);
}

TEST_F(KeldSchedTest, OnlyEnabledAndListableEntriesWithATimetableStandInTheCronFile) {
    const int id = Store("cmd");
    KELDSchedTask* entry = Load(id);
    const auto save = [&] { EXPECT_EQ(0, KELDSchedTaskSave(entry)); };
    ASSERT_EQ(1U, CronLines().size());
    KELDSchedCTaskSetState(entry, 0);
    save();
    EXPECT_EQ(Lines{}, CronLines());
    KELDSchedCTaskSetState(entry, 1);
    KELDSchedCTaskSetListable(entry, 0);
    save();
    EXPECT_EQ(Lines{}, CronLines());
    KELDSchedCTaskSetListable(entry, 1);
    save();
    ASSERT_EQ(1U, CronLines().size());
    ASSERT_TRUE(Convert("\"min\":null,\"week_name\":null,\"repeat\":null", entry));
    save();
    EXPECT_EQ(Lines{}, CronLines()) << "the timetable was taken away";
    ASSERT_TRUE(Convert("\"min\":5", entry));
    KELDSchedCTaskSetCommand(entry, " ");
    save();
    EXPECT_EQ(Lines{}, CronLines()) << "nothing to run";
}

TEST_F(KeldSchedTest, TwoWhoChangeDifferentFieldsDoNotUndoEachOther) {
    const int id = Store("old");
    KELDSchedTask* first = Load(id);
    KELDSchedTask* second = Load(id);
    KELDSchedCTaskSetCommand(first, "new");
    KELDSchedCTaskSetListable(second, 0);
    ASSERT_EQ(0, KELDSchedTaskSave(first));
    ASSERT_EQ(0, KELDSchedTaskSave(second));
    KELDSchedTask* entry = Load(id);
    EXPECT_EQ(0, KELDSchedTaskIsListable(entry));
    KELDSchedCTaskSetListable(entry, 1);
    ASSERT_EQ(0, KELDSchedTaskSave(entry));
    EXPECT_EQ((Lines{"0 3 * * * root new"}), CronLines());
}

TEST_F(KeldSchedTest, AnEntryThatWasRemovedMeanwhileIsNotStoredAgain) {
    const int id = Store("cmd");
    KELDSchedTask* entry = Load(id);
    ASSERT_EQ(0, KELDSchedTaskRemove(id));
    EXPECT_GT(0, KELDSchedTaskSave(entry));
    EXPECT_EQ(KELDERR_SRC_MISS, KLIBCErrGet());
    EXPECT_EQ(Lines{}, CronLines());
}

int AcceptTestApp(const KELDSchedTask* entry) {
    char app[512];
    return KELDSchedCTaskGetApp(app, sizeof(app), entry) == 0 && std::string(app) == "test.app";
}

TEST_F(KeldSchedTest, AListHoldsWhatTheFilterAcceptsInTheOrderOfTheIds) {
    KELDSchedTask* list = New();
    EXPECT_EQ(0, KELDSchedTaskListGet(&list, nullptr)) << "no store yet";
    EXPECT_EQ(nullptr, list);
    for (int i = 0; i < 12; ++i) Store("c" + std::to_string(i));
    KELDSchedTask* other = New();
    KELDSchedCTaskSetApp(other, "other.app");
    ASSERT_EQ(0, KELDSchedTaskSave(other));
    ASSERT_EQ(12, KELDSchedTaskListGet(&list, AcceptTestApp));
    int expected = 1;
    for (KELDSchedTask* entry = list; entry != nullptr; entry = KELDSchedTaskNext(entry)) {
        int id = 0;
        EXPECT_EQ(0, KELDSchedCTaskGetID(&id, entry));
        EXPECT_EQ(expected++, id);
        KELDSchedCTaskSetListable(entry, 0);
        EXPECT_EQ(0, KELDSchedTaskSave(entry)) << "entries of a list may be saved";
    }
    EXPECT_EQ(13, expected);
    KELDSchedTaskListFree(list);
    EXPECT_EQ(Lines{}, CronLines());
    ASSERT_EQ(13, KELDSchedTaskListGet(&list, nullptr));
    KELDSchedTaskListFree(list);
    EXPECT_GT(0, KELDSchedTaskListGet(nullptr, nullptr));
}

TEST_F(KeldSchedTest, ADamagedEntryIsLeftOutAndToldAndTheOthersGoOn) {
    Store("good");
    const int bad = Store("bad");
    const std::string damages[] = {"",           "{",
                                   "[]",         "{\"id\":2}",
                                   "null",       std::string(100000, '['),
                                   "{\"id\":1}", ReadWholeFile(EntryFile(1))};
    for (const std::string& damage : damages) {
        m_dir.Write("lib/keld/sched/2.json", damage);
        const LogCapture log;
        EXPECT_GT(0, KELDSchedTaskLoad(bad, New())) << damage.substr(0, 20);
        EXPECT_EQ(KELDERR_IO, KLIBCErrGet());
        KELDSchedTask* list = nullptr;
        EXPECT_EQ(1, KELDSchedTaskListGet(&list, nullptr));
        KELDSchedTaskListFree(list);
        EXPECT_TRUE(log.Contains("entry 2 of the scheduler is damaged"));
    }
    KELDSchedTask* good = Load(1);
    KELDSchedCTaskSetName(good, "renamed");
    EXPECT_EQ(0, KELDSchedTaskSave(good));
    EXPECT_EQ((Lines{"0 3 * * * root good"}), CronLines());
    EXPECT_EQ(0, KELDSchedTaskRemove(bad)) << "it can be removed all the same";
}

TEST_F(KeldSchedTest, FilesAreNotWritableByOthersWhateverTheUmaskIs) {
    const mode_t before = umask(0);
    Store("cmd");
    umask(before);
    const auto mode_of = [&](const std::string& name) {
        struct stat info {};
        EXPECT_EQ(0, stat((m_dir / name).c_str(), &info)) << name;
        return info.st_mode & 07777;
    };
    EXPECT_EQ(0600U, mode_of("lib/keld/sched/1.json"));
    EXPECT_EQ(0600U, mode_of("lib/keld/sched/last-id"));
    EXPECT_EQ(0600U, mode_of("lib/keld/sched/lock"));
    EXPECT_EQ(0755U, mode_of("lib/keld/sched"));
    EXPECT_EQ(0755U, mode_of("lib/keld"));
    EXPECT_EQ(0644U, mode_of("etc/cron.d/keld-sched")) << "or cron would not read it";
}

TEST_F(KeldSchedTest, TheCronFileIsMadeAnewWhenItIsMissingOrWasChanged) {
    const int id = Store("cmd");
    const std::string whole = CronFile();
    const auto touch = [&] {
        KELDSchedTask* entry = Load(id);
        KELDSchedCTaskSetAction(entry, "x");
        EXPECT_EQ(0, KELDSchedTaskSave(entry));
    };
    m_dir.Write("etc/cron.d/keld-sched", "* * * * * root something else\n" + whole);
    touch();
    EXPECT_EQ(whole, CronFile());
    ASSERT_EQ(0, unlink((m_dir / "etc/cron.d/keld-sched").c_str()));
    touch();
    EXPECT_EQ(whole, CronFile());
    EXPECT_EQ('\n', whole.back()) << "cron passes over a last line without an end";
}

TEST_F(KeldSchedTest, WhenTheTimetableCannotBeWrittenNothingIsStored) {
    const int id = Store("old");
    const std::string before = ReadWholeFile(EntryFile(id));
    ASSERT_EQ(0, unlink((m_dir / "etc/cron.d/keld-sched").c_str()));
    m_dir.MakeDir("etc/cron.d/keld-sched/in the way");
    KELDSchedTask* entry = Load(id);
    KELDSchedCTaskSetCommand(entry, "new");
    const LogCapture log;
    EXPECT_GT(0, KELDSchedTaskSave(entry));
    EXPECT_EQ(before, ReadWholeFile(EntryFile(id)));
    KELDSchedTask* another = New();
    EXPECT_GT(0, KELDSchedTaskSave(another));
    int unused = 0;
    EXPECT_GT(0, KELDSchedCTaskGetID(&unused, another));
    EXPECT_GT(0, KELDSchedTaskRemove(id));
    KELDSchedTask* list = nullptr;
    EXPECT_EQ(1, KELDSchedTaskListGet(&list, nullptr));
    KELDSchedTaskListFree(list);
    EXPECT_TRUE(log.Contains("cannot be written"));
}

TEST_F(KeldSchedTest, ManyThreadsGetIdsOfTheirOwn) {
    std::vector<std::thread> threads;
    std::set<int> ids;
    std::mutex mutex;
    for (int thread = 0; thread < 4; ++thread) {
        threads.emplace_back([&] {
            for (int i = 0; i < 10; ++i) {
                KELDSchedTask* entry = KELDSchedTaskAlloc();
                int id = 0;
                EXPECT_EQ(0, KELDSchedTaskSave(entry));
                EXPECT_EQ(0, KELDSchedCTaskGetID(&id, entry));
                KELDSchedTaskFree(entry);
                const std::lock_guard lock(mutex);
                EXPECT_TRUE(ids.insert(id).second) << id;
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(40U, ids.size());
}

TEST_F(KeldSchedTest, AnOwnerIsWrittenByNameAndMustBeAUser) {
    const int id = Store("cmd");
    KELDSchedTask* entry = Load(id);
    const std::string user = keld_host::CronUserName(1);  // "daemon" on Debian
    if (user.empty()) GTEST_SKIP() << "no user with id 1";
    KELDSchedCTaskSetOwner(entry, 1);
    ASSERT_EQ(0, KELDSchedTaskSave(entry));
    EXPECT_EQ((Lines{"0 3 * * * " + user + " cmd"}), CronLines());
    for (const int uid : {-1, 2000000000}) {
        KELDSchedCTaskSetOwner(entry, uid);
        EXPECT_GT(0, KELDSchedTaskSave(entry)) << uid;
        EXPECT_EQ(KELDERR_INVALID_ARGUMENT, KLIBCErrGet());
    }
    EXPECT_EQ((Lines{"0 3 * * * " + user + " cmd"}), CronLines());
}

TEST_F(KeldSchedTest, AnOwnerWhoIsGoneStopsHisEntryAndNoOther) {
    Store("mine");
    Store("other");
    Json::Value stored;
    std::stringstream(ReadWholeFile(EntryFile(1))) >> stored;
    stored["owner"] = 2000000000;
    m_dir.Write("lib/keld/sched/1.json", stored.toStyledString());
    KELDSchedTask* entry = Load(1);
    KELDSchedCTaskSetName(entry, "renamed");
    const LogCapture log;
    EXPECT_EQ(0, KELDSchedTaskSave(entry)) << "what was set is valid";
    EXPECT_TRUE(log.Contains("entry 1 of the scheduler cannot run"));
    EXPECT_EQ((Lines{"0 3 * * * root other"}), CronLines());
}

TEST_F(KeldSchedTest, PercentSignsAreEscapedForCron) {
    Store("date +%F > /tmp/100%");
    EXPECT_EQ((Lines{"0 3 * * * root date +\\%F > /tmp/100\\%"}), CronLines());
}

TEST_F(KeldSchedTest, CommandsThatALineCannotHoldAreRefused) {
    for (const std::string& command :
         {std::string("a\n* * * * * root evil"), std::string("a\r"), std::string("a\\nb"),
          std::string("a\x01"), std::string("a\x7f"), std::string(901, 'x'),
          std::string(451, '%')}) {
        KELDSchedTask* entry = New();
        KELDSchedCTaskSetState(entry, 1);
        EXPECT_TRUE(Convert("\"hour\":3", entry));
        KELDSchedCTaskSetCommand(entry, command.c_str());
        EXPECT_GT(0, KELDSchedTaskSave(entry)) << command;
        EXPECT_EQ(KELDERR_INVALID_ARGUMENT, KLIBCErrGet());
    }
    Store(std::string(900, 'x'));
    EXPECT_EQ(1U, CronLines().size());
}

TEST_F(KeldSchedTest, HostileTextsNeitherBreakTheCronFileNorTheStore) {
    const std::string names[] = {"a\n* * * * * root touch /evil",
                                 "\r\n",
                                 "50% \"quoted\" 'text'",
                                 "back\\slash",
                                 "no \xff\xfe utf-8",
                                 std::string(5000, 'n'),
                                 "\xe2\x80\xa8line separator",
                                 "",
                                 "# hash"};
    const char* const passed_over = "(#|SHELL=|PATH=)[^[:cntrl:]]*";
    const auto is_passed_over = ::testing::Matches(::testing::MatchesRegex(passed_over));
    const auto is_work_line = ::testing::Matches(
        ::testing::MatchesRegex("0 3 \\* \\* \\* root echo \"a b\" 'c' `d` \\$\\(e\\)"));
    for (const std::string& name : names) {
        KELDSchedTask* entry = Load(Store("echo \"a b\" 'c' `d` $(e)"));
        KELDSchedCTaskSetName(entry, name.c_str());
        KELDSchedCTaskSetAction(entry, name.c_str());
        KELDSchedCTaskSetAppName(entry, name.c_str());
        KELDSchedCTaskSetApp(entry, name.c_str());
        ASSERT_EQ(0, KELDSchedTaskSave(entry));
        int id = 0;
        ASSERT_EQ(0, KELDSchedCTaskGetID(&id, entry));
        char app[6000];
        ASSERT_EQ(0, KELDSchedCTaskGetApp(app, sizeof(app), Load(id)));
        EXPECT_EQ(name, app);
    }
    size_t works = 0;
    std::stringstream file(CronFile());
    for (std::string line; std::getline(file, line);) {
        const bool is_work = is_work_line(line);
        EXPECT_TRUE(is_work || is_passed_over(line)) << line;
        works += is_work ? 1 : 0;
    }
    EXPECT_EQ(std::size(names), works);
}

struct TimetableCase {
    const char* members;
    Lines lines;  // without " root cmd"
};

const std::vector<TimetableCase>& TimetableCases() {
    static const std::vector<TimetableCase> cases = {
        {"\"hour\":23,\"min\":59",                                                               {"59 23 * * *"}                  },
        {"\"min\":5",                                                                            {"5 0 * * *"}                    },
        {"\"week_name\":\"\"",                                                                   {"0 0 * * *"}                    },
        {"\"week_name\":\"0,1,2,3,4,5,6\"",                                                      {"0 0 * * *"}                    },
        {"\"hour\":1,\"week_name\":\"5,1,5\"",                                                   {"0 1 * * 1,5"}                  },
        {"\"hour\":1,\"week_name\":\"0\",\"date_type\":0,\"date\":\"2030/1/5\",\"repeat\":1001",
         {"0 1 * * 0"}                                                                                                            },
        {"\"hour\":1,\"unknown\":[1],\"date\":null",                                             {"0 1 * * *"}                    },
        {"\"hour\":8,\"repeat_hour\":4",                                                         {"0 8,12,16,20 * * *"}           },
        {"\"hour\":8,\"min\":15,\"repeat_min\":20,\"last_work_hour\":9",                         {"15,35,55 8,9 * * *"}           },
        {"\"hour\":8,\"repeat_hour\":1,\"repeat_min\":30,\"last_work_hour\":12",
         {"0 8,11 * * *", "30 9,12 * * *"}                                                                                        },
        {"\"hour\":22,\"min\":50,\"repeat_min\":25",                                             {"50 22 * * *", "15,40 23 * * *"}},
        {"\"hour\":8,\"repeat_hour\":1,\"last_work_hour\":8",                                    {"0 8 * * *"}                    },
        {"\"hour\":9,\"last_work_hour\":0",                                                      {"0 9 * * *"}                    },
        {"\"hour\":4,\"min\":30,\"date_type\":1,\"date\":\"2030/12/24\"",
         {"30 4 24 12 * [ \"$(date +\\%Y)\" -eq 2030 ] || exit 0;"}                                                               },
        {"\"date_type\":1,\"date\":\"2030/1/5\",\"repeat\":1001",
         {"0 0 * * * [ \"$(date +\\%Y\\%m\\%d)\" -ge 20300105 ] || exit 0;"}                                                      },
        {"\"date_type\":1,\"date\":\"2030/01/05\",\"repeat\":-1",
         {"0 0 * * * [ \"$(date +\\%Y\\%m\\%d)\" -ge 20300105 ] || exit 0;"}                                                      },
        {"\"date_type\":1,\"date\":\"2030/1/5\",\"repeat\":1002",
         {"0 0 * * 6 [ \"$(date +\\%Y\\%m\\%d)\" -ge 20300105 ] || exit 0;"}                                                      },
        {"\"date_type\":1,\"date\":\"2030/3/31\",\"repeat\":1",
         {"0 0 31 * * [ \"$(date +\\%Y\\%m\\%d)\" -ge 20300331 ] || exit 0;"}                                                     },
        {"\"date_type\":1,\"date\":\"2030/5/1\",\"repeat\":3",
         {"0 0 1 2,5,8,11 * [ \"$(date +\\%Y\\%m\\%d)\" -ge 20300501 ] || exit 0;"}                                               },
        {"\"date_type\":1,\"date\":\"2032/2/29\",\"repeat\":12",
         {"0 0 29 2 * [ \"$(date +\\%Y\\%m\\%d)\" -ge 20320229 ] || exit 0;"}                                                     },
    };
    return cases;
}

TEST_F(KeldSchedTest, TimetablesBecomeCronsTimes) {
    for (const TimetableCase& row : TimetableCases()) {
        const int id = Store("cmd", row.members);
        Lines expected;
        for (const std::string& line : row.lines) {
            const size_t test = line.find(" [");
            const bool has_test = test != std::string::npos;
            expected.push_back(line.substr(0, test) + " root " +
                               (has_test ? line.substr(test + 1) + " " : "") + "cmd");
        }
        EXPECT_EQ(expected, CronLines()) << row.members;
        // The same from the store.
        KELDSchedTask* entry = Load(id);
        KELDSchedCTaskSetName(entry, "renamed");
        EXPECT_EQ(0, KELDSchedTaskSave(entry));
        EXPECT_EQ(expected, CronLines()) << row.members;
        EXPECT_EQ(0, KELDSchedTaskRemove(id));
    }
}

TEST_F(KeldSchedTest, RefusedTimetablesChangeNothing) {
    const int id = Store("cmd");
    KELDSchedTask* entry = Load(id);
    for (const char* members : {"\"hour\":24",
                                "\"hour\":-1",
                                "\"hour\":\"3\"",
                                "\"hour\":1.5",
                                "\"hour\":true",
                                "\"hour\":99999999999",
                                "\"min\":60",
                                "\"min\":{}",
                                "\"date_type\":2",
                                "\"week_name\":\"7\"",
                                "\"week_name\":\"1,\"",
                                "\"week_name\":\",1\"",
                                "\"week_name\":\"1 2\"",
                                "\"week_name\":\"12\"",
                                "\"week_name\":5",
                                "\"week_name\":\"1,2\\n* * * * * root evil\"",
                                "\"date_type\":1",
                                "\"date_type\":1,\"date\":\"\"",
                                "\"date_type\":1,\"date\":\"2030/2/29\"",
                                "\"date_type\":1,\"date\":\"2030/13/1\"",
                                "\"date_type\":1,\"date\":\"2030/0/1\"",
                                "\"date_type\":1,\"date\":\"2030/1/0\"",
                                "\"date_type\":1,\"date\":\"1969/1/1\"",
                                "\"date_type\":1,\"date\":\"20300/1/1\"",
                                "\"date_type\":1,\"date\":\"2030-1-1\"",
                                "\"date_type\":1,\"date\":\"2030/1/1 \"",
                                "\"date\":\"2030/2/30\"",
                                "\"repeat\":5",
                                "\"repeat\":1003",
                                "\"repeat\":-2",
                                "\"repeat\":\"1\"",
                                "\"repeat_hour\":24",
                                "\"repeat_min\":60",
                                "\"last_work_hour\":24",
                                "\"hour\":8,\"repeat_hour\":1,\"last_work_hour\":7"}) {
        EXPECT_FALSE(Convert(members, entry)) << members;
        EXPECT_EQ(KELDERR_INVALID_ARGUMENT, KLIBCErrGet());
    }
    for (const std::string& json :
         {std::string(), std::string("null"), std::string("[]"), std::string("{}"),
          std::string("\"x\""), std::string("{\"schedule\":null}"),
          std::string("{\"schedule\":[]}"), std::string("{\"schedule\":5}"),
          std::string("{\"schedule\":{}"), std::string(1000000, '['),
          "{\"schedule\":" + std::string(1000000, '{')}) {
        EXPECT_FALSE(KELDSchedTaskConvertFromJson_Schedule(json.c_str(), entry))
            << json.substr(0, 40);
    }
    ASSERT_EQ(0, KELDSchedTaskSave(entry));
    EXPECT_EQ((Lines{"0 3 * * * root cmd"}), CronLines());
}

TEST_F(KeldSchedTest, TheDateTestOfALineIsOneThatTheShellUnderstands) {
    for (const auto& [date, expected] : {std::pair("2000/1/1", "ran"), std::pair("9999/1/1", "")}) {
        const int id = Store(
            "printf ran", std::string("\"date_type\":1,\"repeat\":1001,\"date\":\"") + date + "\"");
        std::string command = CronLines().at(0).substr(std::string("0 0 * * * root ").size());
        // What cron takes away before the shell sees it.
        for (size_t at = 0; (at = command.find("\\%", at)) != std::string::npos;) {
            command.erase(at, 1);
        }
        const std::string output = m_dir / "output";
        EXPECT_EQ(0, system(("( " + command + " ) > " + output).c_str()));
        EXPECT_EQ(expected, ReadWholeFile(output)) << date;
        ASSERT_EQ(0, KELDSchedTaskRemove(id));
    }
}

}  // namespace
