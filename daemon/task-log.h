// The log rows of what a command did to a task.
#pragma once

#include <cstdint>
#include <string>

#include "db/log-description.h"

// For a description that takes the task's name alone. 0 or -1.
[[nodiscard]] int AddTaskLog(uint64_t task_id, LogDescription::ID id, const std::string& task_name);
// 0 or -1.
[[nodiscard]] int AddRenameLog(uint64_t task_id, const std::string& old_name,
                               const std::string& new_name);
