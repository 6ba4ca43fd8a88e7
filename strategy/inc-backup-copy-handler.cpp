#include "strategy/inc-backup-copy-handler.h"

#include <ctime>

#include "db/file-db.h"
#include "platform/unproven-run.h"
#include "platform/utility.h"
#include "strategy/destination.h"
#include "strategy/inc-backup-path.h"
#include "strategy/record-proof.h"
#include "strategy/task-run-info.h"
#include "utils/error-code.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

// The copy of such a file takes seconds on a slow disk.
constexpr uint64_t LONG_COPY_BYTES = 16 << 20;

// 0 or "System error".
int GetLocalTimeText(const FSInfo& source, bool with_time, std::string& text) {
    const auto seconds = static_cast<time_t>(source.full_mtime);
    struct tm local {};
    const bool is_known = localtime_r(&seconds, &local) != nullptr;
    if (is_known && (with_time ? GetTimeString(local, "%F_%H%M%S", text)
                               : GetTimeString(local, "%F", text)) == 0) {
        return ERR_SUCCESS;
    }
    SLOG_ERR("Failed to get time string for '%u'", source.mtime);
    return ERR_SYSTEM;
}

}  // namespace

int IncBackupCopyHandler::SetCopyToFullPath() {
    std::string dst_ev_path;
    if (Task().keep_dir_structure) {
        dst_ev_path = EventPath();
        SLOG_INFO("Keep Source Folder Structure dst_ev_path = %s", dst_ev_path.c_str());
    } else if (const int result = GetRenamedDstEventPath(dst_ev_path); result < 0) {
        SLOG_ERR("Failed to GetRenamedDstEventPath for task '%llu'", Llu(Task().task_id));
        return result;
    }
    if (!Task().file_db) return LogNoFileDB(ERR_SYSTEM);
    if (const int result = ChooseDstEventPath(*Task().file_db, dst_ev_path); result < 0) {
        return result;
    }
    if (m_src_info.size >= LONG_COPY_BYTES && Task().file_db->EndBatch() < 0) return ERR_SYSTEM;
    m_copy_to_full_path = IncBackupGetDstFullPath(Task(), dst_ev_path);
    SLOG_INFO("IncBackupCopyHandler: SetCopyToFullPath = %s", m_copy_to_full_path.c_str());
    // It may be the only copy of another file, whose name differs in case and which was moved.
    m_must_keep_existing =
        IsSourceRemoved() && IsSpelledOtherwise(Task().dst_dir_path, m_copy_to_full_path);
    return ERR_SUCCESS;
}

int IncBackupCopyHandler::GetRenamedDstEventPath(std::string& dst_ev_path) const {
    std::string renamed;
    std::string text;
    if (Task().smart_create_date_dir) {
        if (const int result = GetLocalTimeText(m_src_info, false, text); result < 0) return result;
        renamed += "/" + text;
    }
    const std::string extension = PathExtension(EventPath());
    if (Task().rename_photo_video && IsPhotoOrVideo(ToLower(extension))) {
        if (const int result = GetLocalTimeText(m_src_info, true, text); result < 0) return result;
        renamed += "/" + text + "." + extension;  // never empty: it is in one of the sets
    } else {
        renamed += "/" + PathBaseName(EventPath());
    }
    dst_ev_path = renamed;
    return ERR_SUCCESS;
}

int IncBackupCopyHandler::ChooseDstEventPath(FileDB& db, std::string& dst_ev_path) {
    const std::string& src_ev_path = EventPath();
    bool is_changed = false;
    if (db.DstPathFormatChanged(src_ev_path, dst_ev_path, is_changed) < 0) {
        SLOG_ERR(
            "Failed to check whether dst path format changed, src_ev_path = '%s', dst_ev_path = "
            "'%s'",
            src_ev_path.c_str(), dst_ev_path.c_str());
        return ERR_SYSTEM;
    }
    FileInfo info;
    const int found = is_changed ? 0 : db.GetFileInfoBySourcePath(src_ev_path, info);
    if (found < 0 || (found == 1 && UseRecordedPath(db, info) < 0)) {
        SLOG_ERR("Failed to get file info by src_ev_path = '%s'", src_ev_path.c_str());
        return ERR_SYSTEM;
    }
    if (found == 1) {
        dst_ev_path = info.destination_path;
        SLOG_INFO("Dst path foramt NOT changed, src_ev_path = %s, dst_ev_path = %s",
                  src_ev_path.c_str(), dst_ev_path.c_str());
        return ERR_SUCCESS;
    }
    if (GetMappedDstEventPath(db, dst_ev_path) < 0) {
        SLOG_ERR("Failed to get mapped dst event path, dst_ev_path = '%s'", dst_ev_path.c_str());
        return ERR_SYSTEM;
    }
    SLOG_INFO("Get mapped dst path src_ev_path = %s, dst_ev_path = %s", src_ev_path.c_str(),
              dst_ev_path.c_str());
    m_overwrite_allowed = IsOverwritePolicy() || IsUnknownOverwritable(dst_ev_path);
    return ERR_SUCCESS;
}

