// What follows from a task's record: its kind, its folders, its texts. Threads: any; IsDefaultTask
// reads TaskDB and takes its lock, GetHubDirFullPath asks the platform for the share.
#pragma once

#include <cstdint>
#include <string>

#include "db/task-info.h"

[[nodiscard]] bool IsExportTask(int task_type);
// Only version tasks have versions to rotate.
[[nodiscard]] bool NeedRotation(int copy_strategy, bool enable_rotation);
// True for the two uuids that stand for the front USB port and the SD slot.
[[nodiscard]] bool IsDefaultUUID(const std::string& uuid);
// True when the task belongs to one of these; false (logged) when it cannot be read.
[[nodiscard]] bool IsDefaultTask(uint64_t task_id);

// Paths on the file system. A folder of "/" adds nothing, so no result ends in "/" for it. Where
// the result is an int it is 0, or -1 (logged) with the outs unchanged: the share cannot be opened.
[[nodiscard]] int GetHubDirFullPath(const std::string& share_name, const std::string& folder,
                                    std::string& path);
void GetUSBDirFullPath(const std::string& usb_share_path, const std::string& folder,
                       std::string& path);
// Source and destination by the direction of the task.
[[nodiscard]] int GetTaskFullPaths(const std::string& usb_share_path, const TaskInfo& task,
                                   std::string& source, std::string& destination);

// Paths to show to a user: "/" and the share with its folder, and the folder on the device.
[[nodiscard]] std::string GetHubDisplayPath(const TaskInfo& task);
void GetTaskDisplayPaths(const TaskInfo& task, std::string& source, std::string& destination);
