// The lock of a database object: a default (non-recursive) mutex whose failures are logged.
//
// An operation whose lock fails goes on without it: a store that answers is worth more than one
// that hangs, and a default mutex fails only when its memory is damaged.
#pragma once

#include <pthread.h>

class DbMutex {
public:
    DbMutex();
    ~DbMutex();
    DbMutex(const DbMutex&) = delete;
    DbMutex& operator=(const DbMutex&) = delete;

private:
    friend class DbLock;
    // Good as it stands, should the system refuse to make it.
    pthread_mutex_t m_mutex = PTHREAD_MUTEX_INITIALIZER;
};

// Holds the lock for the length of a block.
class DbLock {
public:
    explicit DbLock(DbMutex& mutex);
    ~DbLock();
    DbLock(const DbLock&) = delete;
    DbLock& operator=(const DbLock&) = delete;

private:
    pthread_mutex_t& m_mutex;
    bool m_locked;
};
