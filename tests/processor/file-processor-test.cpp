#include "processor/file-processor.h"

#include "event/event-generator.h"
#include "event/event-manager.h"
#include "event/event-text.h"
#include "platform/error-handler.h"
#include "processor/barrier.h"
#include "utils/error-code.h"
#include "worker-fixture.h"

namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

// The worker without its thread: the test makes the passes of the loop.
class SteppedFileProcessor : public FileProcessor {
public:
    SteppedFileProcessor() { SetStatus(PROCESSOR_RUNNING); }
    using FileProcessor::RunOnce;
    using WorkerProcessor::ReachBarrier;
};

class FileProcessorTest : public WorkerFixture {
protected:
    FileProcessorTest() {
        m_strategy->file_script = [this](const HandlerCall& call) {
            m_calls.push_back(std::string(call.kind) + " " + call.context.event.path);
            if (m_on_call) m_on_call(call);
            return m_result;
        };
        m_task = AddTask("holiday");
        TaskEntryHandler::GetInstance().SetTaskState(m_task, TASK_RUN_STATE_RUNNING);
        m_generator = std::make_unique<EventGenerator>(m_task);
        m_dir.Write("usb/holiday/a.jpg", "picture");
    }
    size_t EventCount() const { return EventManager::GetInstance().GetEventCount(m_task); }

    uint64_t m_task = 0;
    std::unique_ptr<EventGenerator> m_generator;
    int m_result = ERR_IGNORE;
    std::function<void(const HandlerCall&)> m_on_call;
    std::vector<std::string> m_calls;
    LogCapture m_log;
    SteppedFileProcessor m_worker;
};

TEST_F(FileProcessorTest, AnIdleWorkerHasNothingInHand) {
    m_worker.RunOnce();
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
    EXPECT_EQ("", m_worker.GetCurrentPath());
    EXPECT_THAT(m_calls, IsEmpty());
}

TEST_F(FileProcessorTest, EachKindOfEventGoesToItsHandler) {
    const struct {
        Event event;
        const char* call;
        const char* line;
        const char* failure;
    } cases[] = {
        {{EV_CREATE, WAITTING, m_task, "/", 3},
         "scan /",      "scaning directory '%'",
         "Failed to handle scan event"  },
        {{EV_REMOVE, WAITTING, m_task, "/a.jpg", 2},
         "scan /a.jpg", "scaning directory '%/a.jpg'",
         "Failed to handle scan event"  },
        {{EV_REMOVE, WAITTING, m_task, "/d", 1},
         "remove /d",   "Remove '%/d', is_dir '1'",
         "Failed to handle remove event"},
        {{EV_CREATE, WAITTING, m_task, "/d", 1},
         "create /d",   "Create '%/d', is_dir '1'",
         "Failed to handle create event"},
        {{EV_COPY, WAITTING, m_task, "/a.jpg", 0},
         "copy /a.jpg", "Copy '%/a.jpg', is_dir '0'",
         "Failed to handle copy event"  },
        {{static_cast<EventType>(9), WAITTING, m_task, "/a.jpg", 0},
         "copy /a.jpg", "Copy '%/a.jpg', is_dir '0'",
         "Failed to handle copy event"  },
    };
    for (const auto& c : cases) {
        m_calls.clear();
        m_log.Clear();
        EventManager::GetInstance().PushEvent(c.event);
        Event running = c.event;
        running.status = PROCESSING;
        m_worker.RunOnce();
        EXPECT_THAT(m_calls, ElementsAre(c.call));
        std::string line = c.line;
        line.replace(line.find('%'), 1, m_usb + "/holiday");
        EXPECT_TRUE(m_log.Has("[INFO] FileProcessor (-1): " + line)) << line;
        EXPECT_TRUE(m_log.Has("[ERR] FileProcessor (-1): " + std::string(c.failure) + " '" +
                              ToString(running) + "'"));
        EXPECT_EQ(0U, EventCount());  // "Ignore this error" is done
    }
}

