// The task that the task worker has in hand.
#pragma once

#include <atomic>
#include <cstdint>

#include "strategy/task-run-info.h"

struct TaskEvent {
    std::atomic<uint64_t> task_id{0};  // 0: none; read by control threads
    TaskRunInfo run_info;              // the worker's alone; empty until the run is prepared

    [[nodiscard]] bool IsValid() const { return task_id.load() != 0; }
    void Reset() {
        task_id = 0;
        // What a former run was about must not be taken for this one's.
        run_info = TaskRunInfo();
    }
};
