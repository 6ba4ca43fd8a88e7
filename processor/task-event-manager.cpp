#include "processor/task-event-manager.h"

#include <algorithm>

#include "utils/log.h"
#include "utils/mutex-lock.h"

TaskEventManager& TaskEventManager::GetInstance() {
    static TaskEventManager* const instance = new TaskEventManager();
    return *instance;
}

TaskEventManager::~TaskEventManager() { pthread_mutex_destroy(&m_mutex); }

bool TaskEventManager::IsQueuedLocked(uint64_t task_id) const {
    return std::find(m_ready_queue.begin(), m_ready_queue.end(), task_id) != m_ready_queue.end();
}

void TaskEventManager::EnqueueLocked(uint64_t task_id) {
    m_ready_queue.push_back(task_id);
    SLOG_INFO("TaskEventManager: push task event '%llu' into raedy queue\n", Llu(task_id));
}

void TaskEventManager::PushEvent(uint64_t task_id) {
    if (task_id == 0) {
        SLOG_ERR("Invalid task event '%llu'\n", Llu(task_id));
        return;
    }
    const MutexLock lock(m_mutex);
    const bool is_queued = IsQueuedLocked(task_id);
    if (is_queued || m_processing_set.count(task_id) != 0) {
        SLOG_WARN("TaskEventManager: task '%llu' is already in %s\n", Llu(task_id),
                  is_queued ? "ready queue" : "processing set");
        return;
    }
    EnqueueLocked(task_id);
}

int TaskEventManager::PullEvent(uint64_t& task_id, void (*on_pull)(uint64_t)) {
    const MutexLock lock(m_mutex);
    if (m_ready_queue.empty()) {
        SLOG_DBG("TaskEventManager: m_ready_queue is empty\n");
        return 0;
    }
    const uint64_t first = m_ready_queue.front();
    m_ready_queue.pop_front();
    if (m_processing_set.count(first) != 0) {
        SLOG_ERR("TaskEventManager: task_id '%llu' is already in processing set.\n)", Llu(task_id));
        return 0;
    }
    if (first == 0) {
        SLOG_ERR("Invalid task event '%llu'\n", Llu(first));
        return 0;
    }
    m_processing_set.insert(first);
    task_id = first;
    SLOG_DBG("TaskEventManager: PullEvent '%llu'\n", Llu(task_id));
    if (on_pull != nullptr) on_pull(task_id);
    return 1;
}

void TaskEventManager::RedoEvent(uint64_t task_id) {
    if (task_id == 0) {
        SLOG_ERR("Invalid task event '%llu'\n", Llu(task_id));
        return;
    }
    const MutexLock lock(m_mutex);
    m_processing_set.erase(task_id);
    if (IsQueuedLocked(task_id)) {
        SLOG_WARN("TaskEventManager: task '%llu' is already in ready queue\n", Llu(task_id));
        return;
    }
    EnqueueLocked(task_id);
}

void TaskEventManager::DoneEvent(uint64_t task_id) {
    const MutexLock lock(m_mutex);
    if (m_processing_set.erase(task_id) == 0) {
        SLOG_WARN("TaskEventManager: Failed to find task_id '%llu' in m_processing_set\n",
                  Llu(task_id));
    }
}

void TaskEventManager::RemoveEvent(uint64_t task_id) {
    const MutexLock lock(m_mutex);
    m_processing_set.erase(task_id);
    for (auto it = m_ready_queue.begin(); it != m_ready_queue.end();) {
        if (*it != task_id) {
            ++it;
            continue;
        }
        it = m_ready_queue.erase(it);
        SLOG_INFO("TaskEventManager: Remove task_id '%llu' from ready queue.\n", Llu(task_id));
    }
}

bool TaskEventManager::IsProcessing(uint64_t task_id) const {
    const MutexLock lock(m_mutex);
    return m_processing_set.count(task_id) != 0;
}

bool TaskEventManager::IsInReadyQueue(uint64_t task_id) const {
    const MutexLock lock(m_mutex);
    return IsQueuedLocked(task_id);
}

bool TaskEventManager::IsReadyQueueEmpty() const {
    const MutexLock lock(m_mutex);
    return m_ready_queue.empty();
}

bool TaskEventManager::IsProcessingSetEmpty() const {
    const MutexLock lock(m_mutex);
    return m_processing_set.empty();
}
