#include "strategy/copy-strategy-handler.h"

#include "db/task-info.h"
#include "strategy/copy-handler.h"
#include "strategy/create-handler.h"
#include "strategy/inc-backup-handler.h"
#include "strategy/mirror-handler.h"
#include "strategy/remove-handler.h"
#include "strategy/scan-handler.h"
#include "strategy/task-handler.h"
#include "strategy/version-handler.h"

CopyStrategyHandler::~CopyStrategyHandler() = default;

std::unique_ptr<TaskHandler> CopyStrategyHandler::GetTaskHandler() const { return nullptr; }

std::unique_ptr<ScanHandler> CopyStrategyHandler::GetScanHandler() const { return nullptr; }

std::unique_ptr<RemoveHandler> CopyStrategyHandler::GetRemoveHandler() const { return nullptr; }

std::unique_ptr<CreateHandler> CopyStrategyHandler::GetCreateHandler() const { return nullptr; }

std::unique_ptr<CopyHandler> CopyStrategyHandler::GetCopyHandler() const { return nullptr; }

std::unique_ptr<CopyStrategyHandler> CreateCopyStrategyHandler(int copy_strategy) {
    if (copy_strategy == COPY_STRATEGY_VERSION) return std::make_unique<VersionHandler>();
    if (copy_strategy == COPY_STRATEGY_MIRROR) return std::make_unique<MirrorHandler>();
    if (copy_strategy == COPY_STRATEGY_INCREMENTAL) return std::make_unique<IncBackupHandler>();
    return nullptr;
}
