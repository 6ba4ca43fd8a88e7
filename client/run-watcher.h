// What a watcher makes of one look at the daemon after the other: which tasks are at work, how far
// and how fast they are, and when what it waits for has ended.
//
// Threads: belongs to one thread. It asks for nothing: looks are handed in.
#pragma once

#include <cstdint>
#include <ctime>
#include <deque>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "ipc/pobject.h"

// A task as it is at one look.
struct TaskLook {
    PObject task;                   // the daemon's description
    bool is_active = false;         // waits, copies or is being cancelled
    bool has_progress = false;      // the numbers below are of its run
    uint64_t files = 0;             // in their place
    uint64_t bytes = 0;             // of these
    uint64_t bytes_per_second = 0;  // of late
    uint64_t seconds = 0;           // since the run began
};

class RunWatcher {
public:
    // Watches one task, or, without an id, all.
    explicit RunWatcher(std::optional<uint64_t> task_id) : m_task_id(task_id) {}

    // Takes a look in: the descriptions of all tasks, the answer about the progress, and the time.
    void Update(const PObject::array_type& tasks, const PObject& progress, time_t now);

    // The watched task, or all that are active; and those whose run ended since the look before.
    [[nodiscard]] const std::vector<TaskLook>& Looks() const { return m_looks; }
    // True once a run was seen, or had begun since the first look, and none goes on.
    [[nodiscard]] bool HasEnded() const { return m_has_seen_run && !m_is_any_active; }
    // Whether one that ended did not end well, or was taken out of the queue before it could begin.
    [[nodiscard]] bool HasFailed() const { return m_has_failed; }

private:
    struct Sample {
        time_t time;
        uint64_t bytes;
    };

    // What is known of a task from the looks before.
    struct Known {
        uint64_t finish_time;  // of its last run that has been dealt with
        uint64_t run;          // the daemon's count of runs then
        bool is_active = false;
        bool is_copying = false;  // or has been, since then
    };

    static bool HasGoneWell(const PObject& task, const Known& known, bool has_run);
    void SetProgress(const PObject& progress, time_t now, TaskLook& look);
    uint64_t Rate(uint64_t run, uint64_t bytes, time_t now);

    std::optional<uint64_t> m_task_id;
    std::vector<TaskLook> m_looks;
    std::map<uint64_t, Known> m_known;    // by task id
    std::optional<uint64_t> m_first_run;  // the daemon's count of runs at the first look
    std::deque<Sample> m_samples;         // of the run m_sampled_run
    uint64_t m_sampled_run = 0;
    bool m_has_seen_run = false;
    bool m_is_any_active = false;
    bool m_has_failed = false;
};
