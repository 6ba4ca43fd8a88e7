// "enable_task" and "disable_task".
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "command-fixture.h"
#include "daemon/usb-matcher.h"
#include "db/log-description.h"
#include "db/task-db.h"
#include "event/event-generator.h"
#include "event/event-manager.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr int FRONT_USB = 99;

class DefaultTaskTest : public CommandTest {
protected:
    // The USB default task.
    uint64_t Default(bool is_enable) { return AddDefaultTask(DEFAULT_USB_UUID, is_enable); }
    PObject Enable(uint64_t task_id) { return Send("enable_task", ForTask(task_id)); }
    PObject Disable(uint64_t task_id) { return Send("disable_task", ForTask(task_id)); }
    // A device at the front port, without a task of its own.
    void PlugInFront(const std::string& name) {
        PlugIn(name, "u-" + name, FRONT_USB);
        PostMount(name);
    }
    uint64_t AddUserTask() {
        PlugIn("own", "u-own");
        return AddTask("own", "u-own");
    }
    static bool HasDeviceEntry(uint64_t usb_id) {
        USBRunInfo usb;
        return TaskEntryHandler::GetInstance().GetUSBEntry(usb_id, usb) == 0;
    }
    std::string Status(uint64_t task_id) {
        return Send("get_task_setting", ForTask(task_id))["task_status"].AsString();
    }
};

// --- "enable_task"

TEST_F(DefaultTaskTest, EnablingTakesEffectOnADeviceThatIsPluggedInAlready) {
    const uint64_t task_id = Default(false);
    PlugInFront("a");
    EXPECT_EQ("disabled", Status(task_id));
    m_log.Clear();
    EXPECT_EQ("null", Enable(task_id).ToText());
    EXPECT_TRUE(Task(task_id).is_enable);
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_EQ(MountPath("a"), Entry(task_id).src_dir_path);
    EXPECT_EQ("initial", Status(task_id));
    EXPECT_THAT(LogTexts(LogDescription::LOG_DESC_DEFAULT_TASK_ENABLED),
                ElementsAre("[\"Default Ferrix\"]"));
    EXPECT_TRUE(m_log.Has("[INFO] Enable Task '1'"));
}

TEST_F(DefaultTaskTest, OfTwoCandidatesTheOneWhoseUuidSortsFirstIsTaken) {
    const uint64_t task_id = Default(false);
    PlugInFront("z");
    PlugInFront("a");
    ASSERT_THAT(Enable(task_id), IsSuccess());
    EXPECT_EQ(MountPath("a"), Entry(task_id).src_dir_path);
}

TEST_F(DefaultTaskTest, WithNoDeviceThereTheTaskIsEnabledAndWaits) {
    const uint64_t task_id = Default(false);
    EXPECT_EQ("null", Enable(task_id).ToText());
    EXPECT_TRUE(Task(task_id).is_enable);
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_EQ("unmounted", Status(task_id));
    EXPECT_TRUE(m_log.Has("[INFO] USB For default task is not mounted '1'"));
    PlugInFront("a");
    EXPECT_TRUE(IsLoaded(task_id));
}

TEST_F(DefaultTaskTest, EnablingTwiceChangesNothingTheSecondTime) {
    const uint64_t task_id = Default(false);
    PlugInFront("a");
    ASSERT_THAT(Enable(task_id), IsSuccess());
    const auto strategy = Entry(task_id).strategy_handler;
    EXPECT_THAT(Enable(task_id), IsSuccess());
    EXPECT_EQ(strategy, Entry(task_id).strategy_handler);
    EXPECT_TRUE(m_log.Has("[INFO] Task entry has already been loaded for task id '1'"));
    EXPECT_EQ(2u, LogRows(LogDescription::LOG_DESC_DEFAULT_TASK_ENABLED));
}