TEST_F(FileProcessorTest, AHandlerFindsTheContextTheProcessorAndTheAbortFlag) {
    m_generator->PushCopyFileEvent("/a.jpg");
    int flag = -1;
    m_on_call = [&](const HandlerCall& call) {
        EXPECT_EQ(m_usb + "/holiday/a.jpg", call.context.src_full_path);
        EXPECT_EQ(m_share + "/holiday/a.jpg", call.context.dst_full_path);
        EXPECT_EQ("holiday", call.context.task.task_name);
        EXPECT_EQ(m_worker.GetID(), call.processor_id);
        EXPECT_EQ(m_usb + "/holiday/a.jpg", m_worker.GetCurrentPath());
        EXPECT_EQ(m_task, m_worker.GetCurrentTaskId());
        EXPECT_EQ(0, call.abort_flag->load());
        m_worker.SetAbortFlag(true);
        flag = call.abort_flag->load();
    };
    m_worker.RunOnce();
    EXPECT_EQ(1, flag);
    EXPECT_EQ("", m_worker.GetCurrentPath());
}

TEST_F(FileProcessorTest, AStrategyWithoutHandlersIsASystemError) {
    m_strategy->has_handlers = false;
    const struct {
        void (*push)(const EventGenerator&);
        const char* factory;
    } cases[] = {
        {[](const EventGenerator& g) { g.PushScanEvent("/"); },           "GetScanHandler"  },
        {[](const EventGenerator& g) { g.PushRemoveEvent("/r", false); }, "GetRemoveHandler"},
        {[](const EventGenerator& g) { g.PushCreateDirEvent("/d"); },     "GetCreateHandler"},
        {[](const EventGenerator& g) { g.PushCopyFileEvent("/f"); },      "GetCopyHandler"  },
    };
    for (const auto& c : cases) {
        m_log.Clear();
        c.push(*m_generator);
        while (EventCount() != 0) m_worker.RunOnce();
        EXPECT_TRUE(m_log.Has("[ERR] FileProcessor (-1): Failed to " + std::string(c.factory) +
                              " [task: " + std::to_string(m_task) + "]"));
        EXPECT_TRUE(m_log.Has("[INFO] FileProcessor (-1): HandleError: System error."));
    }
    EXPECT_EQ(ERR_SYSTEM, Ferrix::ErrorHandler::GetInstance().Get(m_task));
}

TEST_F(FileProcessorTest, AnIoErrorIsTriedFourTimesAndLoggedOnce) {
    m_result = ERR_IO;
    m_generator->PushScanEvent("/a.jpg");
    for (int i = 1; i <= 3; ++i) {
        m_worker.RunOnce();
        EXPECT_EQ(1U, EventCount());
        EXPECT_EQ(m_task, m_worker.GetCurrentTaskId());
        EXPECT_THAT(LogRows(), IsEmpty());
    }
    m_worker.RunOnce();
    EXPECT_EQ(4U, m_calls.size());
    EXPECT_EQ(0U, EventCount());
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
    EXPECT_THAT(LogRows(), ElementsAre("1000 -2 [\"holiday\",\"a.jpg\"]"));
    EXPECT_EQ(ERR_IO, Ferrix::ErrorHandler::GetInstance().Get(m_task));
    EXPECT_TRUE(
        m_log.Has("[INFO] GetEvent: current event is valid: Event<EV_CREATE> (PROCESSING): [" +
                  std::to_string(m_task) + "] /a.jpg (scan,dir)"));
}

TEST_F(FileProcessorTest, OtherFilesGoOnAfterAFailedOne) {
    m_result = ERR_IO;
    m_generator->PushScanEvent("/bad");
    m_generator->PushScanEvent("/good");
    for (int i = 0; i < 4; ++i) m_worker.RunOnce();
    m_result = ERR_IGNORE;
    m_worker.RunOnce();
    EXPECT_EQ("scan /good", m_calls.back());
    EXPECT_EQ(0U, EventCount());
}

TEST_F(FileProcessorTest, AMissingParentFolderGivesTheEventBackWithARowEachTime) {
    m_result = ERR_DST_PARENT_MISS;
    m_generator->PushScanEvent("/a.jpg");
    for (size_t i = 1; i <= 6; ++i) {
        m_worker.RunOnce();
        EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
        EXPECT_EQ(1U, EventCount());
        EXPECT_EQ(i, LogRows().size());
    }
    Event event;
    ASSERT_EQ(1, EventManager::GetInstance().PullEvent(&m_worker, event));  // it waits again
}

