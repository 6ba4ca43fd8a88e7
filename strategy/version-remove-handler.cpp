#include "strategy/version-remove-handler.h"

#include "utils/error-code.h"
#include "utils/log.h"

int VersionRemoveHandler::Remove() {
    SLOG_CRIT("Shall not happen! Ignore current event");
    return ERR_IGNORE;
}
