// The thread-safe face of one task's pending events. An interface, so that other orders can be
// plugged in.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include "event/event.h"

class EventPool {
public:
    explicit EventPool(uint64_t task_id) : m_task_id(task_id) {}
    virtual ~EventPool() = default;
    EventPool(const EventPool&) = delete;
    EventPool& operator=(const EventPool&) = delete;

    // An event that is empty (Event::IsEmpty) is silently refused.
    virtual void Push(const Event& event) = 0;
    // 1 with an event in `event`, 0 when none can run now.
    [[nodiscard]] virtual int Pop(Event& event) = 0;
    // Always -1 in the orders there are.
    [[nodiscard]] virtual int PopByPath(const std::string& path, Event& event) = 0;
    // Ends, or gives back, an event that was popped. 0, or -1 when no such event is in work.
    virtual int Done(const Event& event) = 0;
    virtual int Redo(const Event& event) = 0;
    virtual void Clear() = 0;
    // Events in work are counted too: a pool is not empty while a worker has one of its events.
    [[nodiscard]] virtual size_t Size() = 0;
    [[nodiscard]] virtual size_t GetScanEventCount() = 0;
    [[nodiscard]] virtual bool IsEmpty() = 0;
    virtual void Dump() = 0;

    [[nodiscard]] uint64_t GetTaskId() const { return m_task_id; }

private:
    friend class EventManager;

    const uint64_t m_task_id;
    bool m_in_ready_queue = false;  // EventManager's, under its mutex
};
