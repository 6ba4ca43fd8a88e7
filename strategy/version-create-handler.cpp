#include "strategy/version-create-handler.h"

#include "strategy/version-path.h"
#include "utils/error-code.h"
#include "utils/log.h"

int VersionCreateHandler::SetCreateFullPath() {
    m_create_full_path = VersionGetDstFullPath(Task(), EventPath());
    SLOG_INFO("VersionCreateHandler: SetCreateFullPath = %s", m_create_full_path.c_str());
    return ERR_SUCCESS;
}
