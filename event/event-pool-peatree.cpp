#include "event/event-pool-peatree.h"

#include "event/event-text.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

EventPoolPeaTree::EventPoolPeaTree(uint64_t task_id) : EventPool(task_id) {
    pthread_mutex_init(&m_mutex, nullptr);
    Clear();
}

EventPoolPeaTree::~EventPoolPeaTree() {
    Clear();
    pthread_mutex_destroy(&m_mutex);
}

void EventPoolPeaTree::Push(const Event& event) {
    if (event.IsEmpty()) return;
    const MutexLock lock(m_mutex);
    m_tree.Push(event);
    SLOG_DBG("Push event event [%s].\n", EventText(event).CStr());
}

int EventPoolPeaTree::Pop(Event& event) {
    const MutexLock lock(m_mutex);
    const int result = m_tree.IsEmpty() ? 0 : m_tree.Pop(event);
    SLOG_DBG("Pop event [%s].\n", EventText(event).CStr());
    return result;
}

int EventPoolPeaTree::PopByPath(const std::string&, Event&) {
    SLOG_CRIT("Pop by path is not supported.\n");
    return -1;
}

int EventPoolPeaTree::Done(const Event& event) {
    const MutexLock lock(m_mutex);
    if (m_tree.Done(event) == 0) return -1;
    SLOG_DBG("Done event [%s].\n", EventText(event).CStr());
    return 0;
}

int EventPoolPeaTree::Redo(const Event& event) {
    const MutexLock lock(m_mutex);
    if (m_tree.Redo(event) == 0) return -1;
    SLOG_DBG("Redo event [%s]\n", EventText(event).CStr());
    return 0;
}

void EventPoolPeaTree::Clear() {
    const MutexLock lock(m_mutex);
    m_tree.Clear();
}

size_t EventPoolPeaTree::Size() {
    const MutexLock lock(m_mutex);
    const size_t size = m_tree.Size();
    SLOG_DBG("Size [%zu]\n", size);
    return size;
}

size_t EventPoolPeaTree::GetScanEventCount() {
    const MutexLock lock(m_mutex);
    const size_t count = m_tree.ScanCount();
    SLOG_DBG("GetScanEventCount [%zu]\n", count);
    return count;
}

bool EventPoolPeaTree::IsEmpty() {
    const MutexLock lock(m_mutex);
    return m_tree.IsEmpty();
}

void EventPoolPeaTree::Dump() {
    const MutexLock lock(m_mutex);
    m_tree.Dump();
}
