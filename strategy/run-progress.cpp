#include "strategy/run-progress.h"

RunProgress& RunProgress::GetInstance() {
    // Never destroyed: workers may still count while the process exits.
    static RunProgress& instance = *new RunProgress;
    return instance;
}

void RunProgress::Begin(uint64_t task_id) {
    const std::lock_guard lock(m_mutex);
    m_snapshot = {m_snapshot.run + 1, task_id, time(nullptr), 0, 0};
}

void RunProgress::CountFile(uint64_t task_id, uint64_t bytes) {
    const std::lock_guard lock(m_mutex);
    if (m_snapshot.task_id != task_id) return;
    ++m_snapshot.files;
    m_snapshot.bytes += bytes;
}

RunProgress::Snapshot RunProgress::Get() const {
    const std::lock_guard lock(m_mutex);
    return m_snapshot;
}
