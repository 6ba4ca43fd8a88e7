// The one way of adding a row to the daemon's log database.
#pragma once

#include "db/log-info.h"

// Stamps the record with the present time and stores it. Returns 0; -1 when the record has no task
// id or no description, or when the row cannot be stored. Any thread.
[[nodiscard]] int AddLog(LogInfo& info);
