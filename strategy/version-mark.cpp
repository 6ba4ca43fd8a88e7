#include "strategy/version-mark.h"

#include <pthread.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "platform/durable-file.h"
#include "platform/global-setting.h"
#include "strategy/task-run-info.h"
#include "utils/confined-path.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

namespace {

pthread_mutex_t g_file_mutex = PTHREAD_MUTEX_INITIALIZER;

std::string MarksPath(uint64_t task_id) {
    return GetRepoVolPath() + "/@Ferrix/task/" + std::to_string(task_id) + "/version-marks";
}

// Names hold any byte but this one, which ends each of the five texts of a mark.
void AddText(std::string& content, const std::string& text) {
    content.append(text).push_back('\0');
}

std::string ToContent(const std::vector<VersionMark>& marks) {
    std::string content;
    for (const VersionMark& mark : marks) {
        AddText(content, {static_cast<char>(mark.kind), mark.is_on_device ? 'd' : 's'});
        AddText(content, mark.share_name);
        AddText(content, mark.root);
        AddText(content, mark.folder);
        AddText(content, mark.name);
    }
    return content;
}

bool TakeText(const std::string& content, size_t& at, std::string& text) {
    const size_t end = content.find('\0', at);
    if (end == std::string::npos) return false;
    text = content.substr(at, end - at);
    at = end + 1;
    return true;
}

bool TakeMark(const std::string& content, size_t& at, VersionMark& mark) {
    std::string kind;
    if (!TakeText(content, at, kind) || !TakeText(content, at, mark.share_name) ||
        !TakeText(content, at, mark.root) || !TakeText(content, at, mark.folder) ||
        !TakeText(content, at, mark.name)) {
        return false;
    }
    if (kind.size() != 2 || (kind[0] != VersionMark::FILLING && kind[0] != VersionMark::REMOVING)) {
        return false;
    }
    mark.kind = static_cast<VersionMark::Kind>(kind[0]);
    mark.is_on_device = kind[1] == 'd';
    // A version lies in its folder: nothing that a damaged file says leads elsewhere.
    return !mark.name.empty() && mark.name.find('/') == std::string::npos && mark.name != "..";
}

int Read(const std::string& path, std::vector<VersionMark>& marks) {
    marks.clear();
    std::string content;
    const int found = ReadDurableFile(path, content);
    if (found < 0) {
        SLOG_ERR("Failed to read the marks of versions '%s': %s", path.c_str(),
                 std::strerror(errno));
        return -1;
    }
    for (size_t at = 0; found == 1 && at < content.size();) {
        VersionMark mark;
        if (!TakeMark(content, at, mark)) {
            SLOG_WARN("The marks of versions '%s' are damaged", path.c_str());
            break;
        }
        marks.push_back(mark);
    }
    return 0;
}

int Write(const std::string& path, const std::vector<VersionMark>& marks) {
    const int result =
        marks.empty() ? RemoveDurableFile(path) : WriteDurableFile(path, ToContent(marks));
    if (result == 0) return 0;
    SLOG_ERR("Failed to write the marks of versions '%s': %s", path.c_str(), std::strerror(errno));
    return -1;
}

}  // namespace

VersionMark MakeVersionMark(const TaskRunInfo& task, VersionMark::Kind kind) {
    VersionMark mark;
    mark.kind = kind;
    mark.is_on_device = task.is_export;
    mark.share_name = task.hub_share_name;
    mark.root = task.is_export ? task.device_mount_path : "";
    if (task.dst_root) mark.root = task.dst_root->Path();
    if (!task.dst_dir_path.starts_with(mark.root)) mark.root.clear();
    mark.folder = task.dst_dir_path.substr(mark.root.size());
    mark.name = task.version_dir;
    return mark;
}

std::string MarkedFolder(const VersionMark& mark, const TaskRunInfo& task) {
    const bool is_moved = mark.is_on_device && !mark.root.empty();
    return (is_moved ? task.device_mount_path : mark.root) + mark.folder;
}

int ReadVersionMarks(uint64_t task_id, std::vector<VersionMark>& marks) {
    const std::string path = MarksPath(task_id);  // asks the platform, so without the lock
    const MutexLock lock(g_file_mutex);
    return Read(path, marks);
}

int PutVersionMarks(uint64_t task_id, const std::vector<VersionMark>& marks) {
    const std::string path = MarksPath(task_id);
    const MutexLock lock(g_file_mutex);
    std::vector<VersionMark> all;
    if (Read(path, all) < 0) return -1;
    all.insert(all.end(), marks.begin(), marks.end());
    return Write(path, all);
}

int DropVersionMarks(uint64_t task_id, const std::vector<VersionMark>& marks) {
    const std::string path = MarksPath(task_id);
    const MutexLock lock(g_file_mutex);
    std::vector<VersionMark> all;
    if (Read(path, all) < 0) return -1;
    const auto is_dropped = [&](const VersionMark& mark) {
        return std::find(marks.begin(), marks.end(), mark) != marks.end();
    };
    const size_t count = all.size();
    all.erase(std::remove_if(all.begin(), all.end(), is_dropped), all.end());
    if (all.size() == count) return 0;
    // Tried twice: a mark that stays, or comes back after a power cut, makes a whole version bad.
    return Write(path, all) == 0 ? 0 : Write(path, all);
}
