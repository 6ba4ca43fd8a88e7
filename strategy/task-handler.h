// One run of one task: checks that it can run, seeds the first scan, waits until all its events are
// done, and makes sure that what was copied is on the disk.
//
// Lives for one run, on the task worker's thread; Run() blocks it while the file worker does the
// events. The setters are called once before Run(); what they point to outlives the handler.
#pragma once

#include <atomic>

class Processor;
class RotationHandler;
struct TaskRunInfo;

class TaskHandler {
public:
    TaskHandler() = default;
    virtual ~TaskHandler();
    TaskHandler(const TaskHandler&) = delete;
    TaskHandler& operator=(const TaskHandler&) = delete;

    // Returns 0 or a negative ErrorCode. The single files' failures are not part of it: the file
    // worker reports them to the register of outcomes.
    [[nodiscard]] virtual int Run();

    void SetTask(const TaskRunInfo* task) { m_task = task; }
    void SetProcessor(Processor* processor) { m_processor = processor; }
    void SetAbortFlag(const std::atomic<int>* abort_flag) { m_abort_flag = abort_flag; }
    [[nodiscard]] const TaskRunInfo* GetTask() const { return m_task; }
    [[nodiscard]] const std::atomic<int>* GetAbortFlag() const { return m_abort_flag; }
    [[nodiscard]] int GetProcessorId() const;
    [[nodiscard]] int GetProcessorStatus() const;

protected:
    // The three steps of a run, each 0 or a negative ErrorCode.
    [[nodiscard]] virtual int PreHandle();
    virtual int DoHandle();
    [[nodiscard]] virtual int PostHandle();

    // Returns 0 once the task has no event left; "Process stopped" or "Interrupted" when the worker
    // is stopped or the run aborted before.
    [[nodiscard]] int WaitForFileProcessors();

private:
    // What becomes of the folder of a version run, and the rotation after a good one.
    [[nodiscard]] int EndVersion(const TaskRunInfo& task, int result,
                                 RotationHandler& rotation) const;
    [[nodiscard]] bool IsAborted() const;
    // Ends within a tenth of a second when the worker is stopped or the run aborted.
    void SleepOneSecond() const;

    const TaskRunInfo* m_task = nullptr;
    Processor* m_processor = nullptr;
    const std::atomic<int>* m_abort_flag = nullptr;
};
