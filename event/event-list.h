// The events of one kind at one node of the tree, oldest first, in as few bytes as can be: nearly
// every list holds one event, and nearly every event has the path and the task that its place in
// the tree tells anyway. Not thread-safe.
#pragma once

#include <cstddef>
#include <cstdint>
#include <list>
#include <memory>

#include "event/event-counter.h"
#include "event/event.h"

// An event in the tree.
struct StoredEvent {
    uint8_t type = EV_EMPTY;
    uint8_t status = WAITTING;
    uint8_t flags = 0;
    bool is_used = false;

    [[nodiscard]] EventStatus Status() const { return static_cast<EventStatus>(status); }
    [[nodiscard]] EventType Type() const { return static_cast<EventType>(type); }
};

class EventList {
public:
    EventList() = default;
    EventList(const EventList&) = delete;
    EventList& operator=(const EventList&) = delete;

    [[nodiscard]] bool IsEmpty() const { return !m_first.is_used && m_more == nullptr; }
    [[nodiscard]] size_t Size() const;
    // True when there is a first event and a worker has it: the node and all below are blocked.
    [[nodiscard]] bool IsBlocked() const { return !IsEmpty() && FrontStatus() != WAITTING; }

    [[nodiscard]] bool IsInWork() const {
        return !IsEmpty() && (FrontStatus() == PROCESSING || FrontStatus() == ABORT);
    }
    void Clear() {
        m_first = StoredEvent{};
        m_more.reset();
    }

    // The list must not be empty for these.
    [[nodiscard]] EventStatus FrontStatus() const { return Front().Status(); }
    void SetFrontStatus(EventStatus status);
    [[nodiscard]] EventCounter FrontCounter() const;
    [[nodiscard]] EventCounter BackCounter() const;
    void PopFront();
    // True when the last event waits and has the same flags and type: the newer request may
    // replace it.
    [[nodiscard]] bool IsBackAlike(const Event& event) const;
    void PopBack();

    // With `is_place_known` the event's path and task are those of the node and the tree and need
    // not be kept.
    void PushBack(const Event& event, bool is_place_known);

    // The first event; path and task are filled in from the place when they were not kept.
    template <typename Place>
    void LoadFront(const Place& place, Event& event) const {
        if (m_first.is_used) return Load(m_first, nullptr, place, event);
        Load(m_more->front().small, m_more->front().whole.get(), place, event);
    }
    // Calls visit(const Event&) for each, in order.
    template <typename Place, typename Visit>
    void ForEach(const Place& place, const Visit& visit) const {
        Event event;
        if (m_first.is_used) {
            Load(m_first, nullptr, place, event);
            visit(event);
        }
        if (m_more == nullptr) return;
        for (const Item& item : *m_more) {
            Load(item.small, item.whole.get(), place, event);
            visit(event);
        }
    }
    // Calls visit(StoredEvent&, const Event* whole) for each, in order, and erases those for which
    // it returns true. `whole` is null when path and task are those of the place.
    template <typename Visit>
    void EraseIf(const Visit& visit) {
        if (m_first.is_used && visit(m_first, static_cast<const Event*>(nullptr))) {
            m_first = StoredEvent{};
        }
        if (m_more == nullptr) return;
        m_more->remove_if([&visit](Item& item) { return visit(item.small, item.whole.get()); });
        DropEmptyRest();
    }

    // place(Event&) sets path and task_id.
    template <typename Place>
    static void Load(const StoredEvent& small, const Event* whole, const Place& place,
                     Event& event) {
        if (whole != nullptr) {
            event = *whole;
        } else {
            event.type = small.Type();
            event.flags = small.flags;
            place(event);
        }
        event.status = small.Status();
    }

private:
    // `whole` is set when path or task differ from what the place tells; `small` is valid always.
    struct Item {
        StoredEvent small;
        std::unique_ptr<const Event> whole;
    };

    [[nodiscard]] const StoredEvent& Front() const {
        return m_first.is_used ? m_first : m_more->front().small;
    }
    [[nodiscard]] const StoredEvent& Back() const {
        return m_more != nullptr ? m_more->back().small : m_first;
    }
    void DropEmptyRest() {
        if (m_more->empty()) m_more.reset();
    }

    StoredEvent m_first;  // the oldest event, when it is small and its place is known
    std::unique_ptr<std::list<Item>> m_more;  // the others; null when there are none
};
