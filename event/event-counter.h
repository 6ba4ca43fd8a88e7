// Three numbers over a set of events.
#pragma once

#include <cstdint>
#include <string>

#include "event/event.h"

struct EventCounter {
    int32_t count = 0;
    int32_t processing = 0;  // PROCESSING or ABORT
    int32_t non_remove = 0;  // type other than EV_REMOVE

    // What one event adds.
    static EventCounter Of(EventType type, EventStatus status);

    EventCounter& operator+=(const EventCounter& other);
    EventCounter& operator-=(const EventCounter& other);
    friend EventCounter operator+(EventCounter a, const EventCounter& b) { return a += b; }
    friend EventCounter operator-(EventCounter a, const EventCounter& b) { return a -= b; }
    friend bool operator==(const EventCounter&, const EventCounter&) = default;

    [[nodiscard]] std::string ToString() const;
};
