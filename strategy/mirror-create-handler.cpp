#include "strategy/mirror-create-handler.h"

#include "strategy/mirror-path.h"
#include "utils/error-code.h"
#include "utils/log.h"

int MirrorCreateHandler::SetCreateFullPath() {
    m_create_full_path = MirrorGetDstFullPath(Task(), EventPath());
    SLOG_INFO("MirrorCreateHandler: SetCreateFullPath = %s", m_create_full_path.c_str());
    return ERR_SUCCESS;
}
