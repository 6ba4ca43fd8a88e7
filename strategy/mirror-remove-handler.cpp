#include "strategy/mirror-remove-handler.h"

#include "strategy/file-event-context.h"
#include "strategy/recycle-bin.h"
#include "strategy/root-check.h"
#include "utils/error-code.h"
#include "utils/log.h"

int MirrorRemoveHandler::Remove() {
    const std::string& path = Context().dst_full_path;
    SLOG_INFO("MirrorRemoveHandler: remove path '%s', [task: %llu]", path.c_str(),
              Llu(Task().task_id));
    if (const int result = CheckTaskRoots(Task()); result < 0) return result;
    if (RecycleBin().RemoveFile(path, IsDirEvent()) == 0) return ERR_SUCCESS;
    SLOG_ERR("Failed to remove file '%s'", path.c_str());
    return ERR_FILE_OPERATION;
}
