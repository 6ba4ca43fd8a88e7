// The text form of an event for all logs, as in "Event<EV_COPY> (WAITTING): [7] /a (file_op,file)".
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>

#include "event/event.h"

// Builds the text in place; only a long path takes it to the heap. For the length of a statement or
// a block; `SLOG_INFO("...%s\n", EventText(event).CStr())`.
class EventText {
public:
    explicit EventText(const Event& event);
    EventText(const EventText&) = delete;
    EventText& operator=(const EventText&) = delete;

    [[nodiscard]] const char* CStr() const { return m_text; }
    [[nodiscard]] std::string_view View() const { return {m_text, m_size}; }

private:
    char m_buffer[384];
    std::unique_ptr<char[]> m_heap;
    char* m_text;
    size_t m_size = 0;
};

[[nodiscard]] std::string ToString(const Event& event);
