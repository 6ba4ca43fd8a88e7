// How a rotation finds the versions of a task.
#include <algorithm>
#include <limits>
#include <optional>
#include <tuple>

#include "filter/file-filter.h"
#include "strategy/rotation-handler.h"
#include "strategy/version-mark.h"
#include "strategy/version-name.h"
#include "utils/error-code.h"
#include "utils/file-list.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

// The full path of an entry of the folder, which starts with "/".
std::string JoinPath(const std::string& folder, const std::string& entry_path) {
    if (folder.empty() || folder == "/") return entry_path;
    return entry_path == "/" ? folder : folder + entry_path;
}

// The newest first. Of two of one time the good one counts as the newer.
bool IsNewer(const VersionInfo& left, const VersionInfo& right) {
    return std::tuple(right.timestamp, left.is_bad, right.path) <
           std::tuple(left.timestamp, right.is_bad, left.path);
}

}  // namespace

int RotationHandler::SetVersionList() {
    const std::string& folder = m_task.dst_dir_path;
    SLOG_INFO("RotationHandler: set version list path '%s', [task: %llu]", folder.c_str(),
              Llu(m_task.task_id));
    NamePool pool;
    FileList list(pool);
    FSVisitor visitor;
    visitor.list = &list;
    visitor.dir_index = FileList::ROOT;
    visitor.prefix_length = folder.size();
    visitor.filter = m_task.system_filter.get();
    const int listed = FSForEachEntry(folder, visitor, FS_EACH_STAT, m_abort_flag, false);
    if (listed < 0) {
        SLOG_ERR("interrupted while get dst file list '%s'", folder.c_str());
        // An interrupted run is done again until it gets through, with a full version each time: a
        // folder that cannot be read must not be taken for that.
        return listed == FS_EACH_ABORTED ? ERR_INTERRUPTED : ERR_IO;
    }
    std::vector<VersionMark> marks;
    if (ReadVersionMarks(m_task.task_id, marks) < 0) return ERR_SYSTEM;
    for (const VersionMark& mark : marks) {
        if (mark.kind != VersionMark::FILLING) continue;
        m_unfinished.push_back(MarkedFolder(mark, m_task) + "/" + mark.name);
    }
    for (FileListIterator entry = list.begin(); entry != list.end(); ++entry) {
        if (IsAborted()) {
            SLOG_WARN("SetVersionList: user stopped");
            return ERR_INTERRUPTED;
        }
        if (const int result = AddVersion(entry->path); result < 0) return result;
    }
    std::sort(m_versions.begin(), m_versions.end(), IsNewer);
    return ERR_SUCCESS;
}

int RotationHandler::AddVersion(const std::string& entry_path) {
    const std::optional<VersionName> name = ParseVersionName(entry_path.substr(1));
    if (!name) {
        SLOG_DBG("Current version folder '%s' is not Ferrix Copy format, skipped",
                 entry_path.c_str());
        return ERR_SUCCESS;
    }
    VersionInfo version;
    version.path = JoinPath(m_task.dst_dir_path, entry_path);
    if (std::find(m_unfinished.begin(), m_unfinished.end(), version.path) != m_unfinished.end()) {
        SLOG_INFO("Version '%s' is not finished, skipped", version.path.c_str());
        return ERR_SUCCESS;
    }
    const int64_t seconds = VersionTime(*name, m_now);
    if (seconds == 0) {
        SLOG_ERR("failed to parse time string '%s'", entry_path.c_str());
        SLOG_ERR("Failed to parse timestamp for task '%llu', path = '%s'", Llu(m_task.task_id),
                 entry_path.c_str());
        return ERR_SYSTEM;
    }
    version.timestamp = static_cast<uint32_t>(seconds);
    version.is_bad = name->is_bad;
    // Also what the 32 bits do not hold: before 1970 and after 2106.
    if (seconds < 0 || seconds > m_now) {
        SLOG_WARN("Invalid timestamp for task '%llu', path = '%s', timestamp = '%u', now = '%u'",
                  Llu(m_task.task_id), entry_path.c_str(), version.timestamp, m_now);
        if (seconds > m_now && !version.is_bad) m_has_later_version = true;
        return ERR_SUCCESS;
    }
    SLOG_INFO("list info '%s'", version.path.c_str());
    m_versions.push_back(version);
    return ERR_SUCCESS;
}
