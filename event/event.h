// One unit of file work of a task. A plain value that is copied at every hand-over.
#pragma once

#include <cstdint>
#include <string>

enum EventType : uint32_t {
    EV_EMPTY = 0,
    EV_REMOVE = 1,  // remove the entry
    EV_CREATE = 2,  // create the folder; also the type of every scan event
    EV_COPY = 3,    // copy the file
};

enum EventStatus : uint32_t {
    WAITTING = 0,    // queued, may be popped
    PROCESSING = 1,  // a worker has it; it stays in the tree until it is done or redone
    BLOCKING = 2,    // never set
    DONE = 3,        // never set: a finished event is erased
    ABORT = 4,       // was PROCESSING when a removal above it arrived
};

enum EventFlag : uint32_t {
    EVENT_FLAG_DIR = 1U << 0,   // the entry is a folder
    EVENT_FLAG_SCAN = 1U << 1,  // a folder to be looked at, not a file operation
};

struct Event {
    EventType type = EV_EMPTY;
    EventStatus status = WAITTING;
    uint64_t task_id = 0;  // 0: no task
    std::string path;    // relative to the task's root; "/" is the root, all others start with "/"
    uint32_t flags = 0;  // EventFlag

    [[nodiscard]] bool IsDir() const { return (flags & EVENT_FLAG_DIR) != 0; }
    [[nodiscard]] bool IsScan() const { return (flags & EVENT_FLAG_SCAN) != 0; }
    // True for what stands for the absence of an event: no path, no type or no task.
    [[nodiscard]] bool IsEmpty() const { return path.empty() || type == EV_EMPTY || task_id == 0; }
};
