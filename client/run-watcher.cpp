#include "client/run-watcher.h"

#include <algorithm>

namespace {

constexpr time_t RATE_SECONDS = 5;

bool IsActive(const PObject& task) {
    const std::string_view status = task["task_status"].StringView();
    return status == "waiting" || status == "copying" || status == "canceling";
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

TaskLook RunWatcher::LookAt(const PObject& task, const PObject& progress, time_t now) {
    TaskLook look;
    look.task = task;
    look.is_active = IsActive(task);
    // A task that only waits has the numbers of an earlier run of its own, if any.
    look.has_progress = progress["run"].AsUInt64() != 0 &&
                        progress["task_id"].AsUInt64() == task["id"].AsUInt64() &&
                        task["task_status"].StringView() != "waiting";
    if (!look.has_progress) return look;
    look.files = progress["files"].AsUInt64();
    look.bytes = progress["bytes"].AsUInt64();
    look.bytes_per_second = Rate(progress["run"].AsUInt64(), look.bytes, now);
    look.seconds = static_cast<uint64_t>(
        std::max<int64_t>(0, static_cast<int64_t>(now) - progress["start_time"].AsInt64()));
    return look;
}

void RunWatcher::Update(const PObject::array_type& tasks, const PObject& progress, time_t now) {
    const uint64_t run = progress["run"].AsUInt64();
    if (!m_first_run) m_first_run = run;
    m_looks.clear();
    m_is_any_active = false;
    std::vector<uint64_t> active;
    for (const PObject& task : tasks) {
        const uint64_t id = task["id"].AsUInt64();
        if (m_task_id && *m_task_id != id) continue;
        TaskLook look = LookAt(task, progress, now);
        // A run may begin and end between two looks: the daemon's count tells.
        const bool has_run = run != *m_first_run && progress["task_id"].AsUInt64() == id;
        const bool was_active = std::find(m_active.begin(), m_active.end(), id) != m_active.end();
        if (look.is_active) {
            active.push_back(id);
            m_is_any_active = true;
        }
        if (look.is_active || has_run) m_has_seen_run = true;
        if (!look.is_active && (was_active || has_run)) {
            m_has_failed = task["task_status"].StringView() != "successful";
        }
        if (m_task_id || look.is_active || was_active || has_run)
            m_looks.push_back(std::move(look));
    }
    m_active = std::move(active);
}
