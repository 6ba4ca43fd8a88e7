// Hold a pthread read-write lock for the length of a block.
#pragma once

#include <pthread.h>

class ReadLock {
public:
    explicit ReadLock(pthread_rwlock_t& lock) : m_lock(lock) { pthread_rwlock_rdlock(&m_lock); }
    ~ReadLock() { pthread_rwlock_unlock(&m_lock); }
    ReadLock(const ReadLock&) = delete;
    ReadLock& operator=(const ReadLock&) = delete;

private:
    pthread_rwlock_t& m_lock;
};

class WriteLock {
public:
    explicit WriteLock(pthread_rwlock_t& lock) : m_lock(lock) { pthread_rwlock_wrlock(&m_lock); }
    ~WriteLock() { pthread_rwlock_unlock(&m_lock); }
    WriteLock(const WriteLock&) = delete;
    WriteLock& operator=(const WriteLock&) = delete;

private:
    pthread_rwlock_t& m_lock;
};
