#include "strategy/file-event-context.h"

void FileEventContext::SetTask(const TaskRunInfo& run_info) {
    task = run_info;
    src_full_path = FullEventPath(task.src_dir_path, event.path);
    dst_full_path = FullEventPath(task.dst_dir_path, event.path);
}

void FileEventContext::Reset() { *this = FileEventContext(); }

std::string FullEventPath(const std::string& root, const std::string& event_path) {
    return event_path == "/" ? root : root + event_path;
}
