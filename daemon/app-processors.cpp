// Control of the worker threads.
#include "daemon/app.h"
#include "event/event-manager.h"
#include "processor/barrier.h"
#include "processor/file-processor.h"
#include "processor/hardware-controller.h"
#include "processor/task-event-manager.h"
#include "processor/task-processor.h"
#include "utils/log.h"

void Ferrixd::StartAll() {
    for (size_t i = 0; i < m_processor_count; ++i) m_processors[i]->Start();
    HardwareController::GetInstance().Start();
    SLOG_INFO("Ferrixd: StartAll\n");
}

void Ferrixd::PauseAll() {
    for (size_t i = 0; i < m_processor_count; ++i) m_processors[i]->Pause();
    HardwareController::GetInstance().Pause();
    SLOG_INFO("Ferrixd: PauseAll\n");
}

void Ferrixd::ResumeAll() {
    for (size_t i = 0; i < m_processor_count; ++i) m_processors[i]->Resume();
    HardwareController::GetInstance().Resume();
    SLOG_INFO("Ferrixd: ResumeAll\n");
}

void Ferrixd::PauseProcessors() {
    for (size_t i = 0; i < m_processor_count; ++i) m_processors[i]->Pause();
    SLOG_INFO("Ferrixd: PauseProcessors\n");
}

void Ferrixd::ResumeProcessors() {
    for (size_t i = 0; i < m_processor_count; ++i) m_processors[i]->Resume();
    SLOG_INFO("Ferrixd: ResumeProcessors\n");
}

void Ferrixd::AbortTask(uint64_t task_id) {
    SLOG_INFO("Ferrixd: AbortTask '%llu'\n", Llu(task_id));
    Barrier barrier;
    const bool is_complete = m_processor_count == 2;
    auto* task_processor = is_complete ? dynamic_cast<TaskProcessor*>(m_processors[0]) : nullptr;
    auto* file_processor = is_complete ? dynamic_cast<FileProcessor*>(m_processors[1]) : nullptr;
    if (task_processor == nullptr || file_processor == nullptr) {
        SLOG_ERR("Ferrixd: dynamic_cast failed\n");
        return;
    }
    task_processor->Abort(task_id, &barrier);
    file_processor->Abort(task_id, &barrier);
    barrier.Wait();
}

void Ferrixd::DropTaskWork(uint64_t task_id) {
    AbortTask(task_id);
    EventManager::GetInstance().RemoveTask(task_id);
    TaskEventManager::GetInstance().RemoveEvent(task_id);
}
