// What a log row tells: a number and its text parameters. The sentence is the displaying side's.
//
// The numbers are stored in log rows: they are never renumbered.
#pragma once

namespace LogDescription {

enum ID : int {
    LOG_DESC_TASK_ADDED = 0,             // task name
    LOG_DESC_TASK_REMOVED = 1,           // task name
    LOG_DESC_DEFAULT_TASK_ENABLED = 2,   // task name
    LOG_DESC_DEFAULT_TASK_DISABLED = 3,  // task name
    LOG_DESC_TASK_RENAMED = 10,          // old task name, new task name
    LOG_DESC_TASK_SETTING_CHANGED = 11,  // task name
    LOG_DESC_TASK_STARTED = 100,         // task name
    LOG_DESC_TASK_DONE = 101,            // task name
    LOG_DESC_TASK_STOPPED = 102,         // task name
    LOG_DESC_TASK_FAILED = 103,          // task name; the row's error holds the result
    LOG_DESC_ROTATED = 104,              // task name, last part of the removed path
    LOG_DESC_FILE_FAILED = 1000,         // task name, last part of the path; error: the outcome
};

}  // namespace LogDescription
