// Whether what a task needs is mounted now, told by the registry of live entries and the platform.
// Threads: any.
#pragma once

#include <cstdint>
#include <string>

// False, with a log line, when there is no such share; else whether its files can be reached.
[[nodiscard]] bool IsShareMounted(const std::string& share_name);
// IsShareMounted of the task's share; false when the task has no entry.
[[nodiscard]] bool IsTaskShareMounted(uint64_t task_id);
// True when the task and its device have entries and the device's path is a share at this moment.
// The outs are filled only then.
[[nodiscard]] bool IsTaskUSBMounted(uint64_t task_id, uint64_t& usb_id, std::string& share_name,
                                    std::string& path);
// False when the device is not mounted, else IsTaskShareMounted.
[[nodiscard]] bool IsTaskRunnable(bool is_usb_mounted, uint64_t task_id);
