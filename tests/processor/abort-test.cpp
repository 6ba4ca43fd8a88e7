// Aborts. Tasks are cancelled thousands of times at random moments, with the real worker threads at
// work. A lost abort shows as a hang, which the time limit of the test program ends.

#include <atomic>
#include <random>
#include <thread>

#include "event/event-generator.h"
#include "event/event-manager.h"
#include "processor/barrier.h"
#include "processor/file-processor.h"
#include "processor/hardware-controller.h"
#include "processor/task-event-manager.h"
#include "processor/task-processor.h"
#include "utils/error-code.h"
#include "utils/log.h"
#include "worker-fixture.h"

namespace {

// Cancels that hit a task in the hands of the task worker, and of the file worker.
constexpr int kTaskHits = 1000;
constexpr int kEventHits = 1000;
constexpr int kTasks = 3;

// Drops the log lines: with a copy of each in memory the test would be about that.
class QuietLog {
public:
    QuietLog() {
        LogSetSink([](int, std::string_view) {});
    }
    ~QuietLog() { LogSetSink(nullptr); }
};

uint32_t Random(uint32_t bound) {
    thread_local std::mt19937 random(
        static_cast<uint32_t>(std::hash<std::thread::id>()(std::this_thread::get_id())));
    return random() % bound;
}

class AbortStressTest : public WorkerFixture {
protected:
    AbortStressTest() {
        Processor::SetWaitStepForTest(50);
        m_strategy->task_script = [this](ScriptedTaskHandler& handler) { return RunTask(handler); };
        m_strategy->file_script = [this](const HandlerCall& call) { return RunEvent(call); };
        for (int i = 0; i < kTasks; ++i) AddTask("task" + std::to_string(i));
    }

    int RunTask(ScriptedTaskHandler& handler) {
        const uint64_t task_id = handler.GetTask()->task_id;
        m_task_in_work = task_id;
        EventGenerator(task_id).PushScanEvent("/");
        const int result = AwaitEvents(handler, task_id);
        m_task_in_work = 0;
        return result;
    }
    static int AwaitEvents(ScriptedTaskHandler& handler, uint64_t task_id) {
        while (EventManager::GetInstance().GetEventCount(task_id) != 0) {
            if (handler.GetProcessorStatus() == PROCESSOR_STOPPED) return ERR_PROCESS_STOPPED;
            if (handler.GetAbortFlag()->load() != 0) return ERR_INTERRUPTED;
            usleep(50);
        }
        const int outcomes[] = {ERR_SUCCESS, ERR_SUCCESS, ERR_IO, ERR_WAIT_NOTIFY};
        return outcomes[Random(4)];
    }

    int RunEvent(const HandlerCall& call) {
        const uint64_t task_id = call.context.event.task_id;
        m_event_in_work = task_id;
        if (call.context.event.path.size() < 6) {
            const EventGenerator generator(task_id);
            for (uint32_t i = 0; i <= Random(3); ++i) {
                generator.PushScanEvent(call.context.event.path + "/" + std::to_string(i));
            }
        }
        int result = ERR_IGNORE;
        for (uint32_t i = 0; i < Random(6); ++i) {
            if (call.abort_flag->load() != 0) result = ERR_INTERRUPTED;
            usleep(20);
        }
        if (result == ERR_IGNORE) {
            const int outcomes[] = {ERR_IGNORE, ERR_IGNORE, ERR_IGNORE, ERR_IO,
                                    ERR_DST_PARENT_MISS};
            result = outcomes[Random(5)];
        }
        m_event_in_work = 0;
        return result;
    }

    // As the daemon does it.
    void PauseProcessors() {
        m_task_worker.Pause();
        m_file_worker.Pause();
    }
    void ResumeProcessors() {
        m_task_worker.Resume();
        m_file_worker.Resume();
    }
    void AbortTask(uint64_t task_id) {
        Barrier barrier;
        m_task_worker.Abort(task_id, &barrier);
        m_file_worker.Abort(task_id, &barrier);
        barrier.Wait();
    }
    void ExpectOutOfWork(uint64_t task_id) {
        EXPECT_NE(task_id, m_task_in_work);
        EXPECT_NE(task_id, m_event_in_work);
        EXPECT_NE(task_id, m_task_worker.GetCurrentTaskId());
        EXPECT_NE(task_id, m_file_worker.GetCurrentTaskId());
    }
    void CancelTask(uint64_t task_id) {
        PauseProcessors();
        AbortTask(task_id);
        ExpectOutOfWork(task_id);
        EventManager::GetInstance().RemoveTask(task_id);
        TaskEventManager::GetInstance().RemoveEvent(task_id);
        HardwareController::GetInstance().NotifyHWController();
        if (Random(4) == 0) usleep(Random(300));
        ExpectOutOfWork(task_id);
        EXPECT_EQ(0U, EventManager::GetInstance().GetEventCount(task_id));
        ResumeProcessors();
        // Not to be run again, not even from a retry that was waiting.
        usleep(Random(200));
        ExpectOutOfWork(task_id);
        EXPECT_FALSE(TaskEventManager::GetInstance().IsProcessing(task_id));
    }

