#include "strategy/version-start.h"

#include <algorithm>
#include <vector>

#include "strategy/task-run-info.h"
#include "strategy/version-mark.h"
#include "strategy/version-name.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr int TRIES = 3600;

bool IsUnfinished(const TaskRunInfo& task, const std::string& name) {
    std::vector<VersionMark> marks;
    if (ReadVersionMarks(task.task_id, marks) < 0) return false;
    return std::any_of(marks.begin(), marks.end(), [&](const VersionMark& mark) {
        return mark.kind == VersionMark::FILLING && mark.name == name &&
               MarkedFolder(mark, task) == task.dst_dir_path;
    });
}

}  // namespace

int NameNewVersion(const TaskRunInfo& task, time_t start, std::string& version_dir) {
    tzset();  // the zone may have been changed since the last run
    for (int second = 0; second < TRIES; ++second) {
        std::string name;
        if (NameVersion(start + second, name) < 0) return -1;
        const std::string path = task.dst_dir_path + "/" + name;
        if (!FSExists(path) || IsUnfinished(task, name)) {
            version_dir = name;
            return 0;
        }
        SLOG_INFO("There is a version '%s' of task '%llu' already", path.c_str(),
                  Llu(task.task_id));
    }
    return -1;
}
