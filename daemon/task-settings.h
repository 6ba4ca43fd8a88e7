// What a client may change of a task that exists: from the request into the row, and from the row
// into the live entry. The source side of a task is never changed, only its destination.
#pragma once

#include <string>

class PObject;
struct TaskInfo;
struct TaskRunInfo;

// Takes what the request changes; keys that are absent and texts that are empty leave the value
// alone. True when anything differs now.
[[nodiscard]] bool TakeTaskSettings(const PObject& request, TaskInfo& task);
// True when a folder that differs from the old one leads out of the share or the device.
[[nodiscard]] bool LeadsOut(const TaskInfo& task, const TaskInfo& old_task);
// Copies what a client may change, but for the folders, from the row into the entry.
void CopyTaskSettings(const TaskInfo& task, TaskRunInfo& entry);
// Carries the row into the entry of its task, whose device is mounted on `usb_share_path`. The
// source and the version folder stay, and so does the destination when the share cannot be opened.
void ApplyTaskSettings(const TaskInfo& task, const std::string& usb_share_path, TaskRunInfo& entry);
