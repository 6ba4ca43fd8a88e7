// Dumps for the debug log.
#pragma once

#include <string>

// Writes a text of many lines, a log line for each.
void LogDump(const std::string& text);
