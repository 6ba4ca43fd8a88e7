#include "event/event-list.h"

namespace {

// A value that does not fit in its byte is never one of the enumerations; such an event is kept
// whole, and the byte only has to tell it from the values that mean something.
uint8_t ToByte(uint32_t value) { return value <= UINT8_MAX ? static_cast<uint8_t>(value) : 0xFF; }

StoredEvent ToStored(const Event& event) {
    return {ToByte(event.type), ToByte(event.status), ToByte(event.flags), true};
}

bool IsWithinBytes(const Event& event) {
    return event.type <= UINT8_MAX && event.flags <= UINT8_MAX;
}

}  // namespace

size_t EventList::Size() const {
    return (m_first.is_used ? 1 : 0) + (m_more != nullptr ? m_more->size() : 0);
}

void EventList::SetFrontStatus(EventStatus status) {
    (m_first.is_used ? m_first : m_more->front().small).status = ToByte(status);
}

EventCounter EventList::FrontCounter() const {
    return EventCounter::Of(Front().Type(), Front().Status());
}

EventCounter EventList::BackCounter() const {
    return EventCounter::Of(Back().Type(), Back().Status());
}

void EventList::PopFront() {
    if (m_first.is_used) {
        m_first = StoredEvent{};
        return;
    }
    m_more->pop_front();
    DropEmptyRest();
}

bool EventList::IsBackAlike(const Event& event) const {
    const StoredEvent& back = Back();
    if (back.Status() != WAITTING) return false;
    if (m_more != nullptr && m_more->back().whole != nullptr) {
        const Event& whole = *m_more->back().whole;
        return whole.type == event.type && whole.flags == event.flags;
    }
    return back.Type() == event.type && back.flags == event.flags;
}

void EventList::PopBack() {
    if (m_more == nullptr) {
        m_first = StoredEvent{};
        return;
    }
    m_more->pop_back();
    DropEmptyRest();
}

void EventList::PushBack(const Event& event, bool is_place_known) {
    const bool is_small = is_place_known && IsWithinBytes(event);
    if (is_small && IsEmpty()) {
        m_first = ToStored(event);
        return;
    }
    if (m_more == nullptr) m_more = std::make_unique<std::list<Item>>();
    m_more->push_back({ToStored(event), is_small ? nullptr : std::make_unique<const Event>(event)});
}
