// Log rows as lines for people and as JSON for scripts.
#pragma once

#include <json/value.h>

#include <string>

class LogInfo;
class Terminal;

// Time, kind and sentence, with a line end; failures stand out where there are colours.
[[nodiscard]] std::string LogLine(const LogInfo& row, const Terminal& terminal);

// "time" (local, with its offset from UTC) and "timestamp" (seconds since the epoch), "task_id",
// "type", "description_id", "parameters" (null when damaged), "error", "error_text", "sentence".
[[nodiscard]] Json::Value LogJson(const LogInfo& row);
