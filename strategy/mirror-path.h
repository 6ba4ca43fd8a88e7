// Where an event path lands at the destination of a mirror task. Threads: any.
#pragma once

#include <string>

struct TaskRunInfo;

// The destination root followed by the path, or the root alone for "/".
[[nodiscard]] std::string MirrorGetDstFullPath(const TaskRunInfo& task, const std::string& path);
