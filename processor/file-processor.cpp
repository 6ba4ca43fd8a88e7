#include "processor/file-processor.h"

#include "db/log-wrapper.h"
#include "db/task-info.h"
#include "event/event-manager.h"
#include "event/event-text.h"
#include "platform/error-handler.h"
#include "processor/rwlock-guard.h"
#include "processor/task-entry-handler.h"
#include "strategy/copy-handler.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/create-handler.h"
#include "strategy/remove-handler.h"
#include "strategy/scan-handler.h"
#include "utils/confined-path.h"
#include "utils/error-code.h"
#include "utils/file-op.h"
#include "utils/log.h"

FileProcessor::FileProcessor() { pthread_rwlock_init(&m_context_lock, nullptr); }

FileProcessor::~FileProcessor() { pthread_rwlock_destroy(&m_context_lock); }

void FileProcessor::Run() {
    const LogBatch batch;  // twenty lines for each file
    WorkerProcessor::Run();
}

std::string FileProcessor::GetCurrentPath() const {
    const ReadLock lock(m_context_lock);
    return m_context.src_full_path;
}

uint64_t FileProcessor::GetCurrentTaskId() const {
    const ReadLock lock(m_context_lock);
    return m_context.event.task_id;
}

void FileProcessor::ResetContext() {
    const WriteLock lock(m_context_lock);
    m_context.Reset();
}

int FileProcessor::GetEvent() {
    if (!m_context.event.IsEmpty()) {
        SLOG_INFO("GetEvent: current event is valid: %s\n", EventText(m_context.event).CStr());
        return 0;
    }
    Event event;
    if (EventManager::GetInstance().PullEvent(this, event) != 1) {
        ResetContext();
        return -1;
    }
    m_retry_count.Reset();
    const WriteLock lock(m_context_lock);
    m_context.event = event;
    SLOG_DBG("FileProcessor (%d): current event %s.\n", GetID(), EventText(event).CStr());
    return 0;
}

int FileProcessor::PrepareEvent() {
    const Event& event = m_context.event;
    TaskRunInfo run_info;
    USBRunInfo usb;
    if (TaskEntryHandler::GetInstance().GetRunEntry(event.task_id, run_info) < 0) {
        SLOG_NOTICE("task entry (with task %llu) is removed\n", Llu(event.task_id));
        DoneEvent();
        return -1;
    }
    if (TaskEntryHandler::GetInstance().GetUSBEntry(run_info.usb_id, usb) < 0) {
        SLOG_NOTICE("usb entry (with task %llu, usb %llu) is removed\n", Llu(event.task_id),
                    Llu(run_info.usb_id));
        DoneEvent();
        return -1;
    }
    if (run_info.status != TASK_RUN_STATE_RUNNING) {
        SLOG_DBG("FileProcessor (%d): task %llu is not running, process this event (%s) later\n",
                 GetID(), Llu(event.task_id), EventText(event).CStr());
        RedoEvent();
        return -1;
    }
    SLOG_INFO("FileProcessor (%d): current event: %s\n", GetID(), EventText(event).CStr());
    const WriteLock lock(m_context_lock);
    m_context.SetTask(run_info);
    return 0;
}

int FileProcessor::Dispatch() {
    const PathPlaceScope scope;
    const Event& event = m_context.event;
    if (event.IsScan()) return HandleScan();
    switch (event.type) {
        case EV_REMOVE:
            return HandleRemove();
        case EV_CREATE:
            return HandleCreate();
        default:
            break;
    }
    const int result = HandleCopy();
    // The next file is most often of the same folder. What failed may have been the folder itself.
    if (result == ERR_SUCCESS) PathPlaceScope::KeepForNext();
    return result;
}

