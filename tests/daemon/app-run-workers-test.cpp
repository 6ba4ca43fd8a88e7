// Tasks that are started, cancelled and changed while the workers are at work.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>

#include "db/log-description.h"
#include "event/event-manager.h"
#include "processor/task-event-manager.h"
#include "workers-fixture.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr int INTERRUPTED = -1;

class RunWorkersTest : public WorkersTest {
protected:
    PObject Run(uint64_t task_id) { return Send("run_task", ForTask(task_id)); }
    PObject Cancel(uint64_t task_id) { return Send("cancel_task", ForTask(task_id)); }
    PObject Set(uint64_t task_id, const std::map<std::string, PObject>& keys) {
        return Send("set_task_setting", ImportSetting(task_id, keys));
    }
    // Nothing of the task is left with the workers.
    static void ExpectLetGo(uint64_t task_id) {
        EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
        EXPECT_FALSE(TaskEventManager::GetInstance().IsProcessing(task_id));
        EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(task_id));
        EXPECT_EQ(TASK_RUN_STATE_IDLE, Entry(task_id).status);
    }
};

TEST_F(RunWorkersTest, ATaskRunsByCommand) {
    const uint64_t task_id = AddRunningTask();
    RunToTheEnd(task_id);
    EXPECT_EQ("successful", Status(task_id));
    EXPECT_EQ(20u, CountFiles());
    EXPECT_THAT(LogTexts(LogDescription::LOG_DESC_TASK_DONE), ElementsAre("[\"My task\"]"));
}

TEST_F(RunWorkersTest, AllTasksRunByTheCopyButton) {
    const uint64_t one = AddRunningTask("one", "/one");
    const uint64_t two = AddRunningTask("two", "/two");
    EXPECT_EQ(0, PressButton());
    WaitUntil([&] { return Status(one) == "successful" && Status(two) == "successful"; });
    EXPECT_EQ(20u, CountFiles("/one"));
    EXPECT_EQ(20u, CountFiles("/two"));
}

TEST_F(RunWorkersTest, ACancelledTaskReadsCancelingUntilItsWorkersHaveLetGo) {
    const auto gate = std::make_shared<Gate>();
    const auto state = std::make_shared<std::atomic<int>>(-1);
    const uint64_t task_id = AddRunningTask();
    m_fake.OnCall("KELDFileCopy_r", [gate, state, task_id, this] {
        gate->Hold([this] { return m_log.Contains("Ferrixd: AbortTask"); });
        if (*state < 0) *state = Entry(task_id).status;
    });
    ASSERT_THAT(Run(task_id), IsSuccess());
    gate->WaitForWorker();
    EXPECT_EQ("copying", Status(task_id));
    EXPECT_EQ("null", Cancel(task_id).ToText());
    EXPECT_EQ(TASK_RUN_STATE_CANCELING, *state);
    ExpectLetGo(task_id);
    EXPECT_EQ("failed", Status(task_id));
    EXPECT_EQ(INTERRUPTED, Task(task_id).error);
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_TASK_STOPPED));
}

TEST_F(RunWorkersTest, ACancelledTaskRunsAgainAtOnce) {
    const auto gate = HoldCopies();
    const uint64_t task_id = AddRunningTask();
    ASSERT_THAT(Run(task_id), IsSuccess());
    gate->WaitForWorker();
    ASSERT_THAT(Cancel(task_id), IsSuccess());
    m_fake.OnCall("KELDFileCopy_r", {});
    RunToTheEnd(task_id);
    EXPECT_EQ("successful", Status(task_id));
    EXPECT_EQ(20u, CountFiles());
}

