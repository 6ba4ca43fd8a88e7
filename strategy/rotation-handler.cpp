#include "strategy/rotation-handler.h"

#include <unistd.h>

#include <algorithm>
#include <mutex>

#include "db/log-info.h"
#include "db/log-wrapper.h"
#include "db/task-info.h"
#include "platform/keld-sdk-wrapper.h"
#include "strategy/recycle-bin.h"
#include "strategy/root-check.h"
#include "strategy/rotation-rules.h"
#include "strategy/version-end.h"
#include "strategy/version-mark.h"
#include "utils/error-code.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

// September 2020. A box without a battery for its clock starts before it.
constexpr uint32_t CLOCK_IS_SET = 1600000000;

// A run and a change of its task's settings may come to it at the same time: each would remove down
// to the count of what it has found.
std::mutex g_turn;
constexpr unsigned TURN_STEP_US = 10000;

}  // namespace

bool RotationHandler::IsAborted() const {
    return m_abort_flag != nullptr && m_abort_flag->load() != 0;
}

int RotationHandler::Run() {
    std::unique_lock turn(g_turn, std::try_to_lock);
    while (!turn.owns_lock()) {
        if (IsAborted()) {
            SLOG_WARN("RotationHandler: user stopped while waiting for another rotation");
            return ERR_INTERRUPTED;
        }
        usleep(TURN_STEP_US);
        static_cast<void>(turn.try_lock());
    }
    return RunInTurn();
}

int RotationHandler::RunInTurn() {
    if (const int result = SetVersionList(); result != ERR_SUCCESS) {
        SLOG_ERR("Failed to SetVersionList");
        return result;
    }
    if (m_versions.size() <= m_task.max_version_count) {
        SLOG_INFO("Don't need to do rotation");
        return ERR_SUCCESS;
    }
    if (m_has_later_version && m_now < CLOCK_IS_SET) {
        SLOG_WARN("The clock is not set, nothing of task '%llu' is removed", Llu(m_task.task_id));
        return ERR_SUCCESS;
    }
    SLOG_INFO("RotationHandler: count = '%llu', max_version_count = '%llu'", Llu(m_versions.size()),
              Llu(m_task.max_version_count));
    const int result = Rotate();
    if (result >= 0) return ERR_SUCCESS;
    SLOG_ERR("Fail to do Rotation '%s', policy = '%d', [ret: %d]", m_task.dst_dir_path.c_str(),
             m_task.rotation_policy, result);
    SLOG_ERR("Failed to do rotation for path '%s', [task: %llu]", m_task.dst_dir_path.c_str(),
             Llu(m_task.task_id));
    return result;
}

int RotationHandler::Rotate() {
    const RotationRules rules(m_now, m_task.task_id, m_task.max_version_count, m_abort_flag);
    switch (m_task.rotation_policy) {
        case ROTATION_POLICY_OLDEST:
            rules.OldestRotation(m_versions);
            break;
        case ROTATION_POLICY_CONDITIONAL:
            if (const int result = rules.ConditionalMark(m_versions); result < 0) {
                SLOG_ERR(
                    "Failed to ConditionalMark for task '%llu', max_version_count = '%llu', "
                    "[ret: %d]",
                    Llu(m_task.task_id), Llu(m_task.max_version_count), result);
                return result;
            }
            break;
        default:
            SLOG_ERR("Unknown rotation policy = %d", m_task.rotation_policy);
            return ERR_SYSTEM;
    }
    const int result = DeleteVersions(rules);
    if (result < 0) {
        SLOG_ERR("Failed to DeleteVersionList '%s', [ret: %d]", m_task.dst_dir_path.c_str(),
                 result);
    }
    return result;
}