TEST_F(DefaultTaskTest, AUserTaskIsLeftAloneWithSuccess) {
    const uint64_t task_id = AddUserTask();
    m_log.Clear();
    EXPECT_EQ("null", Enable(task_id).ToText());
    EXPECT_TRUE(m_log.Has("[INFO] Current task '1' is NOT default task"));
    EXPECT_EQ("null", Disable(task_id).ToText());
    EXPECT_TRUE(m_log.Has("[INFO] Current task '1' is NOT default task 'u-own'"));
    EXPECT_TRUE(Task(task_id).is_enable);
    EXPECT_TRUE(IsLoaded(task_id));
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_DEFAULT_TASK_ENABLED));
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_DEFAULT_TASK_DISABLED));
}

// A task that cannot be read is no default task, and that is a success.
TEST_F(DefaultTaskTest, AnUnknownTaskIsLeftAloneWithSuccess) {
    for (const uint64_t task_id : {uint64_t{0}, uint64_t{99}}) {
        EXPECT_EQ("null", Enable(task_id).ToText());
        EXPECT_EQ("null", Disable(task_id).ToText());
    }
    EXPECT_TRUE(m_log.Has("[INFO] Current task '99' is NOT default task"));
    EXPECT_TRUE(m_log.Has("[INFO] Current task '99' is NOT default task ''"));
}

TEST_F(DefaultTaskTest, WithoutATaskIdBothAreRefused) {
    EXPECT_THAT(Send("enable_task"), IsError(1, "Invalid parameter"));
    EXPECT_THAT(Send("disable_task"), IsError(1, "Invalid parameter"));
    EXPECT_EQ(2, m_log.Count("[ERR] Invalid parameter"));
}

TEST_F(DefaultTaskTest, ADestinationThatCannotBeUsedKeepsTheTaskDisabled) {
    const uint64_t task_id = Default(false);
    TaskInfo task = Task(task_id);
    const auto set = [&](const std::string& share, const std::string& folder) {
        task.hub_share_name = share;
        task.hub_folder_path = folder;
        ASSERT_EQ(0, TaskDB::GetInstance().UpdateTaskInfo(task));
    };
    set("", "");  // as the installer leaves it
    EXPECT_THAT(Enable(task_id), IsError(11, "Failed to resolve import destination path."));
    EXPECT_TRUE(m_log.Has("[ERR] CheckImportDestPath() failed"));
    set("photos", "/missing");
    EXPECT_THAT(Enable(task_id), IsError(10, "Import destination path does not exist."));
    set("photos", "/");
    AddUserTask();
    EXPECT_THAT(Enable(task_id), IsError(9, "Duplicated destination path"));
    EXPECT_FALSE(Task(task_id).is_enable);
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_DEFAULT_TASK_ENABLED));
}

TEST_F(DefaultTaskTest, ARowThatCannotBeWrittenIsAFailureOfEnabling) {
    const uint64_t task_id = Default(false);
    BreakTable("task_info_table", "UPDATE");
    EXPECT_THAT(Enable(task_id), IsError(2, "Failed to update task info"));
    EXPECT_EQ(0u, LogRows(LogDescription::LOG_DESC_DEFAULT_TASK_ENABLED));
}

TEST_F(DefaultTaskTest, ALogRowThatCannotBeAddedIsAFailureOfEnabling) {
    const uint64_t task_id = Default(false);
    PlugInFront("a");
    BreakTable("log_info_table", "INSERT");
    EXPECT_THAT(Enable(task_id), IsError(2, "Failed to add log info to log db"));
    EXPECT_TRUE(Task(task_id).is_enable);
    EXPECT_FALSE(IsLoaded(task_id));
}

