#include "daemon/task-folder.h"

#include <sys/stat.h>

#include "platform/global-setting.h"
#include "utils/file-op.h"

namespace {

constexpr char TASK_FOLDERS[] = "/@Ferrix/task";

constexpr int REPOSITORY_LEVELS = 3;  // "@Ferrix", "task" and the folder of the task

// The daemon works with an empty umask, for the sake of what it copies. Its own files are not to be
// replaced by others.
void CloseToOthers(const std::string& folder) {
    struct stat info = {};
    if (stat(folder.c_str(), &info) != 0) return;
    if ((info.st_mode & (S_IWGRP | S_IWOTH)) == 0) return;
    chmod(folder.c_str(), info.st_mode & 07777 & ~static_cast<mode_t>(S_IWGRP | S_IWOTH));
}

std::string TaskFile(uint64_t task_id, const char* name) {
    const std::string folder = TaskFolderPath(task_id);
    return folder.empty() ? "" : folder + "/" + name;
}

}  // namespace

std::string TaskFolderPath(uint64_t task_id) {
    const std::string volume = GetRepoVolPath();
    return volume.empty() ? "" : volume + TASK_FOLDERS + "/" + std::to_string(task_id);
}

int MakeTaskFolder(uint64_t task_id) {
    std::string folder = TaskFolderPath(task_id);
    if (FSMKDir(folder, true, FS_KEEP_UID, FS_KEEP_GID) < 0) return -1;
    for (int level = 0; level < REPOSITORY_LEVELS; ++level) {
        CloseToOthers(folder);
        folder = PathDirName(folder);
    }
    return 0;
}

std::string UserConfigPath(uint64_t task_id) { return TaskFile(task_id, "user.config"); }

std::string FileDBPath(uint64_t task_id) { return TaskFile(task_id, "file-db.sqlite"); }

std::string BlackListPath(uint64_t task_id) { return TaskFile(task_id, "blacklist.filter"); }

std::string WhiteListPath(uint64_t task_id) { return TaskFile(task_id, "whitelist.filter"); }

bool IsInnerFolder(const std::string& folder) {
    if (folder.empty()) return true;
    if (folder.front() != '/') return false;
    return (folder + "/").find("/../") == std::string::npos;
}
