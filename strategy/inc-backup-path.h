// Event paths and full paths at the destination of an incremental task. Threads: any.
#pragma once

#include <string>

struct TaskRunInfo;

// The destination root followed by the path, or the root alone for "/".
[[nodiscard]] std::string IncBackupGetDstFullPath(const TaskRunInfo& task,
                                                  const std::string& dst_ev_path);
// The way back: what follows the destination root in `full_path`, "/" for the root itself, and the
// empty text for a path that is not below it.
[[nodiscard]] std::string IncBackupGetDstEventPath(const TaskRunInfo& task,
                                                   const std::string& full_path);
