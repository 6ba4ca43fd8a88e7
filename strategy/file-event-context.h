// The event that a file worker has in hand, with its task and its full paths: what the file
// handlers work on. Belongs to the worker; a handler on the worker's thread reads it.
#pragma once

#include <string>

#include "event/event.h"
#include "strategy/task-run-info.h"

struct FileEventContext {
    Event event;  // the path is relative to the roots of the task
    TaskRunInfo task;
    std::string src_full_path;
    std::string dst_full_path;

    // Takes the task and computes both full paths of the event.
    void SetTask(const TaskRunInfo& run_info);
    // Empties the event and the paths; the task's references are let go of.
    void Reset();
};

// The place of an event path below a root: the root followed by the path, or the root alone for
// "/".
[[nodiscard]] std::string FullEventPath(const std::string& root, const std::string& event_path);
