// Commands and hooks while the workers are at work.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "workers-fixture.h"

namespace {

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
