#include "strategy/mirror-scan-handler.h"

#include "event/event-generator.h"
#include "strategy/file-event-context.h"
#include "utils/file-list.h"
#include "utils/log.h"

int MirrorScanHandler::GetDstList(FileList& list) {
    const std::string& path = Context().dst_full_path;
    SLOG_INFO("MirrorScanHandler: get dst file list path '%s', [task: %llu]", path.c_str(),
              Llu(Task().task_id));
    const int result = ListFolder(path, list);
    if (result < 0) SLOG_ERR("interrupted while get dst file list '%s'", path.c_str());
    return result;
}

void MirrorScanHandler::IssueRemove(const FileListEntry& entry) {
    SLOG_INFO("IssueRemove: %s, %d", entry.path.c_str(), entry.is_dir);
    EventGenerator(Task().task_id).PushRemoveEvent(JoinEntryPath(entry.path), entry.is_dir);
}

void MirrorScanHandler::IssueModify(const FileListEntry& src, const FileListEntry& dst) {
    IssueRemove(dst);
    IssueCopy(src);
}

bool MirrorScanHandler::IsUnproven(const FileListEntry& dst) {
    if (!m_unproven_run) m_unproven_run.emplace(Task().task_id);
    return m_unproven_run->IsUnproven(Context().dst_full_path + dst.path);
}
