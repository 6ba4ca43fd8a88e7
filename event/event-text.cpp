#include "event/event-text.h"

#include <charconv>
#include <cstring>

namespace {

// Everything but the path: the longest names, twenty digits and the punctuation need 72 bytes.
constexpr size_t kFrameSize = 96;

const char* TypeName(EventType type) {
    switch (type) {
        case EV_EMPTY:
            return "EV_EMPTY";
        case EV_REMOVE:
            return "EV_REMOVE";
        case EV_CREATE:
            return "EV_CREATE";
        case EV_COPY:
            return "EV_COPY";
    }
    return "";
}

const char* StatusName(EventStatus status) {
    switch (status) {
        case WAITTING:
            return "WAITTING";
        case PROCESSING:
            return "PROCESSING";
        case BLOCKING:
            return "BLOCKING";
        case DONE:
            return "DONE";
        case ABORT:
            return "ABORT";
    }
    return "";
}

char* Put(char* out, std::string_view text) {
    std::memcpy(out, text.data(), text.size());
    return out + text.size();
}

}  // namespace

EventText::EventText(const Event& event) : m_text(m_buffer) {
    const size_t needed = kFrameSize + event.path.size();
    if (needed > sizeof(m_buffer)) {
        m_heap = std::make_unique_for_overwrite<char[]>(needed);
        m_text = m_heap.get();
    }
    char* out = Put(m_text, "Event<");
    out = Put(out, TypeName(event.type));
    out = Put(out, "> (");
    out = Put(out, StatusName(event.status));
    out = Put(out, "): [");
    out = std::to_chars(out, out + 20, event.task_id).ptr;
    out = Put(out, "] ");
    out = Put(out, event.path);
    out = Put(out, event.IsScan() ? " (scan" : " (file_op");
    out = Put(out, event.IsDir() ? ",dir)" : ",file)");
    *out = '\0';
    m_size = static_cast<size_t>(out - m_text);
}

std::string ToString(const Event& event) { return std::string(EventText(event).View()); }
