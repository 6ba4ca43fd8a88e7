#include "strategy/copy-handler.h"

#include <ctime>

#include "platform/keld-copy.h"
#include "strategy/destination.h"
#include "strategy/file-event-context.h"
#include "strategy/recycle-bin.h"
#include "strategy/root-check.h"
#include "strategy/run-progress.h"
#include "utils/confined-path.h"
#include "utils/error-code.h"
#include "utils/file-op.h"
#include "utils/log.h"

int CopyHandler::Handle() {
    const int result = RunSteps();
    if (result == ERR_SUCCESS) {
        RunProgress::GetInstance().CountFile(Task().task_id, m_src_info.size);
    }
    // A file that cannot be read because its device is gone shall not be tried again and again.
    if (result == ERR_SRC_MISS || result == ERR_FILE_OPERATION || result == ERR_IO) {
        if (const int gone = CheckTaskRoots(Task()); gone < 0) return gone;
    }
    return result;
}

int CopyHandler::CancelFuncCallBack(void* flag) {
    return flag != nullptr && static_cast<const std::atomic<int>*>(flag)->load() != 0 ? 1 : 0;
}

int CopyHandler::SetCopyToFullPath() {
    m_copy_to_full_path = FullEventPath(Task().dst_dir_path, EventPath());
    return ERR_SUCCESS;
}

int CopyHandler::UpdateDB() { return ERR_SUCCESS; }

int CopyHandler::NoteMove() { return ERR_SUCCESS; }

int CopyHandler::RunSteps() {
    if (const int result = StatSource(); result < 0) return result;
    if (const int result = CheckTaskFilter(); result < 0) return result;
    if (const int result = SetCopyToFullPath(); result < 0) {
        SLOG_ERR("Failed to set copy to full path for event '%s' [ret = %d]", EventPath().c_str(),
                 result);
        return result;
    }
    if (const int result = CreateParentFolder(); result < 0) {
        SLOG_ERR("Failed to create parent folder for event '%s' [ret = %d]", EventPath().c_str(),
                 result);
        return result;
    }
    if (const int result = RunCopy(); result < 0) {
        SLOG_ERR("Failed to run copy for event '%s' [ret = %d]", EventPath().c_str(), result);
        return result;
    }
    return Finish();
}

int CopyHandler::StatSource() {
    if (IsDirEvent()) {
        SLOG_ERR("current event '%s' is folder", EventPath().c_str());
        return ERR_IGNORE;
    }
    m_copy_from_full_path = Context().src_full_path;
    SLOG_INFO("CopyHandler: SetCopyFromFullPath = %s", m_copy_from_full_path.c_str());
    if (FSStat(m_copy_from_full_path, m_src_info) < 0) {
        SLOG_ERR("Failed to FSStat '%s'.", m_copy_from_full_path.c_str());
        return ERR_FILE_OPERATION;
    }
    if (!m_src_info.exist) {
        SLOG_ERR("Source file does not exist '%s'.", m_copy_from_full_path.c_str());
        return ERR_SRC_MISS;
    }
    if (IsSourceRemoved() && m_source.Take(m_copy_from_full_path) < 0) return ERR_FILE_OPERATION;
    return ERR_SUCCESS;
}

int CopyHandler::CreateParentFolder() {
    const std::string parent = PathDirName(m_copy_to_full_path);
    if (FSMKDir(parent, true, DESTINATION_OWNER, DESTINATION_GROUP) == 0) return ERR_SUCCESS;
    SLOG_ERR("Failed to create parent folder '%s' for task '%llu'", parent.c_str(),
             Llu(Task().task_id));
    return ERR_FILE_OPERATION;
}

int CopyHandler::RunCopy() {
    const int overwrite =
        !m_must_keep_existing && (IsOverwritePolicy() || m_overwrite_allowed) ? 1 : -1;
    auto* flag = const_cast<std::atomic<int>*>(AbortFlag());  // the callback only reads it
    const KeldCopyResult copied =
        KeldCopyFile(m_copy_from_full_path, m_copy_to_full_path, overwrite, DESTINATION_OWNER,
                     DESTINATION_GROUP, CancelFuncCallBack, flag);
    if (copied.step == KELD_COPY_NO_ARGS) {
        SLOG_ERR("CopyHandler: KELDCopyTHRArgsAlloc() failed");
        return ERR_SYSTEM;
    }
    if (copied.step == KELD_COPY_NO_CALLBACK) {
        SLOG_ERR("CopyHandler: KELDCopyTHRSetCallbackIsCancel() failed");
        return ERR_SYSTEM;
    }
    if (IsAborted()) {
        SLOG_WARN("CopyHandler: operation aorted");
        return ERR_INTERRUPTED;
    }
    const int result = copied.step == KELD_COPY_DONE
                           ? CheckCopied()
                           : HandleCopyError(copied.keld_error, overwrite);
    SLOG_INFO("Handle copy file '%s' -> '%s', [suc = %d, err = %d]", m_copy_from_full_path.c_str(),
              m_copy_to_full_path.c_str(), result == ERR_SUCCESS, result);
    return result;
}

int CopyHandler::CheckCopied() const {
    if (CheckFileIntegrity()) return ERR_SUCCESS;
    SLOG_ERR("Failed to check file integrity '%s' -> '%s'", m_copy_from_full_path.c_str(),
             m_copy_to_full_path.c_str());
    return ERR_FILE_OPERATION;
}