int RotationHandler::DeleteVersions(const RotationRules& rules) {
    const std::vector<VersionMark> marks =
        IsRemovedInPieces() ? Victims() : std::vector<VersionMark>();
    if (!marks.empty() && PutVersionMarks(m_task.task_id, marks) < 0) {
        SLOG_WARN("A removal of versions of task '%llu' will not be known after a crash",
                  Llu(m_task.task_id));
    }
    const int result = rules.DeleteVersionList(
        m_versions, [this](const VersionInfo& version) { return RemoveVersion(version); });
    if (!marks.empty()) DropSettled(marks);
    return result;
}

// What has not been begun is as good as it was. The rest is settled when it is on the disk: after a
// power cut a version may stand there again in part, under its good name.
void RotationHandler::DropSettled(const std::vector<VersionMark>& marks) const {
    const bool is_on_disk = m_begun.empty() || (FSSyncFileSystem(m_task.dst_dir_path) == 0 &&
                                                CheckTaskDestination(m_task) == ERR_SUCCESS);
    std::vector<VersionMark> settled;
    for (const VersionMark& mark : marks) {
        const bool is_begun = std::find(m_begun.begin(), m_begun.end(), mark.name) != m_begun.end();
        if (!is_begun || (is_on_disk && mark.name != m_half)) settled.push_back(mark);
    }
    if (DropVersionMarks(m_task.task_id, settled) == 0 && settled.size() == marks.size()) return;
    SLOG_WARN("Removed versions of task '%llu' are looked at again when it is loaded",
              Llu(m_task.task_id));
}

std::vector<VersionMark> RotationHandler::Victims() const {
    std::vector<VersionMark> marks;
    const RotationRules rules(m_now, m_task.task_id, m_task.max_version_count, nullptr);
    static_cast<void>(rules.DeleteVersionList(m_versions, [&](const VersionInfo& version) {
        if (version.is_bad) return ERR_SUCCESS;  // it has its name already
        VersionMark mark = MakeVersionMark(m_task, VersionMark::REMOVING);
        mark.name = PathBaseName(version.path);
        marks.push_back(mark);
        return ERR_SUCCESS;
    }));
    return marks;
}

bool RotationHandler::IsRemovedInPieces() const {
    std::string name;
    std::string path;
    SDK::Share share;
    return SDK::GetShareNameByPath(m_task.dst_dir_path, name, path) == 0 && share.Open(name) == 0 &&
           !share.IsRecycleBinEnabled();
}

// After a removal that failed, when what could go of the version is gone: false if the rest of it
// may still pass for a good one.
bool RotationHandler::IsGoneOrBad(const std::string& path) const {
    FSInfo info;
    if (FSStat(path, info) == 0 && !info.exist) return CheckTaskDestination(m_task) == ERR_SUCCESS;
    return IsRemovedInPieces() && MarkVersionBad(m_task, path) == 0;
}

int RotationHandler::RemoveVersion(const VersionInfo& version) {
    const std::string& path = version.path;
    SLOG_INFO("RotationHandler: remove path '%s'", path.c_str());
    FSInfo info;
    const bool is_known = FSStat(path, info) == 0;
    // A folder that is missing because its file system has gone has not been removed. That the
    // source has gone does not matter any more.
    if (const int result = CheckTaskDestination(m_task); result < 0) return result;
    if (is_known && !info.exist) {
        SLOG_INFO("Version '%s' is gone already", path.c_str());
        return ERR_SUCCESS;
    }
    if (!version.is_bad) m_begun.push_back(PathBaseName(path));
    if (RecycleBin().RemoveFile(path, !is_known || info.type == FS_TYPE_DIR) < 0) {
        SLOG_ERR("Failed to remove file '%s'", path.c_str());
        if (!version.is_bad && !IsGoneOrBad(path)) m_half = PathBaseName(path);
        return ERR_FILE_OPERATION;
    }
    LogInfo log;
    log.SetTaskId(m_task.task_id);
    log.SetDescription(LogDescription::LOG_DESC_ROTATED, m_task.task_name, PathBaseName(path));
    if (AddLog(log) == 0) return ERR_SUCCESS;
    SLOG_ERR("Failed to add log info to log db for '%llu'", Llu(m_task.task_id));
    return ERR_SYSTEM;
}
