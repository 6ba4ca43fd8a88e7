#include "platform/sdk-mutex.h"

#include "utils/mutex-lock.h"

namespace SDK {

ReentrantMutex& ReentrantMutex::GetInstance() {
    static auto* const instance = new ReentrantMutex;
    return *instance;
}

ReentrantMutex::~ReentrantMutex() {
    pthread_mutex_destroy(&m_inner);
    pthread_mutex_destroy(&m_outer);
}

void ReentrantMutex::Lock() {
    {
        MutexLock lock(m_inner);
        if (m_depth != 0 && pthread_equal(m_owner, pthread_self())) {
            ++m_depth;
            return;
        }
    }
    // The inner mutex is not held while waiting, or the owner could not unlock.
    pthread_mutex_lock(&m_outer);
    MutexLock lock(m_inner);
    m_depth = 1;
    m_owner = pthread_self();
}

void ReentrantMutex::Unlock() {
    {
        MutexLock lock(m_inner);
        if (m_depth == 0 || !pthread_equal(m_owner, pthread_self())) return;
        if (--m_depth != 0) return;
    }
    pthread_mutex_unlock(&m_outer);
}

}  // namespace SDK
