// Tells the user by a desktop notification how a run has ended.
#pragma once

#include <cstdint>
#include <string>

// Sends the notification that belongs to the run's outcome (ErrorCode). Returns 0, or -1 (logged)
// when the appliance's name cannot be read; whether it was delivered is not known. Any thread.
[[nodiscard]] int SendNotification(uint64_t task_id, const std::string& task_name, int code);