    QuietLog m_quiet_log;
    TaskProcessor m_task_worker;
    FileProcessor m_file_worker;
    std::atomic<uint64_t> m_task_in_work{0};
    std::atomic<uint64_t> m_event_in_work{0};
};

TEST_F(AbortStressTest, ACancelledTaskIsOutOfWorkAndNothingHangs) {
    ASSERT_EQ(0, m_task_worker.Start());
    ASSERT_EQ(0, m_file_worker.Start());
    ASSERT_EQ(0, HardwareController::GetInstance().Start());
    int task_hits = 0;
    int event_hits = 0;
    while ((task_hits < kTaskHits || event_hits < kEventHits) && !HasFailure()) {
        for (const uint64_t task_id : m_tasks) {
            if (Random(3) != 0) TaskEventManager::GetInstance().PushEvent(task_id);
        }
        usleep(Random(1500));
        // Often the one that runs, to have something to abort.
        const uint64_t running = m_task_worker.GetCurrentTaskId();
        const uint64_t target = running != 0 && Random(4) != 0 ? running : m_tasks[Random(kTasks)];
        if (target == m_task_worker.GetCurrentTaskId()) ++task_hits;
        if (target == m_file_worker.GetCurrentTaskId()) ++event_hits;
        CancelTask(target);
    }
    // The end of the daemon.
    PauseProcessors();
    for (const uint64_t task_id : m_tasks) {
        AbortTask(task_id);
        EventManager::GetInstance().RemoveTask(task_id);
        TaskEventManager::GetInstance().RemoveEvent(task_id);
    }
    m_task_worker.Stop();
    m_file_worker.Stop();
    HardwareController::GetInstance().Stop();
    EXPECT_EQ(0, m_task_worker.Join());
    EXPECT_EQ(0, m_file_worker.Join());
    EXPECT_EQ(0, HardwareController::GetInstance().Join());
}

// An abort that comes between the pull of work and the note of what it is: the log line of the pull
// is where another thread gets its chance.
class AbortDuringPullTest : public WorkerFixture {
protected:
    AbortDuringPullTest() {
        s_test = this;
        m_strategy->task_script = [this](ScriptedTaskHandler& handler) {
            return AwaitFlag(handler.GetAbortFlag());
        };
        m_strategy->file_script = [this](const HandlerCall& call) {
            return AwaitFlag(call.abort_flag);
        };
        m_task = AddTask("holiday");
        Processor::SetWaitStepForTest(1000);
    }
    ~AbortDuringPullTest() override { LogSetSink(nullptr); }

    // Runs the worker until it has pulled its work and been aborted meanwhile.
    void RunAndAbort(WorkerProcessor& worker, const std::string& pull_line) {
        m_worker = &worker;
        m_pull_line = pull_line;
        LogSetSink([](int, std::string_view line) { s_test->OnLine(line); });
        ASSERT_EQ(0, worker.Start());
        while (!m_is_aborted) sched_yield();
        m_control.join();
        EXPECT_EQ(0U, m_task_after_wait);
        EXPECT_TRUE(m_was_told);
        LogSetSink(nullptr);
        worker.Stop();
        EXPECT_EQ(0, worker.Join());
    }

    static AbortDuringPullTest* s_test;
    uint64_t m_task = 0;

private:
    // The work goes on until it is told to end; an abort that was lost would leave it for ever.
    int AwaitFlag(const std::atomic<int>* abort_flag) {
        for (int i = 0; i < 20000 && abort_flag->load() == 0; ++i) usleep(1000);
        m_was_told = abort_flag->load() != 0;
        return ERR_INTERRUPTED;
    }
    void OnLine(std::string_view line) {
        if (line.find(m_pull_line) == std::string_view::npos || m_control.joinable()) return;
        m_control = std::thread([this] {
            m_worker->Pause();
            Barrier barrier;
            m_worker->Abort(m_task, &barrier);
            barrier.Wait();
            m_task_after_wait = m_worker->GetCurrentTaskId();
            m_is_aborted = true;
        });
        usleep(20000);  // a chance for it; it must not get through before the work is noted
    }

    std::atomic<bool> m_was_told{false};
    WorkerProcessor* m_worker = nullptr;
    std::string m_pull_line;
    std::thread m_control;
    std::atomic<uint64_t> m_task_after_wait{99};
    std::atomic<bool> m_is_aborted{false};
};

AbortDuringPullTest* AbortDuringPullTest::s_test = nullptr;

TEST_F(AbortDuringPullTest, TheTaskWorkerIsWaitedFor) {
    TaskProcessor worker;
    TaskEventManager::GetInstance().PushEvent(m_task);
    RunAndAbort(worker, "TaskEventManager: PullEvent");
}

TEST_F(AbortDuringPullTest, TheFileWorkerIsWaitedFor) {
    FileProcessor worker;
    TaskEntryHandler::GetInstance().SetTaskState(m_task, TASK_RUN_STATE_RUNNING);
    EventGenerator(m_task).PushScanEvent("/");
    RunAndAbort(worker, "EventManager::PullEvent");
}

}  // namespace
