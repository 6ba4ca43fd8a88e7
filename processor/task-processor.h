// The worker that runs whole tasks, one at a time: takes a task id from TaskEventManager, prepares
// and runs it, records its outcome, tells the user, and does what follows a run (media index,
// eject). The file work of the task is done meanwhile by the file worker; the run waits for it.
//
// Threads: see WorkerProcessor.
#pragma once

#include "processor/task-event.h"
#include "processor/worker-processor.h"

class TaskProcessor : public WorkerProcessor {
public:
    TaskProcessor() = default;

    // They also show the state of the task in hand: canceling while paused, running again after.
    int Pause() override;
    int Resume() override;

    [[nodiscard]] uint64_t GetCurrentTaskId() const override { return m_task_event.task_id; }

protected:
    [[nodiscard]] const char* Name() const override { return "TaskProcessor"; }
    [[nodiscard]] int IdleSeconds() const override { return 5; }
    [[nodiscard]] int FailedPrepareSeconds() const override { return 5; }
    [[nodiscard]] int GetEvent() override;
    [[nodiscard]] int Prepare() override { return PrepareTask(); }
    [[nodiscard]] int Work() override { return RunTask(); }
    [[nodiscard]] int HandleError(int code) override;
    void HandleAction(int action) override;
    void DoneEvent() override;
    void RedoEvent() override;

private:
    int PrepareTask();
    int LoadRunInfo();
    int SetVersionDir(const TaskRunInfo& task);
    int RunTask();
    void LetGo();

    void StoreResult(int task_err_code);
    int AddTaskLog(bool is_end, int result);

    TaskEvent m_task_event;
};
