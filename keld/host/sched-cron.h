// Entries of the scheduler as lines for cron.
#pragma once

#include <string>
#include <vector>

#include "host/sched-entry.h"

namespace keld_host {

// Whether a line of a timetable can hold the command: no control character but the tab (a newline
// would begin another line), no backslash (versions of cron do not agree on it before a percent
// sign), and not too long for cron, which cuts.
[[nodiscard]] bool IsCronCommand(const std::string& command);

// The name of a user of the box; empty when there is none with this id, or one that would break a
// line.
[[nodiscard]] std::string CronUserName(int uid);

// The whole file for these entries: a line for each time of those that are enabled, listable, and
// have a timetable and a command. One whose owner is gone or whose command cron cannot hold is left
// out, with a line in the log.
[[nodiscard]] std::string CronFileText(const std::vector<SchedEntry>& entries);

// Puts the text in place as cron's file, where it differs from what is there. Returns 0 or an
// errno.
[[nodiscard]] int WriteCronFile(const std::string& text);

}  // namespace keld_host