TEST_F(FileProcessorTest, IgnorableOutcomesGiveNoRow) {
    for (const int code : {ERR_IGNORE, ERR_DST_EXISTS, ERR_DST_TYPE_CONFLICT}) {
        m_result = code;
        m_generator->PushScanEvent("/a.jpg");
        for (int i = 0; i < 4; ++i) m_worker.RunOnce();
        EXPECT_EQ(0U, EventCount()) << code;
    }
    EXPECT_THAT(LogRows(), IsEmpty());
    EXPECT_EQ(0, Ferrix::ErrorHandler::GetInstance().Get(m_task));
}

TEST_F(FileProcessorTest, StoppedWorkStaysInHand) {
    m_result = ERR_PROCESS_STOPPED;
    m_generator->PushScanEvent("/a.jpg");
    m_worker.RunOnce();
    EXPECT_EQ(m_task, m_worker.GetCurrentTaskId());
    EXPECT_EQ(1U, EventCount());
    EXPECT_TRUE(m_log.Has("[DBG] FileProcessor (-1): HandleAction (3)"));
}

TEST_F(FileProcessorTest, AnUnknownOutcomeIsASystemError) {
    m_result = -24;
    m_generator->PushScanEvent("/a.jpg");
    m_worker.RunOnce();
    EXPECT_TRUE(
        m_log.Has("[CRIT] FileProcessor (-1): unknown error code [-24] -> set errror code [-3]."));
    EXPECT_EQ(ERR_SYSTEM, Ferrix::ErrorHandler::GetInstance().Get(m_task));
}

TEST_F(FileProcessorTest, AFailedRowIsToldTwiceAndChangesNothing) {
    LogDB::GetInstance().Close();
    m_result = ERR_SRC_MISS;
    m_generator->PushScanEvent("/a.jpg");
    for (int i = 0; i < 4; ++i) m_worker.RunOnce();
    EXPECT_EQ(2, m_log.Count("[ERR] FileProcessor (-1): Failed to add log info to log db for '" +
                             std::to_string(m_task) + "'"));
    EXPECT_EQ(0U, EventCount());
}

TEST_F(FileProcessorTest, AnEventOfARemovedTaskIsDone) {
    m_generator->PushCopyFileEvent("/a.jpg");
    TaskEntryHandler::GetInstance().RemoveTaskEntry(m_task);
    m_worker.RunOnce();
    EXPECT_TRUE(
        m_log.Has("[NOTICE] task entry (with task " + std::to_string(m_task) + ") is removed"));
    EXPECT_THAT(m_calls, IsEmpty());
    EXPECT_EQ(0U, EventCount());
}

TEST_F(FileProcessorTest, AnEventOfARemovedDeviceIsDone) {
    m_generator->PushCopyFileEvent("/a.jpg");
    TaskEntryHandler::GetInstance().RemoveUSBEntry(USB_ID);
    m_worker.RunOnce();
    EXPECT_TRUE(m_log.Has("[NOTICE] usb entry (with task " + std::to_string(m_task) +
                          ", usb 1) is removed"));
    EXPECT_EQ(0U, EventCount());
}

TEST_F(FileProcessorTest, AnEventOfATaskRemovedDuringTheRetryWaitIsDone) {
    m_result = ERR_IO;
    m_generator->PushScanEvent("/a.jpg");
    m_worker.RunOnce();
    TaskEntryHandler::GetInstance().RemoveTaskEntry(m_task);
    EventManager::GetInstance().RemoveTask(m_task);
    m_worker.RunOnce();
    EXPECT_EQ(1U, m_calls.size());
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
    EXPECT_TRUE(m_log.Contains("Can not get event pool for current task"));
    m_worker.RunOnce();
}

TEST_F(FileProcessorTest, TheRetriesOfADroppedEventDoNotCountForTheNext) {
    m_result = ERR_IO;
    m_generator->PushScanEvent("/a.jpg");
    for (int i = 0; i < 3; ++i) m_worker.RunOnce();
    m_worker.RunOnce();  // the fourth ends it
    m_calls.clear();
    m_generator->PushScanEvent("/b");
    for (int i = 0; i < 2; ++i) m_worker.RunOnce();
    TaskEntryHandler::GetInstance().SetTaskState(m_task, TASK_RUN_STATE_CANCELING);
    m_worker.RunOnce();  // given back in the middle of its retries
    TaskEntryHandler::GetInstance().SetTaskState(m_task, TASK_RUN_STATE_RUNNING);
    m_calls.clear();
    while (EventCount() != 0) m_worker.RunOnce();
    EXPECT_EQ(4U, m_calls.size());
}

