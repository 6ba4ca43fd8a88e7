#include "processor/barrier.h"

#include "utils/log.h"
#include "utils/mutex-lock.h"

Barrier::Barrier() {
    pthread_mutex_init(&m_mutex, nullptr);
    pthread_cond_init(&m_cond, nullptr);
}

Barrier::~Barrier() {
    pthread_cond_destroy(&m_cond);
    pthread_mutex_destroy(&m_mutex);
}

void Barrier::Register(int processor_id) {
    {
        const MutexLock lock(m_mutex);
        ++m_count;
    }
    SLOG_DBG("Processor %d register barrier\n", processor_id);
}

void Barrier::Reach(int processor_id) {
    {
        const MutexLock lock(m_mutex);
        --m_count;
        // Under the mutex: the owner may destroy the object as soon as it finds the count at 0.
        pthread_cond_signal(&m_cond);
    }
    SLOG_DBG("Processor %d reach barrier\n", processor_id);
}

void Barrier::Wait() {
    const MutexLock lock(m_mutex);
    while (m_count != 0) pthread_cond_wait(&m_cond, &m_mutex);
}
