#include "daemon/dump-log.h"

#include <sstream>

#include "utils/log.h"

void LogDump(const std::string& text) {
    std::istringstream lines(text);
    std::string line;
    while (std::getline(lines, line)) SLOG_DBG("%s\n", line.c_str());
}
