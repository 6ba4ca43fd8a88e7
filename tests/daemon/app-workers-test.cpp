// Commands and hooks while the workers are at work.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <functional>
#include <memory>

#include "command-fixture.h"
#include "db/log-description.h"
#include "processor/processor.h"

namespace {

constexpr unsigned STEP_US = 1000;

void WaitUntil(const std::function<bool()>& is_true) {
    while (!is_true()) usleep(STEP_US);
}

// Holds the worker up at its next copy until the test has seen it there. It is shared with the
// worker, which may come by later than the end of the test.
class Gate {
public:
    void Hold(const std::function<bool()>& may_go_on) {
        m_is_reached = true;
        WaitUntil([&] { return m_is_open || may_go_on(); });
    }
    void WaitForWorker() const {
        WaitUntil([this] { return m_is_reached.load(); });
    }
    void Open() { m_is_open = true; }

private:
    std::atomic<bool> m_is_reached = false;
    std::atomic<bool> m_is_open = false;
};

class WorkersTest : public CommandTest {
protected:
    WorkersTest() {
        Processor::SetWaitStepForTest(STEP_US);
        StartWorkers();
    }
    // A gate at the platform's copy call, which opens by itself when a task is aborted.
    std::shared_ptr<Gate> HoldCopies() {
        auto gate = std::make_shared<Gate>();
        m_fake.OnCall("KELDFileCopy_r", [gate, this] {
            gate->Hold([this] { return m_log.Contains("Ferrixd: AbortTask"); });
        });
        return gate;
    }
    // A task of a device with some files, which runs when the device is plugged in.
    uint64_t AddRunningTask() {
        PlugIn("a", "u-1");
        for (int i = 0; i < 20; ++i) m_dir.Write("m/a/f" + std::to_string(i), "content");
        PObject request = AddRequest("a", "u-1");
        request["run_when_plug_in"] = true;
        request["eject_when_task_done"] = false;
        const PObject response = Send("add_task", request);
        EXPECT_THAT(response, IsSuccess());
        return response["task_id"].AsUInt64();
    }
    PObject OnlyTask() {
        const PObject response = Send("list_task");
        return response["task_list"][0];
    }
};

TEST_F(WorkersTest, APluggedInDeviceIsMirrored) {
    AddRunningTask();
    ASSERT_EQ(0, PostMount("a"));
    WaitUntil([this] { return OnlyTask()["task_status"].AsString() == "successful"; });
    EXPECT_EQ("content", ReadWholeFile(m_volume + "/photos/f0"));
    EXPECT_EQ("content", ReadWholeFile(m_volume + "/photos/f19"));
    EXPECT_EQ(0, OnlyTask()["error_code"].AsInt32());
    EXPECT_NE(0u, OnlyTask()["latest_finish_time"].AsUInt64());
}

TEST_F(WorkersTest, TheFileThatIsBeingCopiedIsShown) {
    const auto gate = HoldCopies();
    AddRunningTask();
    ASSERT_EQ(0, PostMount("a"));
    gate->WaitForWorker();
    const PObject task = OnlyTask();
    gate->Open();
    EXPECT_EQ("copying", task["task_status"].AsString());
    EXPECT_TRUE(task["copy_file_path"].AsString().starts_with(MountPath("a") + "/f"))
        << task["copy_file_path"].AsString();
}

TEST_F(WorkersTest, ATaskIsRemovedFromUnderTheWorkers) {
    const auto gate = HoldCopies();
    const uint64_t task_id = AddRunningTask();
    ASSERT_EQ(0, PostMount("a"));
    gate->WaitForWorker();
    EXPECT_THAT(Send("remove_task", ForTask(task_id)), IsSuccess());
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ(-1, access(TaskFolder(task_id).c_str(), F_OK));
    m_fake.OnCall("KELDFileCopy_r", {});
    // The workers are not left paused: the next task of the device runs.
    AddRunningTask();
    ASSERT_EQ(0, PostMount("a"));
    WaitUntil([this] { return OnlyTask()["task_status"].AsString() == "successful"; });
    EXPECT_EQ("content", ReadWholeFile(m_volume + "/photos/f7"));
}

TEST_F(WorkersTest, ADeviceIsUnmountedFromUnderTheWorkers) {
    const auto gate = HoldCopies();
    const uint64_t task_id = AddRunningTask();
    ASSERT_EQ(0, PostMount("a"));
    gate->WaitForWorker();
    EXPECT_EQ(0, PreUnmount("a"));
    EXPECT_FALSE(IsLoaded(task_id));
    m_fake.OnCall("KELDFileCopy_r", {});
    ASSERT_EQ(0, PostMount("a"));
    WaitUntil([this] { return OnlyTask()["task_status"].AsString() == "successful"; });
    EXPECT_EQ("content", ReadWholeFile(m_volume + "/photos/f19"));
}

TEST_F(WorkersTest, NewFilterListsTakeEffectInTheRunThatIsUnderWay) {
    const auto gate = HoldCopies();
    const uint64_t task_id = AddRunningTask();
    ASSERT_EQ(0, PostMount("a"));
    gate->WaitForWorker();
    PObject request = ForTask(task_id);
    for (const char* key :
         {"custom_name", "custom_ext", "black_name", "black_ext", "white_name", "white_ext"}) {
        request[key] = List({});  // an empty white list refuses everything
    }
    EXPECT_THAT(Send("set_filter_setting", request), IsSuccess());
    gate->Open();
    WaitUntil([this] { return OnlyTask()["task_status"].AsString() == "successful"; });
    EXPECT_EQ(1u, m_fake.Copies().size());
}

}  // namespace
