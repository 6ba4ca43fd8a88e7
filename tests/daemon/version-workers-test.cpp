// Version tasks that are cancelled while the workers are at work.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>

#include "db/log-description.h"
#include "event/event-manager.h"
#include "processor/task-event-manager.h"
#include "workers-fixture.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::EndsWith;
using testing::SizeIs;

constexpr int INTERRUPTED = -1;

class VersionWorkersTest : public WorkersTest {
protected:
    // A device with five files, and a version task that keeps one version.
    VersionWorkersTest() {
        PlugIn("a", "u-a");
        for (int i = 0; i < FILES; ++i) m_dir.Write("m/a/f" + std::to_string(i), "content");
        PObject request = AddRequest("a", "u-a");
        request["copy_strategy"] = static_cast<int>(COPY_STRATEGY_VERSION);
        request["eject_when_task_done"] = false;
        request["enable_rotation"] = true;
        request["max_version_count"] = 1;
        const PObject response = Send("add_task", request);
        EXPECT_THAT(response, IsSuccess());
        m_task_id = response["task_id"].AsUInt64();
    }
    std::string Share() const { return m_volume + "/photos/"; }
    void AddVersion(const std::string& name) {
        m_dir.Write("v1/photos/" + name + "/file", "content");
    }
    std::vector<std::string> Versions() const {
        std::vector<std::string> names;
        for (const auto& entry : fs::directory_iterator(Share())) {
            names.push_back(entry.path().filename().string());
        }
        std::sort(names.begin(), names.end());
        return names;
    }
    size_t Files(const std::string& version) const {
        return static_cast<size_t>(
            std::distance(fs::directory_iterator(Share() + version), fs::directory_iterator()));
    }
    // A worker that has the task in hand is given its barrier behind the flag.
    bool IsAbortFlagSet() const {
        const std::vector<std::string> lines = m_log.Lines();
        const auto has = [](const char* text) {
            return [text](const std::string& line) { return line.find(text) != line.npos; };
        };
        const auto abort = std::find_if(lines.begin(), lines.end(), has("Ferrixd: AbortTask"));
        return std::find_if(abort, lines.end(), has("register barrier")) != lines.end();
    }
    void Cancel() {
        EXPECT_THAT(Send("cancel_task", ForTask(m_task_id)), IsSuccess());
        EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(m_task_id));
        EXPECT_FALSE(TaskEventManager::GetInstance().IsProcessing(m_task_id));
        EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(m_task_id));
        EXPECT_EQ("failed", Status(m_task_id));
        EXPECT_EQ(INTERRUPTED, Task(m_task_id).error);
        EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_TASK_STOPPED));
        EXPECT_FALSE(fs::exists(TaskFolder(m_task_id) + "/version-marks"));
    }

    static constexpr int FILES = 5;
    static constexpr char OLDEST[] = "Ferrix Copy_2024-03-07_141502";
    static constexpr char MIDDLE[] = "Ferrix Copy_2024-03-08_141502";
    static constexpr char NEWEST[] = "Ferrix Copy_2024-03-09_141502";
    uint64_t m_task_id = 0;
};

TEST_F(VersionWorkersTest, AVersionThatIsCancelledInItsCopyingIsBadAndNothingIsRotated) {
    AddVersion(OLDEST);
    AddVersion(MIDDLE);
    const auto gate = HoldCopies();
    ASSERT_THAT(Send("run_task", ForTask(m_task_id)), IsSuccess());
    gate->WaitForWorker();
    Cancel();
    ASSERT_THAT(Versions(), ElementsAre(OLDEST, MIDDLE, EndsWith(".Bad")));
    EXPECT_GT(FILES, static_cast<int>(Files(Versions().back())));
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_ROTATED));
}

TEST_F(VersionWorkersTest, ACancelDuringTheRotationLeavesWholeVersionsOnly) {
    for (const char* name : {OLDEST, MIDDLE, NEWEST}) AddVersion(name);
    const auto gate = std::make_shared<Gate>();
    m_fake.OnCall("KELDEARemove", [gate, this] {
        if (fs::exists(Share() + OLDEST + "/file")) return;
        gate->Hold([this] { return IsAbortFlagSet(); });
    });
    ASSERT_THAT(Send("run_task", ForTask(m_task_id)), IsSuccess());
    gate->WaitForWorker();
    Cancel();
    ASSERT_THAT(Versions(), SizeIs(3));
    EXPECT_THAT(Versions(), ElementsAre(MIDDLE, NEWEST, testing::Not(EndsWith(".Bad"))));
    EXPECT_EQ(FILES, static_cast<int>(Files(Versions().back())));
    EXPECT_EQ(1u, Files(MIDDLE));
    EXPECT_EQ(1u, Files(NEWEST));
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_ROTATED));
    EXPECT_TRUE(m_log.Has("[WARN] DeleteVersionList: user stopped"));

    m_fake.OnCall("KELDEARemove", {});
    RunToTheEnd(m_task_id);
    EXPECT_EQ("successful", Status(m_task_id));
    EXPECT_FALSE(fs::exists(Share() + MIDDLE));
    EXPECT_FALSE(fs::exists(Share() + NEWEST));
}

}  // namespace