TEST_F(DefaultTaskTest, EntriesThatCannotBeLoadedAreAFailureOfEnabling) {
    const uint64_t task_id = Default(false);
    PlugInFront("a");
    // The table goes after the task was found to be a default task.
    m_fake.OnCall("KELDShareGet", [this] {
        m_fake.OnCall("KELDShareGet", {});
        DropTable("usb_info_table");
    });
    EXPECT_THAT(Enable(task_id), IsError(11, "Failed to LoadUSBTaskEntryByUSBID"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to add usb entry '1' and task entry"));
}

// --- "disable_task"

TEST_F(DefaultTaskTest, DisablingTakesTheTaskOutOfTheSystem) {
    const uint64_t task_id = Default(true);
    PlugInFront("a");
    TaskEventManager::GetInstance().PushEvent(task_id);
    EventGenerator(task_id).PushScanEvent("/");
    m_log.Clear();
    EXPECT_EQ("null", Disable(task_id).ToText());
    EXPECT_FALSE(Task(task_id).is_enable);
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_FALSE(HasDeviceEntry(Task(task_id).usb_id));
    EXPECT_FALSE(TaskEventManager::GetInstance().IsInReadyQueue(task_id));
    EXPECT_EQ(0u, EventManager::GetInstance().GetEventCount(task_id));
    EXPECT_EQ("disabled", Status(task_id));
    EXPECT_THAT(LogTexts(LogDescription::LOG_DESC_DEFAULT_TASK_DISABLED),
                ElementsAre("[\"Default Ferrix\"]"));
    EXPECT_TRUE(m_log.Has("[INFO] Remove usb '1'"));
    EXPECT_TRUE(m_log.Has("[INFO] Disable Task '1'"));
    EXPECT_EQ(1, m_log.Count("[INFO] Ferrixd: PauseProcessors"));
    EXPECT_EQ(1, m_log.Count("[INFO] Ferrixd: ResumeProcessors"));
}

TEST_F(DefaultTaskTest, ADisabledTaskServesNoDeviceUntilItIsEnabledAgain) {
    const uint64_t task_id = Default(true);
    PlugInFront("a");
    ASSERT_THAT(Disable(task_id), IsSuccess());
    EXPECT_THAT(Send("run_task", ForTask(task_id)), IsError(11, "Task is not runnable"));
    EXPECT_EQ(-1, PostMount("a"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_THAT(Enable(task_id), IsSuccess());
    EXPECT_TRUE(IsLoaded(task_id));
}

TEST_F(DefaultTaskTest, DisablingTwiceSucceeds) {
    const uint64_t task_id = Default(true);
    EXPECT_THAT(Disable(task_id), IsSuccess());
    EXPECT_THAT(Disable(task_id), IsSuccess());
    EXPECT_FALSE(Task(task_id).is_enable);
    EXPECT_EQ(2u, LogRows(LogDescription::LOG_DESC_DEFAULT_TASK_DISABLED));
}

TEST_F(DefaultTaskTest, ADisabledTaskBlocksNoDestination) {
    const uint64_t task_id = Default(true);
    PlugIn("own", "u-own");
    EXPECT_THAT(Send("add_task", AddRequest("own", "u-own")),
                IsError(9, "Duplicated destination path"));
    ASSERT_THAT(Disable(task_id), IsSuccess());
    EXPECT_THAT(Send("add_task", AddRequest("own", "u-own")), IsSuccess());
}

TEST_F(DefaultTaskTest, ARowThatCannotBeWrittenDoesNotStopTheDisabling) {
    const uint64_t task_id = Default(true);
    PlugInFront("a");
    BreakTable("task_info_table", "UPDATE");
    EXPECT_THAT(Disable(task_id), IsError(2, "Failed to update task info"));
    EXPECT_FALSE(IsLoaded(task_id));
    EXPECT_FALSE(HasDeviceEntry(Task(task_id).usb_id));
    EXPECT_EQ(1u, LogRows(LogDescription::LOG_DESC_DEFAULT_TASK_DISABLED));
    EXPECT_EQ(1, m_log.Count("[INFO] Ferrixd: ResumeProcessors"));
}

TEST_F(DefaultTaskTest, ALogRowThatCannotBeAddedIsAFailureOfDisabling) {
    const uint64_t task_id = Default(true);
    BreakTable("log_info_table", "INSERT");
    EXPECT_THAT(Disable(task_id), IsError(2, "Failed to add log info to log db"));
    EXPECT_FALSE(Task(task_id).is_enable);
    EXPECT_FALSE(m_log.Contains("Disable Task"));
    EXPECT_EQ(1, m_log.Count("[INFO] Ferrixd: ResumeProcessors"));
}

}  // namespace
