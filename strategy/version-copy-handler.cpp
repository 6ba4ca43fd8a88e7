#include "strategy/version-copy-handler.h"

#include "strategy/version-path.h"
#include "utils/error-code.h"
#include "utils/log.h"

int VersionCopyHandler::SetCopyToFullPath() {
    m_copy_to_full_path = VersionGetDstFullPath(Task(), EventPath());
    SLOG_INFO("VersionCopyHandler: SetCopyToFullPath = %s", m_copy_to_full_path.c_str());
    return ERR_SUCCESS;
}
