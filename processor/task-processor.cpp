#include "processor/task-processor.h"

#include <ctime>

#include "db/log-wrapper.h"
#include "db/task-db.h"
#include "platform/error-handler.h"
#include "platform/keld-notification.h"
#include "processor/hardware-controller.h"
#include "processor/run-aftermath.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/run-progress.h"
#include "strategy/task-handler.h"
#include "strategy/version-start.h"
#include "utils/error-code.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

namespace {

LogDescription::ID LogIdOf(bool is_end, int result) {
    if (!is_end) return LogDescription::LOG_DESC_TASK_STARTED;
    if (result == ERR_SUCCESS) return LogDescription::LOG_DESC_TASK_DONE;
    if (result == ERR_INTERRUPTED || result == ERR_PROCESS_STOPPED) {
        return LogDescription::LOG_DESC_TASK_STOPPED;
    }
    return LogDescription::LOG_DESC_TASK_FAILED;
}

}  // namespace

// The state is set under the mutex under which the task comes into hand and leaves it: a task that
// has just become idle must not be left as "canceling".
int TaskProcessor::Pause() {
    Processor::Pause();
    const MutexLock lock(m_hand_mutex);
    TaskEntryHandler::GetInstance().SetTaskState(m_task_event.task_id, TASK_RUN_STATE_CANCELING);
    return 0;
}

int TaskProcessor::Resume() {
    {
        const MutexLock lock(m_hand_mutex);
        TaskEntryHandler::GetInstance().SetTaskState(m_task_event.task_id, TASK_RUN_STATE_RUNNING);
    }
    return Processor::Resume();
}

int TaskProcessor::GetEvent() {
    if (m_task_event.IsValid()) {
        SLOG_INFO("TaskProcessor (%d): current task event is valid '%llu', do it again\n", GetID(),
                  Llu(m_task_event.task_id));
        return 0;
    }
    uint64_t task_id = 0;
    const auto set_running = [](uint64_t pulled) {
        TaskEntryHandler::GetInstance().SetTaskState(pulled, TASK_RUN_STATE_RUNNING);
    };
    if (TaskEventManager::GetInstance().PullEvent(task_id, set_running) != 1) return -1;
    Ferrix::ErrorHandler::GetInstance().Clear(task_id);
    RunProgress::GetInstance().Begin(task_id);
    m_task_event.task_id = task_id;
    m_retry_count.Reset();
    SLOG_INFO("TaskProcessor (%d): Get a task event: '%llu'\n", GetID(), Llu(task_id));
    return 0;
}

int TaskProcessor::SetVersionDir(const TaskRunInfo& task) {
    const uint64_t task_id = task.task_id;
    std::string version_dir;
    if (NameNewVersion(task, time(nullptr), version_dir) < 0) {
        SLOG_ERR("Failed to get time str '%llu'\n", Llu(task_id));
        return -1;
    }
    if (TaskEntryHandler::GetInstance().SetTaskVersionDir(task_id, version_dir) < 0) {
        SLOG_ERR("Failed to update version dir for task '%llu, task does not exist'\n",
                 Llu(task_id));
        return -1;
    }
    return 0;
}

int TaskProcessor::LoadRunInfo() {
    const uint64_t task_id = m_task_event.task_id;
    TaskRunInfo run_info;
    bool is_ready = true;
    if (TaskEntryHandler::GetInstance().GetTaskEntry(task_id, run_info) < 0) {
        SLOG_ERR("Task id '%llu' does not exist\n", Llu(task_id));
        is_ready = false;
    } else if (run_info.copy_strategy == COPY_STRATEGY_VERSION) {
        is_ready = SetVersionDir(run_info) == 0;
    }
    if (!is_ready) {
        SLOG_ERR("Failed to update version dir for '%llu'\n", Llu(task_id));
        return -1;
    }
    // Anew, with the name of this run's folder.
    if (TaskEntryHandler::GetInstance().StartRun(task_id, run_info) < 0) {
        SLOG_NOTICE("Registry Entry (task id: %llu) is removed.\n", Llu(task_id));
        return -1;
    }
    m_task_event.run_info = run_info;
    return 0;
}

int TaskProcessor::PrepareTask() {
    if (LoadRunInfo() == 0) return 0;
    DoneEvent();
    return -1;
}

