#include "client/share-tasks.h"

#include "client/task-text.h"
#include "db/task-info.h"

namespace {

// The task's folder on the box begins with the name of its share: "/photos/inbox". A default task
// without a share has "/".
bool IsOnShare(const PObject& task, std::string_view share) {
    const bool is_export = task["type"].AsInt32() == TASK_TYPE_EXPORT_GENERAL;
    std::string_view path = task[is_export ? "source_path" : "destination_path"].StringView();
    if (!path.starts_with('/')) return false;
    path.remove_prefix(1);
    return !share.empty() && path.substr(0, path.find('/')) == share;
}

}  // namespace

std::vector<PObject> TasksOfShare(const PObject::array_type& tasks, std::string_view share) {
    std::vector<PObject> found;
    for (const PObject& task : tasks) {
        if (IsOnShare(task, share)) found.push_back(task);
    }
    return found;
}

std::string TaskLabels(const std::vector<PObject>& tasks) {
    std::string labels;
    for (const PObject& task : tasks) labels += (labels.empty() ? "" : ", ") + TaskLabel(task);
    return labels;
}
