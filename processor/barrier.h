// A counted gate: one thread waits until all those it has registered have come by.
//
// Lives on the stack of the thread that waits. Threads: Register() and Reach() from any thread;
// Wait() from the owner alone. Once Wait() has returned, nobody touches the object any more, so it
// may be destroyed at once. The owner must not hold anything that a registered thread needs on its
// way to Reach().
#pragma once

#include <pthread.h>

class Barrier {
public:
    Barrier();
    ~Barrier();
    Barrier(const Barrier&) = delete;
    Barrier& operator=(const Barrier&) = delete;

    // One more to wait for. The id is for the log only.
    void Register(int processor_id);
    // One less. The registered thread must not use the barrier afterwards.
    void Reach(int processor_id);
    // Returns when nobody is to be waited for, at once if that is so already.
    void Wait();

private:
    pthread_mutex_t m_mutex;
    pthread_cond_t m_cond;
    int m_count = 0;  // guarded by m_mutex
};
