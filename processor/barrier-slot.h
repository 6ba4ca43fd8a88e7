// The place where a control thread leaves a barrier for a worker, which reaches it at the head of
// its loop.
//
// Threads: the worker calls Open(), Take() and Close(), control threads Put(). A barrier is only
// accepted while the worker's loop runs: one that nobody would reach would hold its owner for ever.
// At most one barrier is pending; control threads take turns.
#pragma once

#include <pthread.h>

class Barrier;

class BarrierSlot {
public:
    BarrierSlot();
    ~BarrierSlot();
    BarrierSlot(const BarrierSlot&) = delete;
    BarrierSlot& operator=(const BarrierSlot&) = delete;

    // The worker has entered its loop.
    void Open();
    // The worker has left its loop: a pending barrier is reached, and no further one accepted.
    void Close(int processor_id);
    // Registers the barrier with the worker's id and keeps it. Null, or a worker outside its loop:
    // nothing happens, and nobody has to be waited for.
    void Put(Barrier* barrier, int processor_id);
    // The pending barrier, which the caller now has to reach; null when there is none.
    [[nodiscard]] Barrier* Take();

private:
    pthread_mutex_t m_mutex;
    Barrier* m_barrier = nullptr;  // guarded by m_mutex
    bool m_is_open = false;        // guarded by m_mutex
};
