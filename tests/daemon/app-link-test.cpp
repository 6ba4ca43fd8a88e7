// "link", "stop" and the control of the workers.
#include "db/log-db.h"
#include "db/task-db.h"
#include "processor/file-processor.h"
#include "processor/hardware-controller.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"
#include "processor/task-processor.h"
#include "shell-fixture.h"

namespace {

class LinkTest : public ShellTest {
protected:
    static void AddEntries(uint64_t usb_id, uint64_t task_id) {
        USBRunInfo device;
        device.usb_id = usb_id;
        device.usb_share_path = "/volumeUSB1/usbshare";
        TaskEntryHandler::GetInstance().AddUSBEntry(device);
        TaskRunInfo task;
        task.task_id = task_id;
        task.usb_id = usb_id;
        TaskEntryHandler::GetInstance().AddTaskEntry(task);
    }
    [[nodiscard]] std::vector<int> Statuses() const {
        std::vector<int> statuses;
        for (size_t i = 0; i < FerrixdPeer::ProcessorCount(m_app); ++i) {
            statuses.push_back(FerrixdPeer::ProcessorAt(m_app, i)->GetStatus());
        }
        statuses.push_back(HardwareController::GetInstance().GetStatus());
        return statuses;
    }
};

using testing::ElementsAre;

constexpr int RUN = PROCESSOR_RUNNING;
constexpr int PAUSE = PROCESSOR_PAUSED;
constexpr int STOP = PROCESSOR_STOPPED;

TEST_F(LinkTest, LinkOpensTheDatabasesAndStartsTheWorkers) {
    EXPECT_FALSE(Handle(Action("link")).HasMember("error"));
    EXPECT_EQ(0, access((m_db_folder + "/task-db.sqlite").c_str(), F_OK));
    EXPECT_EQ(0, access((m_db_folder + "/log-db.sqlite").c_str(), F_OK));
    EXPECT_THAT(Statuses(), ElementsAre(RUN, RUN, RUN));
    EXPECT_NE(nullptr, dynamic_cast<TaskProcessor*>(FerrixdPeer::ProcessorAt(m_app, 0)));
    EXPECT_NE(nullptr, dynamic_cast<FileProcessor*>(FerrixdPeer::ProcessorAt(m_app, 1)));
    EXPECT_LT(PlaceOf("[INFO] link daemon, version: 0037"), PlaceOf("[DBG] totally 2 processors"));
    EXPECT_LT(PlaceOf("[DBG] totally 2 processors"), PlaceOf("[INFO] Ferrixd: StartAll"));
    EXPECT_LT(PlaceOf("[INFO] Ferrixd: StartAll"), PlaceOf("[INFO] Link Daemon"));
}

TEST_F(LinkTest, ASecondLinkChangesNothing) {
    Handle(Action("link"));
    Processor* worker = FerrixdPeer::ProcessorAt(m_app, 0);
    m_log.Clear();
    EXPECT_FALSE(Handle(Action("link")).HasMember("error"));
    EXPECT_EQ(worker, FerrixdPeer::ProcessorAt(m_app, 0));
    EXPECT_EQ(2U, FerrixdPeer::ProcessorCount(m_app));
    EXPECT_FALSE(m_log.Contains("link daemon"));
    EXPECT_FALSE(m_log.Contains("StartAll"));
}

TEST_F(LinkTest, WithoutATaskDatabaseLinkFailsAndTheOtherIsNotTried) {
    m_dir.MakeDir("v1/@Ferrix/db/task-db.sqlite");
    EXPECT_EQ("{\"error\": \"failed to initialize environment\", \"error_code\": 11}",
              Handle(Action("link")).ToText());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to init task db at '" + m_db_folder + "/task-db.sqlite'"));
    EXPECT_TRUE(m_log.Has("[ERR] failed to initialize environment"));
    EXPECT_NE(0, access((m_db_folder + "/log-db.sqlite").c_str(), F_OK));
    EXPECT_EQ(0U, FerrixdPeer::ProcessorCount(m_app));
}

TEST_F(LinkTest, WithoutALogDatabaseLinkFails) {
    m_dir.MakeDir("v1/@Ferrix/db/log-db.sqlite");
    EXPECT_EQ("{\"error\": \"failed to initialize environment\", \"error_code\": 11}",
              Handle(Action("link")).ToText());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to init log db at '" + m_db_folder + "/log-db.sqlite'"));
    EXPECT_EQ(0U, FerrixdPeer::ProcessorCount(m_app));
    TaskDB::GetInstance().Close();
}

TEST_F(LinkTest, StopTakesEverythingDownInOrder) {
    Handle(Action("link"));
    AddEntries(3, 7);
    AddEntries(4, 8);
    TaskEventManager::GetInstance().PushEvent(8);
    m_log.Clear();
    Handle(Action("stop"));
    EXPECT_FALSE(FerrixdPeer::IsRunning(m_app));
    EXPECT_EQ(0U, FerrixdPeer::ProcessorCount(m_app));
    EXPECT_THAT(Statuses(), ElementsAre(STOP));
    EXPECT_TRUE(TaskEntryHandler::GetInstance().IsTaskEntryEmpty());
    EXPECT_TRUE(TaskEntryHandler::GetInstance().IsUSBEntryEmpty());
    EXPECT_TRUE(TaskEventManager::GetInstance().IsReadyQueueEmpty());
    EXPECT_LT(PlaceOf("[INFO] Ferrixd: PauseProcessors"), PlaceOf("[INFO] Ferrixd: AbortTask '7'"));
    EXPECT_LT(PlaceOf("[INFO] Ferrixd: AbortTask '7'"), PlaceOf("[INFO] Ferrixd: AbortTask '8'"));
    EXPECT_LT(PlaceOf("[INFO] Ferrixd: AbortTask '8'"), PlaceOf("[INFO] Remove usb '3'"));
    EXPECT_LT(PlaceOf("[INFO] Remove usb '4'"), PlaceOf("[INFO] Unlink Daemon"));
    std::list<TaskInfo> tasks;
    EXPECT_EQ(-1, TaskDB::GetInstance().ListAllTaskInfo(tasks));  // closed
}

TEST_F(LinkTest, StopWithoutLinkEndsTheLoopAllTheSame) {
    Handle(Action("stop"));
    EXPECT_FALSE(FerrixdPeer::IsRunning(m_app));
    EXPECT_TRUE(m_log.Has("[INFO] Unlink Daemon"));
}

TEST_F(LinkTest, PauseAndResumeReachTheWorkersTheyName) {
    Handle(Action("link"));
    FerrixdPeer::PauseProcessors(m_app);
    EXPECT_THAT(Statuses(), ElementsAre(PAUSE, PAUSE, RUN));
    EXPECT_TRUE(m_log.Has("[INFO] Ferrixd: PauseProcessors"));
    FerrixdPeer::ResumeProcessors(m_app);
    EXPECT_THAT(Statuses(), ElementsAre(RUN, RUN, RUN));
    EXPECT_TRUE(m_log.Has("[INFO] Ferrixd: ResumeProcessors"));
    FerrixdPeer::PauseAll(m_app);
    EXPECT_THAT(Statuses(), ElementsAre(PAUSE, PAUSE, PAUSE));
    EXPECT_TRUE(m_log.Has("[INFO] Ferrixd: PauseAll"));
    FerrixdPeer::ResumeAll(m_app);
    EXPECT_THAT(Statuses(), ElementsAre(RUN, RUN, RUN));
    EXPECT_TRUE(m_log.Has("[INFO] Ferrixd: ResumeAll"));
}

TEST_F(LinkTest, AbortOfATaskThatNoWorkerHoldsReturnsAtOnce) {
    Handle(Action("link"));
    FerrixdPeer::PauseProcessors(m_app);
    FerrixdPeer::AbortTask(m_app, 5);
    EXPECT_TRUE(m_log.Has("[INFO] Ferrixd: AbortTask '5'"));
    EXPECT_FALSE(m_log.Contains("register barrier"));
    FerrixdPeer::ResumeProcessors(m_app);
}

TEST_F(LinkTest, AbortWithoutWorkersIsReported) {
    FerrixdPeer::AbortTask(m_app, 5);
    EXPECT_TRUE(m_log.Has("[ERR] Ferrixd: dynamic_cast failed"));
}

}  // namespace
