// The worker that does file events: pulls one from EventManager, checks its task and device, hands
// it to the handler that the task's strategy has for it, and turns the outcome into done, retry or
// give back. It knows nothing of what a handler does.
//
// Threads: see WorkerProcessor. GetCurrentPath() and GetCurrentTaskId() from any thread.
#pragma once

#include <pthread.h>

#include <memory>
#include <string>

#include "processor/worker-processor.h"
#include "strategy/file-event-context.h"

class FileProcessor : public WorkerProcessor {
public:
    FileProcessor();
    ~FileProcessor() override;

    // The full source path of the event in hand; empty when there is none.
    [[nodiscard]] std::string GetCurrentPath() const;
    [[nodiscard]] uint64_t GetCurrentTaskId() const override;

protected:
    void Run() override;
    [[nodiscard]] const char* Name() const override { return "FileProcessor"; }
    [[nodiscard]] int IdleSeconds() const override { return 1; }
    [[nodiscard]] int FailedPrepareSeconds() const override { return 0; }
    [[nodiscard]] int GetEvent() override;
    [[nodiscard]] int Prepare() override { return PrepareEvent(); }
    [[nodiscard]] int Work() override { return Dispatch(); }
    [[nodiscard]] int HandleError(int code) override;
    void HandleAction(int action) override;
    void DoneEvent() override;
    void RedoEvent() override;

private:
    int PrepareEvent();
    int Dispatch();
    int HandleScan();
    int HandleRemove();
    int HandleCreate();
    int HandleCopy();
    template <typename Handler>
    int Handle(std::unique_ptr<Handler> handler, const char* factory, const char* kind);
    void ResetContext();
    int AddFileLog(int code);

    // Written by the worker under the write lock; the worker itself reads it without.
    FileEventContext m_context;
    mutable pthread_rwlock_t m_context_lock;
};