TEST_F(FileProcessorTest, AnEventOfATaskThatDoesNotRunIsGivenBack) {
    for (const int state : {TASK_RUN_STATE_CANCELING, TASK_RUN_STATE_IDLE}) {
        m_generator->PushCopyFileEvent("/a.jpg");
        TaskEntryHandler::GetInstance().SetTaskState(m_task, state);
        m_worker.RunOnce();
        EXPECT_THAT(m_calls, IsEmpty());
        EXPECT_EQ(1U, EventCount());
        EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
        EXPECT_TRUE(
            m_log.Has("[DBG] FileProcessor (-1): task " + std::to_string(m_task) +
                      " is not running, process this event (Event<EV_COPY> (PROCESSING): [" +
                      std::to_string(m_task) + "] /a.jpg (file_op,file)) later"));
    }
    TaskEntryHandler::GetInstance().SetTaskState(m_task, TASK_RUN_STATE_RUNNING);
    m_worker.RunOnce();
    EXPECT_THAT(m_calls, ElementsAre("copy /a.jpg"));
}

TEST_F(FileProcessorTest, AFailedGivingBackIsLogged) {
    m_result = ERR_DST_PARENT_MISS;
    m_generator->PushScanEvent("/a.jpg");
    m_on_call = [this](const HandlerCall&) { EventManager::GetInstance().RemoveTask(m_task); };
    m_worker.RunOnce();
    EXPECT_TRUE(m_log.Has("[ERR] FileProcessor (-1): failed to redo event"));
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
}

TEST_F(FileProcessorTest, APausedWorkerTakesNothing) {
    m_generator->PushScanEvent("/");
    m_worker.Pause();
    m_worker.RunOnce();
    EXPECT_EQ(0U, m_worker.GetCurrentTaskId());
    EXPECT_THAT(m_calls, IsEmpty());
}

TEST_F(FileProcessorTest, AbortOfATaskThatIsNotInHandIsNotWaitedFor) {
    Barrier barrier;
    m_worker.Abort(m_task, &barrier);
    barrier.Wait();
    m_worker.Abort(m_task, nullptr);
    EXPECT_FALSE(m_log.Contains("register barrier"));
}

TEST_F(FileProcessorTest, AnAbortDuringTheWorkSetsTheFlag) {
    m_generator->PushScanEvent("/");
    int flag = -1;
    m_on_call = [&](const HandlerCall& call) {
        m_worker.Abort(m_task + 1, nullptr);
        EXPECT_EQ(0, call.abort_flag->load());
        m_worker.Abort(m_task, nullptr);
        flag = call.abort_flag->load();
    };
    m_worker.RunOnce();
    EXPECT_EQ(1, flag);
}

TEST_F(FileProcessorTest, StopSetsTheAbortFlag) {
    m_generator->PushScanEvent("/");
    int flag = -1;
    m_on_call = [&](const HandlerCall& call) {
        m_worker.Stop();
        flag = call.abort_flag->load();
    };
    m_worker.RunOnce();
    EXPECT_EQ(1, flag);
    EXPECT_EQ(PROCESSOR_STOPPED, m_worker.GetStatus());
}

// A retry that waits while its task is aborted must not run again when the worker is resumed.
TEST_F(FileProcessorTest, WorkInHandIsGivenBackAtABarrier) {
    FileProcessor worker;
    std::atomic<int> calls{0};
    m_strategy->file_script = [&](const HandlerCall&) {
        ++calls;
        return ERR_IO;
    };
    Processor::SetWaitStepForTest(1000);
    m_generator->PushScanEvent("/a.jpg");
    ASSERT_EQ(0, worker.Start());
    while (calls == 0) sched_yield();
    worker.Pause();
    {
        Barrier barrier;
        worker.Abort(m_task, &barrier);
        barrier.Wait();
    }
    EXPECT_EQ(0U, worker.GetCurrentTaskId());
    const int calls_before = calls;
    EventManager::GetInstance().RemoveTask(m_task);
    worker.Resume();
    for (int i = 0; i < 20; ++i) usleep(1000);
    EXPECT_EQ(calls_before, calls);
    worker.Stop();
    EXPECT_EQ(0, worker.Join());
    EXPECT_TRUE(m_log.Contains("FileProcessor ("));
    EXPECT_TRUE(m_log.Contains(") up."));
    EXPECT_TRUE(m_log.Contains(") down."));
}

}  // namespace
