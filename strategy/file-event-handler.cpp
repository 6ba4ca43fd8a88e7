#include "strategy/file-event-handler.h"

#include "db/task-info.h"
#include "filter/file-filter.h"
#include "processor/processor.h"
#include "strategy/file-event-context.h"
#include "utils/error-code.h"
#include "utils/log.h"

FileEventHandler::~FileEventHandler() = default;

bool FileEventHandler::IsOverwritePolicy() const {
    return Task().copy_strategy != COPY_STRATEGY_INCREMENTAL ||
           Task().conflict_policy != CONFLICT_POLICY_RENAME;
}

bool FileEventHandler::IsSourceRemoved() const {
    return Task().copy_strategy == COPY_STRATEGY_INCREMENTAL && Task().remove_src_file;
}

const TaskRunInfo& FileEventHandler::Task() const { return m_context->task; }

const std::string& FileEventHandler::EventPath() const { return m_context->event.path; }

bool FileEventHandler::IsDirEvent() const { return m_context->event.IsDir(); }

int FileEventHandler::ProcessorId() const {
    return m_processor == nullptr ? -1 : m_processor->GetID();
}

bool FileEventHandler::IsAborted() const {
    return m_abort_flag != nullptr && m_abort_flag->load() != 0;
}

int FileEventHandler::CheckTaskFilter() const {
    const std::shared_ptr<FileFilter> filter = Task().task_filter;
    if (!filter) {
        SLOG_ERR("File Filter is NULL [task: %llu]", Llu(Task().task_id));
        return ERR_SYSTEM;
    }
    const int reason = filter->Check(EventPath(), IsDirEvent());
    if (reason == 0) return ERR_SUCCESS;
    SLOG_WARN("file '%s' fail to pass filter [reason: %d]", EventPath().c_str(), reason);
    return ERR_IGNORE;
}
