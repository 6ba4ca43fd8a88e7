#include "strategy/remove-handler.h"

#include "utils/error-code.h"
#include "utils/log.h"

int RemoveHandler::Handle() {
    if (const int result = CheckTaskFilter(); result < 0) return result;
    const int result = Remove();
    if (result >= 0) return ERR_SUCCESS;
    SLOG_ERR("RemoveHandler: Failed to remove '%s', is_dir '%d'", EventPath().c_str(),
             IsDirEvent());
    return result;
}
