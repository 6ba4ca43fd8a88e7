// The one lock around the platform's libraries, which are not safe to call from several threads.
//
// Threads: any. The lock is re-entrant, because operations of the wrapper build on each other; it
// is held for a platform call only, never across a caller's own work.
#pragma once

#include <pthread.h>

namespace SDK {

class ReentrantMutex {
public:
    // The lock of the layer; it is never destroyed, so that threads may still call at exit.
    static ReentrantMutex& GetInstance();

    ReentrantMutex() = default;
    ~ReentrantMutex();
    ReentrantMutex(const ReentrantMutex&) = delete;
    ReentrantMutex& operator=(const ReentrantMutex&) = delete;

    void Lock();
    // Without effect for a thread that does not hold the lock.
    void Unlock();

private:
    pthread_mutex_t m_outer = PTHREAD_MUTEX_INITIALIZER;
    pthread_mutex_t m_inner = PTHREAD_MUTEX_INITIALIZER;  // guards the owner and the depth
    pthread_t m_owner = {};
    int m_depth = 0;
};

// Holds a ReentrantMutex, the layer's own by default, for the length of a block.
class ReentrantLock {
public:
    explicit ReentrantLock(ReentrantMutex& mutex = ReentrantMutex::GetInstance()) : m_mutex(mutex) {
        m_mutex.Lock();
    }
    ~ReentrantLock() { m_mutex.Unlock(); }
    ReentrantLock(const ReentrantLock&) = delete;
    ReentrantLock& operator=(const ReentrantLock&) = delete;

private:
    ReentrantMutex& m_mutex;
};

}  // namespace SDK