int IncBackupCopyHandler::GetMappedDstEventPath(FileDB& db, std::string& dst_ev_path) const {
    if (dst_ev_path.empty() || dst_ev_path == "/") return 0;
    // Moved before, but its source could not be removed: the same name again.
    FileInfo moved{EventPath(), "", FILE_INFO_FILE, m_src_info.size, m_src_info.mtime};
    const int was_moved = db.GetMovedFile(moved);
    if (was_moved < 0) return -1;
    if (was_moved == 1 && FileDB::IsVariant(moved.destination_path, dst_ev_path)) {
        dst_ev_path = moved.destination_path;
        return 0;
    }
    const int taken = db.IsDestinationTaken(dst_ev_path);
    if (taken < 0) return LogNoFileDB(-1);
    if (taken == 0) return 0;
    const std::string stem = PathStem(dst_ev_path);
    const std::string extension = PathExtension(dst_ev_path);
    uint64_t number = 0;
    if (db.GetFreeNumber(stem, extension, number) < 0) {
        SLOG_ERR("Failed to get file info by mapped_dst_ev_path = '%s'", dst_ev_path.c_str());
        return -1;
    }
    dst_ev_path = FileDB::NumberedPath(stem, extension, number);
    return 0;
}

int IncBackupCopyHandler::UseRecordedPath(FileDB& db, const FileInfo& info) {
    const std::string path = IncBackupGetDstFullPath(Task(), info.destination_path);
    FSInfo now;
    if (FSStat(path, now) < 0) {
        SLOG_ERR("Failed to FSStat '%s'.", path.c_str());
        return 0;
    }
    if (!now.exist) return 0;
    m_overwrite_allowed = (now.size == info.size && now.mtime == info.mtime) || IsLeftover(now);
    // What the row says is no longer true once the copy takes the place of the old one.
    return db.DoubtFileInfo(info.source_path);
}

bool IncBackupCopyHandler::IsUnknownOverwritable(const std::string& dst_ev_path) const {
    const std::string path = IncBackupGetDstFullPath(Task(), dst_ev_path);
    FSInfo info;
    if (FSStat(path, info) < 0) {
        SLOG_ERR("Failed to FSStat '%s'.", path.c_str());
        return false;
    }
    return !info.exist || IsLeftover(info);
}

// After a power cut or a failed flush: it has the time of the source, or lost all its bytes. It
// must not pass for a good copy because of that time. When sources are removed it may also be a
// good copy, and the only one: then only a file without bytes is nobody's.
bool IncBackupCopyHandler::IsLeftover(const FSInfo& info) const {
    const bool is_cut_off =
        !IsSourceRemoved() && info.mtime == m_src_info.mtime && info.size <= m_src_info.size;
    const bool is_like_it = info.type == FS_TYPE_FILE && (info.size == 0 || is_cut_off);
    return is_like_it && UnprovenRun(Task().task_id).IsUnproven(info.path);
}

int IncBackupCopyHandler::UpdateDB() {
    if (!Task().file_db) return LogNoFileDB(ERR_SYSTEM);
    const FileInfo info{EventPath(), IncBackupGetDstEventPath(Task(), m_copy_to_full_path),
                        FILE_INFO_FILE, m_src_info.size, m_src_info.mtime};
    if (Task().file_db->SetFileInfoInBatch(info) < 0) {
        SLOG_ERR("Failed to SetFileInfoBySourcePath from DB '%s'", EventPath().c_str());
        return ERR_SYSTEM;
    }
    return FlushRecordsIfDue(Task());
}

int IncBackupCopyHandler::NoteMove() {
    if (!Task().file_db) return LogNoFileDB(ERR_SYSTEM);
    // With the folders of the source no two files of a run have one name.
    if (Task().keep_dir_structure) {
        if (Task().file_db->RemoveFileInfoBySourcePath(EventPath()) == 0) return ERR_SUCCESS;
        SLOG_ERR("Failed to RemoveFileInfoBySourcePath from DB '%s'", EventPath().c_str());
        return ERR_SYSTEM;
    }
    const FileInfo info{EventPath(), IncBackupGetDstEventPath(Task(), m_copy_to_full_path),
                        FILE_INFO_FILE, m_src_info.size, m_src_info.mtime};
    if (Task().file_db->AddMovedFile(info) == 0) return ERR_SUCCESS;
    SLOG_ERR("Failed to note the name of moved file '%s'", EventPath().c_str());
    return ERR_SYSTEM;
}

int IncBackupCopyHandler::LogNoFileDB(int code) const {
    SLOG_ERR("File DB is NULL [task: %llu]", Llu(Task().task_id));
    return code;
}
