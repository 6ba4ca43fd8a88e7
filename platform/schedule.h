// Timetables of tasks, kept by the platform's scheduler: each task is one entry there, which runs
// the package's notifier with the task's id. A task without a timetable has a disabled entry.
//
// Threads: any; no state is held. Results: true, or false with the reason logged.
// A timetable is a JSON object as text. The platform defines its members; three of them have other
// names in what clients send.
#pragma once

#include <cstdint>
#include <string>

struct KELDSchedTask;

// Makes the entry of a task; `schedule_id` is set on success only.
[[nodiscard]] bool CreateSchedule(uint64_t task_id, int task_type, const std::string& task_name,
                                  bool enabled, const std::string& schedule_json,
                                  int64_t& schedule_id);
// Changes whether the entry is active, and its timetable.
[[nodiscard]] bool UpdateSchedule(int64_t schedule_id, bool enabled,
                                  const std::string& schedule_json);
[[nodiscard]] bool UpdateScheduleName(int64_t schedule_id, const std::string& name);

// Puts a client's timetable into an entry of the caller.
[[nodiscard]] bool ConvertScheduleJson(const std::string& schedule_json, KELDSchedTask* entry);

// Every entry of the package: shown in or hidden from the platform's lists, or removed. A failure
// on one entry does not stop the others; the result tells whether there was one.
[[nodiscard]] bool ShowAllSchedule();
[[nodiscard]] bool HideAllSchedule();
[[nodiscard]] bool RemoveAllSchedule();
