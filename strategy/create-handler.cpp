#include "strategy/create-handler.h"

#include <cerrno>
#include <cstring>
#include <ctime>

#include "strategy/destination.h"
#include "strategy/file-event-context.h"
#include "strategy/root-check.h"
#include "utils/error-code.h"
#include "utils/file-op.h"
#include "utils/log.h"

int CreateHandler::Handle() {
    if (!IsDirEvent()) {
        SLOG_ERR("current event '%s' is not folder", EventPath().c_str());
        return ERR_IGNORE;
    }
    if (const int result = CheckTaskFilter(); result < 0) return result;
    const int result = RunCreate();
    if (result >= 0) return ERR_SUCCESS;
    SLOG_ERR("CreateHandler: failed to handle event '%s'", EventPath().c_str());
    // A folder that cannot be made because a device is gone shall not be tried again and again.
    const int gone = result == ERR_FILE_OPERATION ? CheckTaskRoots(Task()) : ERR_SUCCESS;
    return gone < 0 ? gone : result;
}

int CreateHandler::RunCreate() {
    if (const int result = SetCreateFullPath(); result < 0) {
        SLOG_ERR("Failed to set create full path for event '%s' [ret = %d]", EventPath().c_str(),
                 result);
        return result;
    }
    if (const int result = CreateFolder(); result < 0) {
        SLOG_ERR("Failed to run create for path '%s' [ret = %d]", m_create_full_path.c_str(),
                 result);
        return result;
    }
    return ERR_SUCCESS;
}

int CreateHandler::SetCreateFullPath() {
    m_create_full_path = FullEventPath(Task().dst_dir_path, EventPath());
    SLOG_INFO("CreateHandler: SetCreateFullPath = %s", m_create_full_path.c_str());
    return ERR_SUCCESS;
}

int CreateHandler::CreateFolder() {
    const std::string& source = Context().src_full_path;
    FSInfo info;
    if (FSStat(source, info) < 0) {
        SLOG_ERR("Failed to FSStat '%s'.", source.c_str());
        return ERR_FILE_OPERATION;
    }
    const int64_t now = time(nullptr);
    errno = 0;  // not every failure of FSMKDir is one of the system
    if (FSMKDir(m_create_full_path, true, DESTINATION_OWNER, DESTINATION_GROUP) == 0) {
        if (FSUtime(m_create_full_path, now, info.exist ? info.full_mtime : now) < 0) {
            SLOG_WARN("Failed to change file atime and mtime '%s' for task '%llu', ignore",
                      m_create_full_path.c_str(), Llu(Task().task_id));
        }
        return ERR_SUCCESS;
    }
    const int error = errno;
    SLOG_ERR("Failed to create folder '%s' for task '%llu' [%s]", m_create_full_path.c_str(),
             Llu(Task().task_id), std::strerror(error));
    return error == ENOSPC ? ERR_DST_QUOTA_FULL : HandleDstTypeConflict();
}

int CreateHandler::HandleDstTypeConflict() {
    const std::string& path = m_create_full_path;
    FSInfo info;
    if (FSStat(path, info) < 0) {
        SLOG_ERR("Failed to FSStat '%s'.", path.c_str());
        return ERR_FILE_OPERATION;
    }
    if (!info.exist) {
        SLOG_ERR("Destination file does not exist '%s', should retry.", path.c_str());
        return ERR_FILE_OPERATION;
    }
    if (info.type == FS_TYPE_DIR) {
        SLOG_INFO("Folder can be merged '%s', ignore.", path.c_str());
        return ERR_SUCCESS;
    }
    // A moved file of another spelling may be the only one.
    const bool is_kept = IsSourceRemoved() && IsSpelledOtherwise(Task().dst_dir_path, path);
    return ClearTypeConflict(Task(), path, false, IsOverwritePolicy() && !is_kept);
}
