// How far the run in hand is, for whoever watches it: files and bytes that are in their place.
//
// Threads: every operation from any thread; one lock, held for a moment.
#pragma once

#include <cstdint>
#include <ctime>
#include <mutex>

class RunProgress {
public:
    struct Snapshot {
        uint64_t run = 0;      // counts the runs since the daemon's start; 0 before the first
        uint64_t task_id = 0;  // of the last run that began, also after its end
        time_t start_time = 0;
        uint64_t files = 0;
        uint64_t bytes = 0;
    };

    static RunProgress& GetInstance();

    // A worker has taken the task up.
    void Begin(uint64_t task_id);
    // A file of that task is in its place. Of another task than the last that began: not counted.
    void CountFile(uint64_t task_id, uint64_t bytes);
    [[nodiscard]] Snapshot Get() const;

private:
    mutable std::mutex m_mutex;
    Snapshot m_snapshot;  // guarded by m_mutex
};
