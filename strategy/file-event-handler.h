// Base of the handlers of file events: what they are given, and the questions that all of them ask.
//
// A handler lives for one event, on the thread of the file worker that made it. The setters are
// called once before Handle(); what they point to outlives the handler.
#pragma once

#include <atomic>
#include <string>

class Processor;
struct Event;
struct FileEventContext;
struct TaskRunInfo;

class FileEventHandler {
public:
    FileEventHandler() = default;
    virtual ~FileEventHandler();
    FileEventHandler(const FileEventHandler&) = delete;
    FileEventHandler& operator=(const FileEventHandler&) = delete;

    void SetContext(const FileEventContext* context) { m_context = context; }
    void SetProcessor(Processor* processor) { m_processor = processor; }
    void SetAbortFlag(const std::atomic<int>* abort_flag) { m_abort_flag = abort_flag; }

protected:
    // True when a conflicting entry at the destination is overwritten, false when it is renamed:
    // false only for incremental tasks with the policy "rename".
    [[nodiscard]] bool IsOverwritePolicy() const;
    // True when the source is removed after the copy; incremental tasks only.
    [[nodiscard]] bool IsSourceRemoved() const;

    [[nodiscard]] const FileEventContext& Context() const { return *m_context; }
    [[nodiscard]] const TaskRunInfo& Task() const;
    [[nodiscard]] const std::string& EventPath() const;
    [[nodiscard]] bool IsDirEvent() const;
    [[nodiscard]] int ProcessorId() const;
    [[nodiscard]] const std::atomic<int>* AbortFlag() const { return m_abort_flag; }
    [[nodiscard]] bool IsAborted() const;

    // 0 when the task's filter lets the event pass; "System error" without a filter, "Ignore this
    // error" for an event that it refuses.
    [[nodiscard]] int CheckTaskFilter() const;

private:
    const FileEventContext* m_context = nullptr;
    Processor* m_processor = nullptr;
    const std::atomic<int>* m_abort_flag = nullptr;
};
