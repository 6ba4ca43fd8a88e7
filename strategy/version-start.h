// Which folder a run of a version task fills.
#pragma once

#include <ctime>
#include <string>

struct TaskRunInfo;

// The name of the folder of a run that begins at `start`. If there is a version of that time (the
// clock was set back, the hour comes twice, or the task has run in this very second), the run must
// not go into it: the name is that of the next second that is free. A folder that is marked as
// unfinished is what an earlier attempt of the run has left, and no other's.
// 0; -1 when the time cannot be told or there is none free in an hour.
[[nodiscard]] int NameNewVersion(const TaskRunInfo& task, time_t start, std::string& version_dir);
