// Which tasks copy to or from a share. Threads: any.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "ipc/pobject.h"

// Those of `tasks`, descriptions as the daemon gives them, that name this share.
[[nodiscard]] std::vector<PObject> TasksOfShare(const PObject::array_type& tasks,
                                                std::string_view share);
// "3 Camera, 7 Old disk"; empty for none.
[[nodiscard]] std::string TaskLabels(const std::vector<PObject>& tasks);
