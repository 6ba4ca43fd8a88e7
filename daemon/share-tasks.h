// The tasks that stand on a share, as the hooks of the share service look for them.
#pragma once

#include <list>
#include <string>

struct TaskInfo;

// Lists the rows of the share's tasks, which may be none. 0, or -1 (logged).
[[nodiscard]] int ListTasksOfShare(const std::string& share_name, std::list<TaskInfo>& tasks);
