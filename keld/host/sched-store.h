// The stored entries of the scheduler: one file for each, and cron's file, which follows them.
//
// Threads: any; several processes may use the store at once (each change is made under a file
// lock). Results are 0 or a KELDERR value. After a failure the stored entries and cron's file are
// what they were, as far as the disk allows.
#pragma once

#include <vector>

#include "host/sched-entry.h"

namespace keld_host {

// KELDERR_SRC_MISS when there is no such id, KELDERR_IO for a damaged file.
[[nodiscard]] int LoadSchedEntry(int id, SchedEntry* entry);

// All entries by rising id; damaged files are left out, with a line in the log.
[[nodiscard]] int ListSchedEntries(std::vector<SchedEntry>* entries);

// Stores a new entry (id below 1) under a new id, or the changes of a stored one. `entry` is then
// as stored.
[[nodiscard]] int SaveSchedEntry(SchedEntry* entry);

[[nodiscard]] int RemoveSchedEntry(int id);

}  // namespace keld_host
