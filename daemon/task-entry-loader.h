// Builds the live entry of a task: resolved paths, strategy, filters, and what is needed to notice
// that the device behind the paths has gone.
#pragma once

#include <string>

struct TaskInfo;
struct TaskRunInfo;

// Builds the entry of a task whose device is mounted on `usb_share_path`. 0, or -1 (logged) with
// `entry` unchanged; then nothing is kept. Any thread; the databases are not asked.
[[nodiscard]] int BuildTaskEntry(const TaskInfo& task, const std::string& usb_share_path,
                                 TaskRunInfo& entry);
