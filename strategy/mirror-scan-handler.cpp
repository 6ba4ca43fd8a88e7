#include "strategy/mirror-scan-handler.h"

#include "event/event-generator.h"
#include "filter/file-filter.h"
#include "strategy/destination.h"
#include "strategy/file-event-context.h"
#include "strategy/spelling-key.h"
#include "utils/file-list.h"
#include "utils/file-op.h"
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

SpellingPairs MirrorScanHandler::FindSpellingPairs(const FileList& src_list,
                                                   const FileList& dst_list) {
    return {src_list, dst_list, [this](const FileListEntry& src, std::vector<FileListEntry>& dst) {
                FileListEntry* chosen = IsAborted() ? nullptr : ChooseEntry(src, dst);
                if (chosen != nullptr) Respell(src, *chosen);
                return chosen;
            }};
}

FileListEntry* MirrorScanHandler::ChooseEntry(const FileListEntry& src,
                                              std::vector<FileListEntry>& dst) const {
    // The name is not listed there. If it finds something nevertheless, it finds an entry that is
    // listed under another name. Not by comparing inode numbers: exFAT may give each spelling one
    // of its own.
    FSInfo found;
    if (FSStat(Context().dst_full_path + src.path, found) < 0 || !found.exist) return nullptr;
    if (found.type != FS_TYPE_FILE && found.type != FS_TYPE_DIR) return nullptr;
    FileListEntry* chosen = nullptr;
    for (FileListEntry& entry : dst) {
        if (entry.is_dir != (found.type == FS_TYPE_DIR)) continue;
        const bool is_like_it = entry.mtime == found.mtime && entry.size == found.size;
        if (chosen == nullptr || is_like_it) chosen = &entry;
    }
    if (chosen == nullptr) return nullptr;
    chosen->mtime = found.mtime;
    if (!chosen->is_dir) chosen->size = found.size;
    return chosen;
}

void MirrorScanHandler::Respell(const FileListEntry& src, const FileListEntry& dst) const {
    // What is replaced gets its new name from the copy; a tail that was not kept would not be kept
    // now; what the filter refuses stays as it is.
    if (src.is_dir != dst.is_dir || WithoutTail(src.path) == WithoutTail(dst.path)) return;
    const std::shared_ptr<FileFilter> filter = Task().task_filter;
    if (!filter || filter->Check(JoinEntryPath(src.path), src.is_dir) != 0) return;
    const std::string& folder = Context().dst_full_path;
    if (RespellEntry(folder + dst.path, folder + src.path) < 0) {
        SLOG_WARN("MirrorScanHandler: '%s' keeps the spelling '%s'", (folder + src.path).c_str(),
                  dst.path.c_str());
    }
}

bool MirrorScanHandler::IsUnproven(const FileListEntry& dst) {
    if (!m_unproven_run) m_unproven_run.emplace(Task().task_id);
    return m_unproven_run->IsUnproven(Context().dst_full_path + dst.path);
}