int TaskProcessor::RunTask() {
    const TaskRunInfo& task = m_task_event.run_info;
    std::unique_ptr<TaskHandler> handler;
    if (task.strategy_handler != nullptr) handler = task.strategy_handler->GetTaskHandler();
    if (handler == nullptr) {
        SLOG_ERR("TaskProcessor (%d): Failed to GetTaskHandler [task: %llu]\n", GetID(),
                 Llu(m_task_event.task_id));
        return ERR_SYSTEM;
    }
    if (AddTaskLog(false, ERR_SUCCESS) < 0) return ERR_SYSTEM;
    handler->SetTask(&task);
    handler->SetProcessor(this);
    handler->SetAbortFlag(&m_abort_flag);
    return handler->Run();
}

int TaskProcessor::AddTaskLog(bool is_end, int result) {
    LogInfo info;
    info.SetTaskId(m_task_event.task_id);
    info.SetDescription(LogIdOf(is_end, result), m_task_event.run_info.task_name);
    if (info.description_id == LogDescription::LOG_DESC_TASK_FAILED) info.SetError(result);
    if (AddLog(info) == 0) return 0;
    SLOG_ERR("TaskProcessor (%d): Failed to add log info to log db for '%llu'\n", GetID(),
             Llu(m_task_event.task_id));
    return -1;
}

// The stored result, the notification and the row of the log. No failure of theirs counts.
void TaskProcessor::StoreResult(int task_err_code) {
    const uint64_t task_id = m_task_event.task_id;
    const bool is_good = task_err_code == ERR_SUCCESS;
    TaskDB& db = TaskDB::GetInstance();
    const uint32_t copied_time = is_good ? static_cast<uint32_t>(time(nullptr)) : 0;
    if (db.SetTaskResult(task_id, task_err_code, copied_time) < 0) {
        SLOG_ERR("Failed to update task info for '%llu'\n", Llu(task_id));
    }
    TaskInfo info;
    if (db.GetTaskInfo(task_id, info) != 1) {
        SLOG_ERR("Failed to get task info for '%llu'\n", Llu(task_id));
    }
    if (SendNotification(task_id, info.task_name, task_err_code) < 0) {
        SLOG_ERR("Failed to send notification for '%llu'\n", Llu(task_id));
    }
    AddTaskLog(true, task_err_code);
}

int TaskProcessor::HandleError(int code) {
    code = NoteOutcome(code);
    Ferrix::ErrorHandler& outcomes = Ferrix::ErrorHandler::GetInstance();
    outcomes.Set(m_task_event.task_id, code);
    const int task_err_code = outcomes.Get(m_task_event.task_id);
    SLOG_INFO("TaskProcessor (%d): HandleError: task_err_code = %d.\n", GetID(), task_err_code);
    StoreResult(task_err_code);
    return m_retry_count.Count(ErrorActionOf(code));
}

void TaskProcessor::HandleAction(int action) {
    constexpr ActionSeconds kSeconds = {.retry = 5, .redo = 3, .unknown = 2};
    const uint64_t task_id = m_task_event.task_id;
    CarryOut(action, kSeconds);
    SLOG_INFO("TaskProcessor (%d): HandleAction (%d), task id '%llu'\n", GetID(), action,
              Llu(task_id));
}

void TaskProcessor::LetGo() {
    const MutexLock lock(m_hand_mutex);
    TaskEntryHandler::GetInstance().SetTaskState(m_task_event.task_id, TASK_RUN_STATE_IDLE);
    m_task_event.Reset();
}

void TaskProcessor::RedoEvent() {
    const uint64_t task_id = m_task_event.task_id;
    TaskEventManager::GetInstance().RedoEvent(task_id);
    LetGo();
    SLOG_DBG("TaskProcessor (%d): RedoEvent '%llu'\n", GetID(), Llu(task_id));
}

// A device that cannot be ejected does not fail the task, whose outcome is stored by now.
void TaskProcessor::DoneEvent() {
    const uint64_t task_id = m_task_event.task_id;
    const TaskRunInfo run_info = m_task_event.run_info;
    TaskEventManager::GetInstance().DoneEvent(task_id);
    CreateTaskIndex(task_id, run_info);
    static_cast<void>(EjectTaskDevice(task_id, run_info));
    LetGo();
    HardwareController::GetInstance().NotifyHWController();
    SLOG_DBG("TaskProcessor (%d): DoneEvent '%llu'\n", GetID(), Llu(task_id));
}