TEST_F(RunWorkersTest, OtherTasksGoOnWhenOneIsCancelled) {
    const auto gate = std::make_shared<Gate>();
    m_fake.OnCall("KELDFileCopy_r", [gate] { gate->Hold([] { return false; }); });
    const uint64_t running = AddRunningTask("one", "/one");
    const uint64_t queued = AddRunningTask("two", "/two");
    ASSERT_THAT(Run(running), IsSuccess());
    gate->WaitForWorker();
    ASSERT_THAT(Run(queued), IsSuccess());
    ASSERT_THAT(Cancel(queued), IsSuccess());
    ExpectLetGo(queued);
    EXPECT_EQ("copying", Status(running));
    gate->Open();
    WaitUntil([&] { return Status(running) == "successful"; });
    EXPECT_EQ("initial", Status(queued));
    EXPECT_EQ(20u, CountFiles("/one"));
    EXPECT_EQ(0u, CountFiles("/two"));
}

TEST_F(RunWorkersTest, AFileThatIsBeingRetriedIsNotTriedAgainAfterACancel) {
    m_fake.FailCall("KELDFileCopy_r", KELDERR_IO, FakeKeld::ALWAYS);
    const uint64_t task_id = AddRunningTask("a", "/failing");
    ASSERT_THAT(Run(task_id), IsSuccess());
    WaitUntil([this] { return m_log.Contains("HandleAction (1)"); });
    ASSERT_THAT(Cancel(task_id), IsSuccess());
    ExpectLetGo(task_id);
    const int calls = m_fake.CallCount("KELDFileCopy_r");
    m_fake.FailCall("KELDFileCopy_r", KELDERR_IO, 0);
    const uint64_t other = AddRunningTask("other", "/other");  // the workers go on
    RunToTheEnd(other);
    EXPECT_EQ(calls + 20, m_fake.CallCount("KELDFileCopy_r"));
    EXPECT_EQ("failed", Status(task_id));
}

TEST_F(RunWorkersTest, ATaskThatIsCancelledAgainAndAgainRunsInTheEnd) {
    const uint64_t task_id = AddRunningTask();
    for (int i = 0; i < 50; ++i) {
        ASSERT_THAT(Run(task_id), IsSuccess());
        usleep(static_cast<useconds_t>(i * 100));  // another place in the run each time
        ASSERT_THAT(Cancel(task_id), IsSuccess());
        ExpectLetGo(task_id);
    }
    RunToTheEnd(task_id);
    EXPECT_EQ("successful", Status(task_id));
    EXPECT_EQ(20u, CountFiles());
}

// --- Settings during a run

TEST_F(RunWorkersTest, ARunKeepsTheDestinationThatItBeganWith) {
    m_dir.MakeDir("v1/photos/new");
    const auto gate = HoldCopies();
    const uint64_t task_id = AddRunningTask("a", "/old");
    ASSERT_THAT(Run(task_id), IsSuccess());
    gate->WaitForWorker();
    EXPECT_THAT(Set(task_id,
                    {
                        {"hub_folder_path", "/new"},
                        {"task_name",       "New" }
    }),
                IsSuccess());
    EXPECT_EQ(m_volume + "/photos/new", Entry(task_id).dst_dir_path);
    gate->Open();
    WaitUntil([&] { return Status(task_id) == "successful"; });
    EXPECT_EQ(20u, CountFiles("/old"));
    EXPECT_EQ(0u, CountFiles("/new"));
    RunToTheEnd(task_id);
    EXPECT_EQ(20u, CountFiles("/new"));
}

TEST_F(RunWorkersTest, ACancelledRunsSettingsAreForgotten) {
    m_dir.MakeDir("v1/photos/new");
    const auto gate = HoldCopies();
    const uint64_t task_id = AddRunningTask("a", "/old");
    ASSERT_THAT(Run(task_id), IsSuccess());
    gate->WaitForWorker();
    ASSERT_THAT(Set(task_id,
                    {
                        {"hub_folder_path", "/new"}
    }),
                IsSuccess());
    ASSERT_THAT(Cancel(task_id), IsSuccess());
    m_fake.OnCall("KELDFileCopy_r", {});
    RunToTheEnd(task_id);
    EXPECT_EQ(20u, CountFiles("/new"));
}

