#include "event/event-manager.h"

#include <algorithm>
#include <new>

#include "event/event-pool-peatree.h"
#include "event/event-text.h"
#include "event/path-nfc.h"
#include "processor/processor.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

EventManager& EventManager::GetInstance() {
    static EventManager* const instance = new EventManager();
    return *instance;
}

EventManager::EventManager() { pthread_mutex_init(&m_mutex, nullptr); }

EventManager::~EventManager() {
    {
        const MutexLock lock(m_mutex);
        m_ready_queue.clear();
        m_pools.clear();
        m_processor_events.clear();
    }
    pthread_mutex_destroy(&m_mutex);
}

EventPool* EventManager::FindPoolLocked(uint64_t task_id) const {
    const auto found = m_pools.find(task_id);
    return found != m_pools.end() ? found->second.get() : nullptr;
}

void EventManager::EnqueueLocked(EventPool* pool) {
    if (pool->m_in_ready_queue || pool->IsEmpty()) return;
    pool->m_in_ready_queue = true;
    m_ready_queue.push_back(pool);
}

void EventManager::PushEvent(const Event& event) {
    if (!IsNfcPath(event.path)) {
        SLOG_WARN("EVENT is not NFC Form '%s', skipping...\n", EventText(event).CStr());
        return;
    }
    if (event.IsEmpty()) {
        SLOG_ERR("Invalid event '%s'.\n", EventText(event).CStr());
        return;
    }
    const MutexLock lock(m_mutex);
    EventPool* pool = FindPoolLocked(event.task_id);
    if (pool == nullptr) {
        pool = new (std::nothrow) EventPoolPeaTree(event.task_id);
        if (pool == nullptr) {
            SLOG_ERR("Failed to create event pool.\n");
            return;
        }
        m_pools[event.task_id].reset(pool);
    }
    pool->Push(event);
    EnqueueLocked(pool);
    SLOG_DBG("EventManager::PushEvent = [%s].\n", EventText(event).CStr());
}

int EventManager::PullEvent(Processor* processor, Event& event) {
    const MutexLock lock(m_mutex);
    if (m_ready_queue.empty()) return 0;
    EventPool* const pool = m_ready_queue.front();
    m_ready_queue.pop_front();
    pool->m_in_ready_queue = false;

    const int result = pool->Pop(event);
    if (result == 1) {
        m_processor_events[processor] = event;
        SLOG_INFO("EventManager::PullEvent [%s]\n", EventText(event).CStr());
    }
    EnqueueLocked(pool);
    return result;
}

int EventManager::DoneEvent(Processor* processor) {
    const MutexLock lock(m_mutex);
    const auto held = m_processor_events.find(processor);
    if (held == m_processor_events.end()) {
        SLOG_ERR("Can not get event for current processor '%d'\n", processor->GetID());
        return -1;
    }
    const Event event = std::move(held->second);
    m_processor_events.erase(held);
    EventPool* const pool = FindPoolLocked(event.task_id);
    if (pool == nullptr) {
        SLOG_ERR("Can not get event pool for current task '%llu'\n", Llu(event.task_id));
        return -1;
    }
    SLOG_DBG("EventManager::DoneEvent unregistry for [%s]\n", EventText(event).CStr());
    pool->Done(event);
    return 0;
}

int EventManager::RedoLocked(Processor* processor, const Event& event) {
    EventPool* const pool = FindPoolLocked(event.task_id);
    if (pool == nullptr) {
        SLOG_ERR("Can not find event pool\n");
        return -1;
    }
    if (pool->Redo(event) < 0) {
        SLOG_ERR("Failed to Reset event status to watting in event tree '%s'.\n",
                 event.path.c_str());
        return -1;
    }
    EnqueueLocked(pool);
    m_processor_events.erase(processor);
    return 0;
}

int EventManager::RedoEvent(Processor* processor, const Event& event) {
    int result = 0;
    {
        const MutexLock lock(m_mutex);
        result = RedoLocked(processor, event);
    }
    SLOG_DBG("EventManager::RedoEvent = [%s], ret= [%d]\n", EventText(event).CStr(), result);
    return result;
}

void EventManager::RemoveTask(uint64_t task_id) {
    const MutexLock lock(m_mutex);
    const auto found = m_pools.find(task_id);
    if (found == m_pools.end()) return;
    std::unique_ptr<EventPool> pool = std::move(found->second);
    m_pools.erase(found);
    const auto queued = std::find(m_ready_queue.begin(), m_ready_queue.end(), pool.get());
    if (queued != m_ready_queue.end()) m_ready_queue.erase(queued);
    pool.reset();
    SLOG_INFO("EventManager: task '%llu' removed\n", Llu(task_id));
}

size_t EventManager::GetEventCount(uint64_t task_id) {
    const MutexLock lock(m_mutex);
    EventPool* const pool = FindPoolLocked(task_id);
    return pool != nullptr ? pool->Size() : 0;
}

size_t EventManager::GetScanEventCount(uint64_t task_id) {
    const MutexLock lock(m_mutex);
    EventPool* const pool = FindPoolLocked(task_id);
    return pool != nullptr ? pool->GetScanEventCount() : 0;
}

size_t EventManager::GetHeldEventCount(uint64_t task_id) {
    const MutexLock lock(m_mutex);
    size_t count = 0;
    for (const auto& [processor, event] : m_processor_events) {
        if (event.task_id == task_id) ++count;
    }
    return count;
}

void EventManager::Traverse() {
    const MutexLock lock(m_mutex);
    for (const auto& [task_id, pool] : m_pools) {
        SLOG_INFO("**************** Traverse task '%llu' ****************\n", Llu(task_id));
        pool->Dump();
    }
}
