// The switchboard of file events: one pool for each task, tasks served strictly in turn, and a note
// of which worker has which event.
//
// Threads: every operation may be called from any thread; one mutex, under which a pool's is taken.
// Nobody is woken by it: workers poll.
#pragma once

#include <pthread.h>

#include <cstddef>
#include <cstdint>
#include <deque>
#include <map>
#include <memory>

#include "event/event.h"

class EventPool;
class Processor;

class EventManager {
public:
    // The object of the daemon, made on first use. It is never destroyed, so that a thread that
    // still runs while the process exits finds it whole.
    static EventManager& GetInstance();

    // For tests; everyone else asks GetInstance().
    EventManager();
    ~EventManager();
    EventManager(const EventManager&) = delete;
    EventManager& operator=(const EventManager&) = delete;

    // Enters an event. One whose path is not in NFC form, or that is empty, is dropped with a log
    // line.
    void PushEvent(const Event& event);
    // Asks for the caller's next event: 1 with an event, 0 when the task whose turn it is has none
    // that can run now (another task may have: ask again later).
    [[nodiscard]] int PullEvent(Processor* processor, Event& event);
    // The caller has finished its event. 0, or -1 when it has none or its task has been removed;
    // the caller's entry is gone in any case.
    int DoneEvent(Processor* processor);
    // The caller gives its event back, to run again. 0, or -1 with the caller's entry left in
    // place.
    int RedoEvent(Processor* processor, const Event& event);
    // Destroys the task's pool with all its events, those in work included.
    void RemoveTask(uint64_t task_id);
    // Events of the task, those in work included; 0 when it has no pool.
    [[nodiscard]] size_t GetEventCount(uint64_t task_id);
    [[nodiscard]] size_t GetScanEventCount(uint64_t task_id);
    // Events of the task that workers have in hand.
    [[nodiscard]] size_t GetHeldEventCount(uint64_t task_id);
    // Writes all pools to the log.
    void Traverse();

private:
    EventPool* FindPoolLocked(uint64_t task_id) const;
    void EnqueueLocked(EventPool* pool);
    int RedoLocked(Processor* processor, const Event& event);

    // All guarded by m_mutex.
    std::map<Processor*, Event> m_processor_events;
    std::map<uint64_t, std::unique_ptr<EventPool>> m_pools;
    std::deque<EventPool*> m_ready_queue;  // each at most once: EventPool::m_in_ready_queue
    pthread_mutex_t m_mutex;
};
