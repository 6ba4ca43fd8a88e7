// The queue of whole tasks that wait to run. Each task id is in one of three places: nowhere, in
// the ready queue, or in the processing set; so a task is neither queued twice nor queued while it
// runs.
//
// Threads: any; one mutex, a leaf. There is no wait operation: the task worker polls.
#pragma once

#include <pthread.h>

#include <cstdint>
#include <deque>
#include <set>

class TaskEventManager {
public:
    // The object of the daemon, made on first use. It is never destroyed, so that a thread that
    // still runs while the process exits finds it whole.
    static TaskEventManager& GetInstance();

    // For tests; everyone else asks GetInstance().
    TaskEventManager() = default;
    ~TaskEventManager();
    TaskEventManager(const TaskEventManager&) = delete;
    TaskEventManager& operator=(const TaskEventManager&) = delete;

    // Queues a task; warns and changes nothing when it is queued or running.
    void PushEvent(uint64_t task_id);
    // Takes the first task off the queue into the processing set: 1 with the id, 0 without.
    // `on_pull` is called with the id under the lock, so that whoever finds the task in the queue
    // no more sees what it did; it may take leaf locks only.
    [[nodiscard]] int PullEvent(uint64_t& task_id, void (*on_pull)(uint64_t task_id) = nullptr);
    // Puts a running task back, behind all others.
    void RedoEvent(uint64_t task_id);
    // Ends a running task; warns when it is not one (it was removed meanwhile).
    void DoneEvent(uint64_t task_id);
    // Takes the task out of wherever it is.
    void RemoveEvent(uint64_t task_id);
    [[nodiscard]] bool IsProcessing(uint64_t task_id) const;
    [[nodiscard]] bool IsInReadyQueue(uint64_t task_id) const;
    [[nodiscard]] bool IsReadyQueueEmpty() const;
    [[nodiscard]] bool IsProcessingSetEmpty() const;

private:
    [[nodiscard]] bool IsQueuedLocked(uint64_t task_id) const;
    void EnqueueLocked(uint64_t task_id);

    std::set<uint64_t> m_processing_set;  // guarded by m_mutex
    std::deque<uint64_t> m_ready_queue;   // guarded by m_mutex
    mutable pthread_mutex_t m_mutex = PTHREAD_MUTEX_INITIALIZER;
};
