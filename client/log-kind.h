// The kinds of log rows (LogDB::LOG_TYPE) under the names that people use for them.
#pragma once

#include <string>
#include <vector>

#include "client/terminal.h"

// "info", "task" (a run that failed or was stopped), "file" (a file that failed).
[[nodiscard]] const std::vector<std::string>& LogKindNames();
// The name of a LOG_TYPE; its number in digits when it is none.
[[nodiscard]] std::string LogKindName(int log_type);
// The LOG_TYPE of one of the names; 0 for any other text.
[[nodiscard]] int LogTypeOf(const std::string& name);
[[nodiscard]] Colour LogKindColour(int log_type);
