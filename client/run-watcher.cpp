#include "client/run-watcher.h"

#include <algorithm>
#include <utility>

namespace {

constexpr time_t RATE_SECONDS = 5;

bool IsActive(const PObject& task) {
    const std::string_view status = task["task_status"].StringView();
    return status == "waiting" || status == "copying" || status == "canceling";
}

TaskLook LookAt(const PObject& task) {
    TaskLook look;
    look.task = task;
    look.is_active = IsActive(task);
    return look;
}

}  // namespace

uint64_t RunWatcher::Rate(uint64_t run, uint64_t bytes, time_t now) {
    if (run != m_sampled_run) m_samples.clear();
    m_sampled_run = run;
    m_samples.push_back({now, bytes});
    while (m_samples.size() > 2 && now - m_samples.front().time > RATE_SECONDS) {
        m_samples.pop_front();
    }
    const Sample& first = m_samples.front();
    if (now <= first.time || bytes < first.bytes) return 0;
    return (bytes - first.bytes) / static_cast<uint64_t>(now - first.time);
}

void RunWatcher::SetProgress(const PObject& progress, time_t now, TaskLook& look) {
    look.has_progress = true;
    look.files = progress["files"].AsUInt64();
    look.bytes = progress["bytes"].AsUInt64();
    look.bytes_per_second = Rate(progress["run"].AsUInt64(), look.bytes, now);
    look.seconds = static_cast<uint64_t>(
        std::max<int64_t>(0, static_cast<int64_t>(now) - progress["start_time"].AsInt64()));
}

// A run that came to its end has left a result. Without one the task was taken out of the queue.
bool RunWatcher::HasGoneWell(const PObject& task, const Known& known, bool has_run) {
    const bool has_result =
        known.is_copying || has_run || task["latest_finish_time"].AsUInt64() != known.finish_time;
    return has_result && task["error_code"].AsInt32() == 0;
}

void RunWatcher::Update(const PObject::array_type& tasks, const PObject& progress, time_t now) {
    const uint64_t run = progress["run"].AsUInt64();
    if (!m_first_run) m_first_run = run;
    m_looks.clear();
    m_is_any_active = false;
    for (const PObject& task : tasks) {
        const uint64_t id = task["id"].AsUInt64();
        if (m_task_id && *m_task_id != id) continue;
        TaskLook look = LookAt(task);
        const uint64_t finish_time = task["latest_finish_time"].AsUInt64();
        Known& known = m_known.try_emplace(id, Known{finish_time, *m_first_run}).first->second;
        const bool was_active = std::exchange(known.is_active, look.is_active);
        // A run may begin and end between two looks: the daemon's count tells.
        const bool is_latest = run != 0 && progress["task_id"].AsUInt64() == id;
        const bool has_run = is_latest && run != known.run;
        const bool has_ended = !look.is_active && (was_active || has_run);
        if (look.is_active || has_run) m_has_seen_run = true;
        if (look.is_active) {
            m_is_any_active = true;
            if (task["task_status"].StringView() != "waiting") known.is_copying = true;
        }
        // A task that waits, or has not run since, would show the numbers of an earlier run.
        if (is_latest && (look.is_active ? task["task_status"].StringView() != "waiting"
                                         : has_run || known.is_copying)) {
            SetProgress(progress, now, look);
        }
        if (has_ended) {
            if (!HasGoneWell(task, known, has_run)) m_has_failed = true;
            known = Known{finish_time, run};
        }
        if (m_task_id || look.is_active || has_ended) m_looks.push_back(std::move(look));
    }
}