int CopyHandler::HandleCopyError(int keld_error, int overwrite) {
    const int result = ErrorCodeFromKeldError(keld_error);
    SLOG_INFO("overwrite copy argument is = %d", overwrite);
    switch (result) {
        case ERR_DST_EXISTS:
            return HandleDstExists();
        case ERR_DST_TYPE_CONFLICT:
            return HandleDstTypeConflict();
        case ERR_SUCCESS:  // a failed call without a reason: the file itself has to prove it
            return CheckCopied();
        default:
            return result;
    }
}

int CopyHandler::LookAtDestination(FSInfo& info, int error_when_gone) const {
    if (FSStat(m_copy_to_full_path, info) < 0) {
        SLOG_ERR("Failed to FSStat '%s'.", m_copy_to_full_path.c_str());
        return ERR_FILE_OPERATION;
    }
    if (info.exist) return ERR_SUCCESS;
    SLOG_ERR("Destination file does not exist '%s', should retry.", m_copy_to_full_path.c_str());
    return error_when_gone;
}

bool CopyHandler::CheckFileIntegrity() const {
    FSInfo info;
    if (LookAtDestination(info, ERR_FILE_OPERATION) < 0) return false;
    if (info.size != m_src_info.size) {
        SLOG_ERR("File size not matched '%llu', '%llu'.", Llu(m_src_info.size), Llu(info.size));
        return false;
    }
    SLOG_INFO("File size matched '%llu', '%llu'.", Llu(m_src_info.size), Llu(info.size));
    return true;
}

int CopyHandler::HandleDstExists() {
    FSInfo info;
    if (const int result = LookAtDestination(info, ERR_DST_EXISTS); result < 0) return result;
    if (info.size == m_src_info.size && info.mtime == m_src_info.mtime) {
        SLOG_INFO("File can be merged '%s', ignore.", m_copy_to_full_path.c_str());
        m_is_merged = true;
        return ERR_SUCCESS;
    }
    return RenameConflict(m_copy_to_full_path, "Conflict", ERR_DST_EXISTS);
}

int CopyHandler::HandleDstTypeConflict() {
    FSInfo info;
    if (const int result = LookAtDestination(info, ERR_DST_TYPE_CONFLICT); result < 0)
        return result;
    return ClearTypeConflict(Task(), m_copy_to_full_path, info.type == FS_TYPE_DIR,
                             IsOverwritePolicy() && !m_must_keep_existing);
}

int CopyHandler::Finish() {
    if (FSUtime(m_copy_to_full_path, time(nullptr), m_src_info.full_mtime) < 0) {
        SLOG_WARN("Failed to change file atime and mtime '%s' for task '%llu', ignore",
                  m_copy_to_full_path.c_str(), Llu(Task().task_id));
    }
    if (IsSourceRemoved()) return MoveSource();
    if (const int result = UpdateDB(); result < 0) {
        SLOG_ERR("Failed to update db for event '%s' [ret = %d]", EventPath().c_str(), result);
        return result;
    }
    return ERR_SUCCESS;
}

// The source may be the only copy that there is: it goes last.
int CopyHandler::MoveSource() {
    if (const int result = ProveCopy(); result < 0) return result;
    if (const int result = CheckSourceUnchanged(); result < 0) return result;
    if (const int result = NoteMove(); result < 0) return result;
    if (const int result = CheckTaskRoots(Task()); result < 0) return result;
    // Somebody may write to it, or save another file under its name, at any time.
    if (const int result = CheckSourceUnchanged(); result < 0) return result;
    if (RecycleBin().RemoveFile(m_copy_from_full_path, false) == 0) return ERR_SUCCESS;
    SLOG_ERR("Failed to remove file '%s'", m_copy_from_full_path.c_str());
    return ERR_FILE_OPERATION;
}

int CopyHandler::CheckSourceUnchanged() const {
    if (m_source.IsAt(m_copy_from_full_path)) return ERR_SUCCESS;
    SLOG_ERR("Source file '%s' has changed since it was copied, it stays, should retry.",
             m_copy_from_full_path.c_str());
    return ERR_FILE_OPERATION;
}

int CopyHandler::ProveCopy() {
    const std::string& root = Task().dst_root ? Task().dst_root->Path() : Task().dst_dir_path;
    if (FSFlushFile(m_copy_to_full_path, root) < 0) {
        DiscardCopy();
        return ERR_IO;
    }
    switch (FSCompareOnMedium(m_copy_from_full_path, m_copy_to_full_path, AbortFlag())) {
        case FS_COMPARE_EQUAL:
            return ERR_SUCCESS;
        case FS_COMPARE_ABORTED:
            return ERR_INTERRUPTED;
        case FS_COMPARE_SOURCE_FAILED:
            return ERR_IO;
        case FS_COMPARE_COPY_FAILED:
            DiscardCopy();
            return ERR_IO;
        case FS_COMPARE_DIFFERENT:
            break;
    }
    return HandleDifference();
}

int CopyHandler::HandleDifference() {
    // Another file, that only looked the same: both have to live.
    if (m_is_merged) return RenameConflict(m_copy_to_full_path, "Conflict", ERR_DST_EXISTS);
    DiscardCopy();
    return ERR_IO;
}

// A copy that did not reach the disk whole must not stand there as one; and a second flush of it
// would not tell. The next attempt makes a new one.
void CopyHandler::DiscardCopy() const {
    SLOG_ERR("Copy '%s' is not proven, source file '%s' stays", m_copy_to_full_path.c_str(),
             m_copy_from_full_path.c_str());
    if (m_is_merged) return;
    if (FSRemove(m_copy_to_full_path) < 0) {
        SLOG_ERR("Failed to remove '%s'.", m_copy_to_full_path.c_str());
    }
}
