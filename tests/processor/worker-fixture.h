// What the workers need to run: databases in a scratch folder, a mounted device with a task in the
// registry, and a strategy whose handlers do what the test says.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "db/log-db.h"
#include "db/log-description.h"
#include "db/log-info.h"
#include "db/task-db.h"
#include "fake/fake-keld.h"
#include "processor/task-entry-handler.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/file-event-context.h"
#include "strategy/task-handler.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

// Which handler was asked, and what it works on.
struct HandlerCall {
    const char* kind;  // "scan", "remove", "create", "copy"
    const FileEventContext& context;
    int processor_id;
    const std::atomic<int>* abort_flag;
};

class ScriptedTaskHandler;

// Hands out handlers that call the scripts. The scripts of file handlers give negative codes: with
// 0 a handler would go on to the real work.
class ScriptedStrategy : public CopyStrategyHandler {
public:
    std::function<int(const HandlerCall&)> file_script;
    std::function<int(ScriptedTaskHandler&)> task_script;
    bool has_handlers = true;

    [[nodiscard]] std::unique_ptr<TaskHandler> GetTaskHandler() const override;
    [[nodiscard]] std::unique_ptr<ScanHandler> GetScanHandler() const override;
    [[nodiscard]] std::unique_ptr<RemoveHandler> GetRemoveHandler() const override;
    [[nodiscard]] std::unique_ptr<CreateHandler> GetCreateHandler() const override;
    [[nodiscard]] std::unique_ptr<CopyHandler> GetCopyHandler() const override;
};

class ScriptedTaskHandler : public TaskHandler {
public:
    explicit ScriptedTaskHandler(const ScriptedStrategy& strategy) : m_strategy(strategy) {}
    int Run() override { return m_strategy.task_script(*this); }

private:
    const ScriptedStrategy& m_strategy;
};

class WorkerFixture : public testing::Test {
protected:
    static constexpr uint64_t USB_ID = 1;

    WorkerFixture();
    ~WorkerFixture() override;

    // Adds a task to the database and the registry; its id.
    uint64_t AddTask(const std::string& name, int task_type = TASK_TYPE_IMPORT_GENERAL,
                     int copy_strategy = COPY_STRATEGY_MIRROR);
    static TaskRunInfo Entry(uint64_t task_id);
    static TaskInfo Row(uint64_t task_id);
    // The rows of the log, oldest first, as "id error param".
    static std::vector<std::string> LogRows();

    TempDir m_dir;
    FakeKeld& m_fake;
    std::string m_usb;
    std::string m_share;
    std::shared_ptr<ScriptedStrategy> m_strategy = std::make_shared<ScriptedStrategy>();
    std::vector<uint64_t> m_tasks;
};