TEST_F(RunWorkersTest, SettingsThatRaceARunNeitherStopNorSpoilIt) {
    const uint64_t task_id = AddRunningTask();
    for (int round = 0; round < 3; ++round) {
        m_dir.Write("m/a/new" + std::to_string(round), "content");
        ASSERT_THAT(Run(task_id), IsSuccess());
        for (int i = 0; i < 100; ++i) {
            ASSERT_THAT(
                Set(task_id,
                    {
                        {"task_name",       "Name " + std::to_string(i)},
                        {"conflict_policy", i                          }
            }),
                IsSuccess());
            PObject trigger = ForTask(task_id);
            trigger["run_when_plug_in"] = i % 2 == 0;
            trigger["eject_when_task_done"] = false;
            trigger["schedule_json_str"] = "{}";
            ASSERT_THAT(Send("set_trigger_time_setting", trigger), IsSuccess());
        }
        WaitUntil([&] { return CountFiles() == 21u + static_cast<size_t>(round); });
        WaitUntil([&] { return Entry(task_id).status == TASK_RUN_STATE_IDLE; });
    }
    EXPECT_EQ("Name 99", Task(task_id).task_name);
    EXPECT_EQ("Name 99", Entry(task_id).task_name);
}

// --- Default tasks and the box

TEST_F(RunWorkersTest, ADefaultTaskIsDisabledFromUnderTheWorkers) {
    const auto gate = HoldCopies();
    const uint64_t task_id = AddDefaultTask(DEFAULT_USB_UUID);
    PlugIn("front", "u-front", 99);
    for (int i = 0; i < 20; ++i) m_dir.Write("m/front/f" + std::to_string(i), "content");
    PObject trigger = ForTask(task_id);
    trigger["eject_when_task_done"] = false;
    ASSERT_THAT(Send("set_trigger_time_setting", trigger), IsSuccess());
    ASSERT_EQ(0, PostMount("front"));
    ASSERT_THAT(Run(task_id), IsSuccess());
    gate->WaitForWorker();
    EXPECT_THAT(Send("disable_task", ForTask(task_id)), IsSuccess());
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ("disabled", Status(task_id));
    m_fake.OnCall("KELDFileCopy_r", {});
    EXPECT_THAT(Send("enable_task", ForTask(task_id)), IsSuccess());
    RunToTheEnd(task_id);
    EXPECT_EQ("successful", Status(task_id));
    EXPECT_GE(CountFiles(), 20u);
}

TEST_F(RunWorkersTest, TheBeepIsSwitchedInMemory) {
    const std::string settings = ReadWholeFile(m_dir / "pkg/etc/setting.conf");
    PObject request;
    request["beep_on_task_start_end"] = true;
    EXPECT_EQ("null", Send("set_global_setting", request).ToText());
    const uint64_t task_id = AddRunningTask();
    RunToTheEnd(task_id);
    WaitUntil([this] { return m_fake.HardwareCommands().size() >= 2; });
    EXPECT_EQ(settings, ReadWholeFile(m_dir / "pkg/etc/setting.conf"));

    // A key that is missing, or a request that is no map, switches it off.
    for (const PObject& off : {PObject(), PObject("text")}) {
        EXPECT_EQ("null", Send("set_global_setting", request).ToText());
        EXPECT_EQ("null", Send("set_global_setting", off).ToText());
        WaitUntil([this] { return m_fake.LedCodes().back() != 66; });
        m_log.Clear();
        WaitUntil([this] { return m_log.Contains("sleep begin"); });
        const size_t commands = m_fake.HardwareCommands().size();
        RunToTheEnd(task_id);
        m_log.Clear();
        WaitUntil([this] { return m_log.Contains("sleep begin"); });
        EXPECT_EQ(commands, m_fake.HardwareCommands().size());
    }
}

}  // namespace
