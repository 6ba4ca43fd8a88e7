// Version tasks come into the registry like all others, and what a killed daemon has left of a run
// is settled on the way.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>

#include "command-fixture.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/task-handler.h"
#include "strategy/version-handler.h"
#include "strategy/version-mark.h"
#include "strategy/version-name.h"

namespace fs = std::filesystem;

namespace {

class VersionLoadTest : public CommandTest {
protected:
    VersionLoadTest() {
        AddShare("photos");
        PlugIn("a", "u-1");
        PObject request = AddRequest("a", "u-1");
        request["copy_strategy"] = 1;
        const PObject response = Send("add_task", request);
        EXPECT_THAT(response, IsSuccess());
        m_task_id = response["task_id"].AsUInt64();
    }
    std::string Version(const std::string& suffix = "") const {
        return m_volume + "/photos/Ferrix Copy_2024-03-09_141502" + suffix;
    }

    uint64_t m_task_id = 0;
};

TEST_F(VersionLoadTest, AnEntryHasItsStrategyAndAFolderOfTheDay) {
    const TaskRunInfo entry = Entry(m_task_id);
    EXPECT_NE(nullptr, dynamic_cast<VersionHandler*>(entry.strategy_handler.get()));
    const auto name = ParseVersionName(entry.version_dir);
    ASSERT_TRUE(name.has_value()) << entry.version_dir;
    EXPECT_FALSE(name->is_bad);
    const int64_t now = time(nullptr);
    EXPECT_NEAR(static_cast<double>(now), static_cast<double>(VersionTime(*name, now)), 60);
}

TEST_F(VersionLoadTest, AVersionThatAKilledDaemonHasLeftGetsABadName) {
    TaskRunInfo entry = Entry(m_task_id);
    entry.version_dir = "Ferrix Copy_2024-03-09_141502";
    ASSERT_EQ(0, PutVersionMarks(m_task_id, {MakeVersionMark(entry, VersionMark::FILLING)}));
    fs::create_directory(Version());
    ForgetEntries();
    EXPECT_TRUE(fs::exists(Version()));
    EXPECT_EQ(0, PostMount("a"));
    EXPECT_TRUE(IsLoaded(m_task_id));
    EXPECT_FALSE(fs::exists(Version()));
    EXPECT_TRUE(fs::exists(Version(".Bad")));
}

}  // namespace
