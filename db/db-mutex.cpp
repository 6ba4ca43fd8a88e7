#include "db/db-mutex.h"

#include "utils/log.h"

DbMutex::DbMutex() {
    if (pthread_mutex_init(&m_mutex, nullptr) != 0) SLOG_ERR("cannot init mutex\n");
}

DbMutex::~DbMutex() {
    if (pthread_mutex_destroy(&m_mutex) != 0) SLOG_ERR("cannot destroy mutex\n");
}

DbLock::DbLock(DbMutex& mutex) : m_mutex(mutex.m_mutex) {
    m_locked = pthread_mutex_lock(&m_mutex) == 0;
    if (!m_locked) SLOG_ERR("cannot lock mutex <%p>\n", static_cast<void*>(&m_mutex));
}

DbLock::~DbLock() {
    // A mutex that could not be taken is another thread's, or nobody's: releasing it is an error.
    if (!m_locked) return;
    if (pthread_mutex_unlock(&m_mutex) != 0) {
        SLOG_ERR("cannot release mutex <%p>\n", static_cast<void*>(&m_mutex));
    }
}
