#include "strategy/version-end.h"

#include <unistd.h>

#include <optional>
#include <vector>

#include "event/event-manager.h"
#include "platform/keld-sdk-wrapper.h"
#include "processor/task-mounts.h"
#include "strategy/task-run-info.h"
#include "strategy/version-mark.h"
#include "strategy/version-name.h"
#include "strategy/version-path.h"
#include "utils/confined-path.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr unsigned POLL_STEP_US = 10000;
constexpr int POLL_STEPS = 1000;  // ten seconds

// A file worker with a file of this run in hand would make the folder anew after it was renamed.
// Its abort flag is set; it lets go within moments, unless the device hangs.
bool IsLetGoByFileWorkers(const TaskRunInfo& task) {
    for (int step = 0; step < POLL_STEPS; ++step) {
        if (EventManager::GetInstance().GetHeldEventCount(task.task_id) == 0) return true;
        usleep(POLL_STEP_US);
    }
    SLOG_WARN("A file of task '%llu' is still being copied", Llu(task.task_id));
    return false;
}

// Whether what the mark is about can be seen: else a version that is missing means nothing.
bool IsReachable(const VersionMark& mark, const TaskRunInfo& task) {
    const bool is_mounted = mark.is_on_device
                                ? SDK::IsDevicePresent(task.device_mount_path, task.device_identity)
                                : IsShareMounted(mark.share_name);
    return is_mounted && FSExists(MarkedFolder(mark, task));
}

// False when it has to be tried again later. `is_there` tells whether there was such a folder.
bool Settle(const VersionMark& mark, const TaskRunInfo& task, bool& is_there) {
    is_there = false;
    const std::string folder = MarkedFolder(mark, task);
    std::optional<ConfinedRoot> confined;  // the task may have moved to another share meanwhile
    if (!mark.root.empty()) confined.emplace(folder.substr(0, folder.size() - mark.folder.size()));
    if (!IsReachable(mark, task)) return false;
    const std::string path = folder + "/" + mark.name;
    FSInfo info;
    if (FSStat(path, info) < 0) return false;
    is_there = info.exist;
    if (is_there && MarkVersionBad(task, path) < 0) return false;
    return FSSyncFileSystem(folder) == 0;  // not to be lost when the mark is gone
}

void DropSettled(const TaskRunInfo& task, const std::vector<VersionMark>& marks) {
    if (DropVersionMarks(task.task_id, marks) == 0) return;
    SLOG_WARN("Settled versions of task '%llu' are looked at again when it is loaded",
              Llu(task.task_id));
}

void SettleMarks(const TaskRunInfo& task, bool is_loading) {
    std::vector<VersionMark> marks;
    if (ReadVersionMarks(task.task_id, marks) < 0 || marks.empty()) return;
    std::vector<VersionMark> settled;
    // Versions are removed one after the other: what comes after the first that is still there has
    // not been touched and is as good as it was.
    bool is_found = false;
    bool is_waiting = false;
    for (const VersionMark& mark : marks) {
        const bool is_removal = mark.kind == VersionMark::REMOVING;
        if (is_removal && (!is_loading || is_waiting)) continue;
        bool is_there = false;
        const bool is_settled = (is_removal && is_found) || Settle(mark, task, is_there);
        if (is_settled) settled.push_back(mark);
        if (is_removal && is_there) is_found = true;
        if (is_removal && !is_settled) is_waiting = true;
    }
    if (!settled.empty()) DropSettled(task, settled);
}

}  // namespace

int MarkVersionBad(const TaskRunInfo& task, const std::string& path) {
    const std::string bad_path = BadVersionPath(path);
    SLOG_INFO("Rename version for task '%llu', folder name '%s'", Llu(task.task_id),
              bad_path.c_str());
    const int result = FSRename(path, bad_path);
    if (result < 0) {
        SLOG_ERR("Failed to rename bad version format for task '%llu', [ret: %d]",
                 Llu(task.task_id), result);
    }
    return result;
}

void EndGoodVersion(const TaskRunInfo& task) {
    const VersionMark mark = MakeVersionMark(task, VersionMark::FILLING);
    if (DropVersionMarks(task.task_id, {mark}) == 0) return;
    SLOG_WARN("The whole version '%s' of task '%llu' gets a bad name when the task is loaded",
              mark.name.c_str(), Llu(task.task_id));
}

void EndBadVersion(const TaskRunInfo& task) {
    const bool is_let_go = IsLetGoByFileWorkers(task);
    const std::string path = VersionGetDstFullPath(task, "/");
    FSInfo info;
    // The rename does not tell a missing folder from one that cannot be asked for.
    const bool is_missing = FSStat(path, info) == 0 && !info.exist;
    const int renamed = MarkVersionBad(task, path);
    const VersionMark mark = MakeVersionMark(task, VersionMark::FILLING);
    // The mark stays with a folder that still has its good name, or may get it back.
    if (!is_let_go || (renamed < 0 && !is_missing)) return;
    if (!IsReachable(mark, task) || FSSyncFileSystem(task.dst_dir_path) < 0) return;
    DropSettled(task, {mark});
}

void SettleUnfinishedVersions(const TaskRunInfo& task) { SettleMarks(task, false); }

void SettleVersionsAtLoad(const TaskRunInfo& task) { SettleMarks(task, true); }