template <typename Handler>
int FileProcessor::Handle(std::unique_ptr<Handler> handler, const char* factory, const char* kind) {
    if (handler == nullptr) {
        SLOG_ERR("FileProcessor (%d): Failed to %s [task: %llu]\n", GetID(), factory,
                 Llu(m_context.event.task_id));
        return ERR_SYSTEM;
    }
    handler->SetContext(&m_context);
    handler->SetProcessor(this);
    handler->SetAbortFlag(&m_abort_flag);
    const int result = handler->Handle();
    if (result < 0) {
        SLOG_ERR("FileProcessor (%d): Failed to handle %s event '%s'\n", GetID(), kind,
                 EventText(m_context.event).CStr());
    }
    return result;
}

int FileProcessor::HandleScan() {
    SLOG_INFO("FileProcessor (%d): scaning directory '%s'\n", GetID(),
              m_context.src_full_path.c_str());
    const auto& strategy = m_context.task.strategy_handler;
    return Handle(strategy ? strategy->GetScanHandler() : nullptr, "GetScanHandler", "scan");
}

int FileProcessor::HandleRemove() {
    SLOG_INFO("FileProcessor (%d): Remove '%s', is_dir '%d'\n", GetID(),
              m_context.src_full_path.c_str(), m_context.event.IsDir() ? 1 : 0);
    const auto& strategy = m_context.task.strategy_handler;
    return Handle(strategy ? strategy->GetRemoveHandler() : nullptr, "GetRemoveHandler", "remove");
}

int FileProcessor::HandleCreate() {
    SLOG_INFO("FileProcessor (%d): Create '%s', is_dir '%d'\n", GetID(),
              m_context.src_full_path.c_str(), m_context.event.IsDir() ? 1 : 0);
    const auto& strategy = m_context.task.strategy_handler;
    return Handle(strategy ? strategy->GetCreateHandler() : nullptr, "GetCreateHandler", "create");
}

int FileProcessor::HandleCopy() {
    SLOG_INFO("FileProcessor (%d): Copy '%s', is_dir '%d'\n", GetID(),
              m_context.src_full_path.c_str(), m_context.event.IsDir() ? 1 : 0);
    const auto& strategy = m_context.task.strategy_handler;
    return Handle(strategy ? strategy->GetCopyHandler() : nullptr, "GetCopyHandler", "copy");
}

int FileProcessor::AddFileLog(int code) {
    LogInfo info;
    info.SetTaskId(m_context.event.task_id);
    info.SetDescription(LogDescription::LOG_DESC_FILE_FAILED, m_context.task.task_name,
                        PathBaseName(m_context.src_full_path));
    info.SetError(code);
    if (AddLog(info) == 0) return 0;
    SLOG_ERR("FileProcessor (%d): Failed to add log info to log db for '%llu'\n", GetID(),
             Llu(m_context.event.task_id));
    return -1;
}

int FileProcessor::HandleError(int code) {
    code = NoteOutcome(code);
    const int action = ErrorActionOf(code);
    Ferrix::ErrorHandler::GetInstance().Set(m_context.event.task_id, code);

    // A failure that will be tried again is told when the tries are used up.
    const bool is_retried = action == ERROR_ACTION_RETRY && !m_retry_count.IsUsedUp();
    if (!IsIgnorableError(code) && !is_retried && AddFileLog(code) < 0) {
        SLOG_ERR("FileProcessor (%d): Failed to add log info to log db for '%llu'\n", GetID(),
                 Llu(m_context.event.task_id));
    }
    return m_retry_count.Count(action);
}

void FileProcessor::HandleAction(int action) {
    constexpr ActionSeconds kSeconds = {.retry = 3, .redo = 2, .unknown = 2};
    CarryOut(action, kSeconds);
    SLOG_DBG("FileProcessor (%d): HandleAction (%d)\n", GetID(), action);
}

void FileProcessor::DoneEvent() {
    EventManager::GetInstance().DoneEvent(this);
    SLOG_DBG("FileProcessor (%d): DoneEvent '%s'\n", GetID(), EventText(m_context.event).CStr());
    ResetContext();
}

void FileProcessor::RedoEvent() {
    if (EventManager::GetInstance().RedoEvent(this, m_context.event) < 0) {
        SLOG_ERR("FileProcessor (%d): failed to redo event\n", GetID());
    }
    ResetContext();
}
