// Where an event path lands at the destination of a version task. Threads: any.
#pragma once

#include <string>

struct TaskRunInfo;

// The destination root, the folder of the run, and then the path; the folder alone for "/".
[[nodiscard]] std::string VersionGetDstFullPath(const TaskRunInfo& task, const std::string& path);
