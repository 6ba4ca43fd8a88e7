// Commands and hooks while the workers are at work.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <thread>

#include "command-fixture.h"
#include "db/log-description.h"
#include "processor/processor.h"

namespace {

constexpr unsigned STEP_US = 1000;

class WorkersTest : public CommandTest {
protected:
    WorkersTest() {
        Processor::SetWaitStepForTest(STEP_US);
        StartWorkers();
    }
    static void WaitUntil(const std::function<bool()>& is_true) {
        while (!is_true()) std::this_thread::yield();
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
    PObject OnlyTask() { return Send("list_task")["task_list"][0]; }
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
    std::atomic<bool> is_copying = false;
    std::atomic<bool> may_go_on = false;
    m_fake.OnCall("KELDFileCopy_r", [&] {
        is_copying = true;
        WaitUntil([&] { return may_go_on.load(); });
    });
    AddRunningTask();
    ASSERT_EQ(0, PostMount("a"));
    WaitUntil([&] { return is_copying.load(); });
    const PObject task = OnlyTask();
    may_go_on = true;
    EXPECT_EQ("copying", task["task_status"].AsString());
    EXPECT_TRUE(task["copy_file_path"].AsString().starts_with(MountPath("a") + "/f"))
        << task["copy_file_path"].AsString();
}

TEST_F(WorkersTest, ATaskIsRemovedFromUnderTheWorkers) {
    std::atomic<bool> is_copying = false;
    m_fake.OnCall("KELDFileCopy_r", [&] {
        is_copying = true;
        WaitUntil([&] { return m_log.Contains("Ferrixd: AbortTask"); });
    });
    const uint64_t task_id = AddRunningTask();
    ASSERT_EQ(0, PostMount("a"));
    WaitUntil([&] { return is_copying.load(); });
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
    std::atomic<bool> is_copying = false;
    m_fake.OnCall("KELDFileCopy_r", [&] {
        is_copying = true;
        WaitUntil([&] { return m_log.Contains("Ferrixd: AbortTask"); });
    });
    const uint64_t task_id = AddRunningTask();
    ASSERT_EQ(0, PostMount("a"));
    WaitUntil([&] { return is_copying.load(); });
    EXPECT_EQ(0, PreUnmount("a"));
    EXPECT_FALSE(IsLoaded(task_id));
    m_fake.OnCall("KELDFileCopy_r", {});
    // Nothing is taken for removed because of it, and the task runs when the device is back.
    ASSERT_EQ(0, PostMount("a"));
    WaitUntil([this] { return OnlyTask()["task_status"].AsString() == "successful"; });
    EXPECT_EQ("content", ReadWholeFile(m_volume + "/photos/f19"));
}

TEST_F(WorkersTest, NewFilterListsTakeEffectInTheRunThatIsUnderWay) {
    std::atomic<bool> is_copying = false;
    std::atomic<bool> may_go_on = false;
    m_fake.OnCall("KELDFileCopy_r", [&] {
        if (is_copying.exchange(true)) return;
        WaitUntil([&] { return may_go_on.load(); });
    });
    const uint64_t task_id = AddRunningTask();
    ASSERT_EQ(0, PostMount("a"));
    WaitUntil([&] { return is_copying.load(); });
    PObject request = ForTask(task_id);
    for (const char* key :
         {"custom_name", "custom_ext", "black_name", "black_ext", "white_name", "white_ext"}) {
        request[key] = List({});  // an empty white list refuses everything
    }
    EXPECT_THAT(Send("set_filter_setting", request), IsSuccess());
    may_go_on = true;
    WaitUntil([this] { return OnlyTask()["task_status"].AsString() == "successful"; });
    EXPECT_EQ(1u, m_fake.Copies().size());
}

}  // namespace
