#include "event/event-counter.h"

EventCounter EventCounter::Of(EventType type, EventStatus status) {
    return {1, status == PROCESSING || status == ABORT ? 1 : 0, type != EV_REMOVE ? 1 : 0};
}

EventCounter& EventCounter::operator+=(const EventCounter& other) {
    count += other.count;
    processing += other.processing;
    non_remove += other.non_remove;
    return *this;
}

EventCounter& EventCounter::operator-=(const EventCounter& other) {
    count -= other.count;
    processing -= other.processing;
    non_remove -= other.non_remove;
    return *this;
}

std::string EventCounter::ToString() const {
    return "{count: " + std::to_string(count) + ", processing: " + std::to_string(processing) +
           ", non-remove: " + std::to_string(non_remove) + "}";
}
