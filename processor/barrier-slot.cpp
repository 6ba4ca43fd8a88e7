#include "processor/barrier-slot.h"

#include <utility>

#include "processor/barrier.h"
#include "utils/mutex-lock.h"

BarrierSlot::BarrierSlot() { pthread_mutex_init(&m_mutex, nullptr); }

BarrierSlot::~BarrierSlot() { pthread_mutex_destroy(&m_mutex); }

void BarrierSlot::Open() {
    const MutexLock lock(m_mutex);
    m_is_open = true;
}

void BarrierSlot::Close(int processor_id) {
    const MutexLock lock(m_mutex);
    m_is_open = false;
    if (Barrier* barrier = std::exchange(m_barrier, nullptr)) barrier->Reach(processor_id);
}

void BarrierSlot::Put(Barrier* barrier, int processor_id) {
    const MutexLock lock(m_mutex);
    if (barrier == nullptr || !m_is_open) return;
    barrier->Register(processor_id);
    m_barrier = barrier;
}

Barrier* BarrierSlot::Take() {
    const MutexLock lock(m_mutex);
    return std::exchange(m_barrier, nullptr);
}
