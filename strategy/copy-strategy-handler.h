// The factory of a copy strategy: the workers ask it for the handlers of a task and so never need
// to know which strategy the task has.
//
// Threads: any; the object has no data. Each call makes a new handler for one piece of work, owned
// by the caller.
#pragma once

#include <memory>

class CopyHandler;
class CreateHandler;
class RemoveHandler;
class ScanHandler;
class TaskHandler;

// The operations of the base give null.
class CopyStrategyHandler {
public:
    CopyStrategyHandler() = default;
    virtual ~CopyStrategyHandler();
    CopyStrategyHandler(const CopyStrategyHandler&) = delete;
    CopyStrategyHandler& operator=(const CopyStrategyHandler&) = delete;

    [[nodiscard]] virtual std::unique_ptr<TaskHandler> GetTaskHandler() const;
    [[nodiscard]] virtual std::unique_ptr<ScanHandler> GetScanHandler() const;
    [[nodiscard]] virtual std::unique_ptr<RemoveHandler> GetRemoveHandler() const;
    [[nodiscard]] virtual std::unique_ptr<CreateHandler> GetCreateHandler() const;
    [[nodiscard]] virtual std::unique_ptr<CopyHandler> GetCopyHandler() const;
};

// The handler of a COPY_STRATEGY_... value; null for a value without one, which the caller reports.
[[nodiscard]] std::unique_ptr<CopyStrategyHandler> CreateCopyStrategyHandler(int copy_strategy);
