// A pool that orders a task's events by an EventPeaTree.
// Threads: every operation may be called from any thread; one mutex, taken inside EventManager's.
#pragma once

#include <pthread.h>

#include "event/event-peatree.h"
#include "event/event-pool.h"

class EventPoolPeaTree final : public EventPool {
public:
    explicit EventPoolPeaTree(uint64_t task_id);
    ~EventPoolPeaTree() override;

    void Push(const Event& event) override;
    [[nodiscard]] int Pop(Event& event) override;
    [[nodiscard]] int PopByPath(const std::string& path, Event& event) override;
    int Done(const Event& event) override;
    int Redo(const Event& event) override;
    void Clear() override;
    [[nodiscard]] size_t Size() override;
    [[nodiscard]] size_t GetScanEventCount() override;
    [[nodiscard]] bool IsEmpty() override;
    void Dump() override;

private:
    EventPeaTree m_tree;  // guarded by m_mutex
    pthread_mutex_t m_mutex;
};
