#include "db/db-mutex.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <new>

#include "db/task-db.h"
#include "support/log-capture.h"

namespace {

// The call that fails in this thread.
enum FailingCall { NONE, INIT, LOCK, UNLOCK, DESTROY };
thread_local FailingCall t_failing = NONE;

}  // namespace

extern "C" {

int __real_pthread_mutex_init(pthread_mutex_t* mutex, const pthread_mutexattr_t* attributes);
int __real_pthread_mutex_lock(pthread_mutex_t* mutex);
int __real_pthread_mutex_unlock(pthread_mutex_t* mutex);
int __real_pthread_mutex_destroy(pthread_mutex_t* mutex);

int __wrap_pthread_mutex_init(pthread_mutex_t* mutex, const pthread_mutexattr_t* attributes) {
    if (t_failing != INIT) return __real_pthread_mutex_init(mutex, attributes);
    t_failing = NONE;
    return ENOMEM;
}

int __wrap_pthread_mutex_lock(pthread_mutex_t* mutex) {
    if (t_failing != LOCK) return __real_pthread_mutex_lock(mutex);
    t_failing = NONE;
    return EINVAL;
}

int __wrap_pthread_mutex_unlock(pthread_mutex_t* mutex) {
    if (t_failing != UNLOCK) return __real_pthread_mutex_unlock(mutex);
    t_failing = NONE;
    __real_pthread_mutex_unlock(mutex);
    return EPERM;
}

int __wrap_pthread_mutex_destroy(pthread_mutex_t* mutex) {
    if (t_failing != DESTROY) return __real_pthread_mutex_destroy(mutex);
    t_failing = NONE;
    __real_pthread_mutex_destroy(mutex);
    return EBUSY;
}

}  // extern "C"

namespace {

std::string AddressOf(const void* object) {
    char text[64];
    snprintf(text, sizeof(text), "<%p>", object);
    return text;
}

TEST(DbMutexTest, FailedInitIsLogged) {
    const LogCapture log;
    t_failing = INIT;
    const DbMutex mutex;
    EXPECT_TRUE(log.Has("[ERR] cannot init mutex"));
}

TEST(DbMutexTest, LockWorksAlthoughItsInitHasFailed) {
    alignas(DbMutex) unsigned char memory[sizeof(DbMutex)];
    memset(memory, 0xff, sizeof(memory));  // no mutex reads like this
    const LogCapture log;
    t_failing = INIT;
    auto* const mutex = new (memory) DbMutex;
    { const DbLock lock(*mutex); }
    mutex->~DbMutex();
    EXPECT_EQ(std::vector<std::string>{"[ERR] cannot init mutex"}, log.Lines());
}

TEST(DbMutexTest, FailedDestroyIsLogged) {
    const LogCapture log;
    {
        const DbMutex mutex;
        t_failing = DESTROY;
    }
    EXPECT_TRUE(log.Has("[ERR] cannot destroy mutex"));
}

TEST(DbMutexTest, FailedLockIsLoggedAndWhatWasNotLockedIsNotReleased) {
    DbMutex mutex;
    const LogCapture log;
    t_failing = LOCK;
    {
        const DbLock lock(mutex);
        t_failing = UNLOCK;
    }
    const bool is_released = t_failing != UNLOCK;
    t_failing = NONE;
    EXPECT_FALSE(is_released);
    EXPECT_TRUE(log.Has("[ERR] cannot lock mutex " + AddressOf(&mutex)));
    EXPECT_EQ(1u, log.Lines().size());
}

TEST(DbMutexTest, FailedReleaseIsLogged) {
    DbMutex mutex;
    const LogCapture log;
    {
        const DbLock lock(mutex);
        t_failing = UNLOCK;
    }
    EXPECT_TRUE(log.Has("[ERR] cannot release mutex " + AddressOf(&mutex)));
}

TEST(DbMutexTest, OperationGoesOnWhenItsLockFails) {
    TaskDB db;
    const LogCapture log;
    t_failing = LOCK;
    EXPECT_EQ(-1, db.Init("/no-such-folder/task-db.sqlite"));
    EXPECT_TRUE(log.Contains("cannot lock mutex"));
    EXPECT_TRUE(log.Contains("Failed to create task db at '/no-such-folder/task-db.sqlite'."));
}

}  // namespace
