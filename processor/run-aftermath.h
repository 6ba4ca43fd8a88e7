// What follows a run of a task besides its outcome: the media index and the ejected device.
// Threads: the task worker's. Failures are logged.
#pragma once

#include <cstdint>

struct TaskRunInfo;

// Hands the destination of an import to the media indexer.
void CreateTaskIndex(uint64_t task_id, const TaskRunInfo& run_info);
// Ejects the task's device if it is set to be. 0, also when it is not, or -1.
[[nodiscard]] int EjectTaskDevice(uint64_t task_id, const TaskRunInfo& run_info);
