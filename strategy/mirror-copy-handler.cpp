#include "strategy/mirror-copy-handler.h"

#include "strategy/mirror-path.h"
#include "utils/error-code.h"
#include "utils/log.h"

int MirrorCopyHandler::SetCopyToFullPath() {
    m_copy_to_full_path = MirrorGetDstFullPath(Task(), EventPath());
    SLOG_INFO("MirrorCopyHandler: SetCopyToFullPath = %s", m_copy_to_full_path.c_str());
    return ERR_SUCCESS;
}
