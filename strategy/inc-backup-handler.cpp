#include "strategy/inc-backup-handler.h"

#include "strategy/inc-backup-copy-handler.h"
#include "strategy/inc-backup-create-handler.h"
#include "strategy/inc-backup-remove-handler.h"
#include "strategy/inc-backup-scan-handler.h"
#include "strategy/inc-backup-task-handler.h"

IncBackupHandler::~IncBackupHandler() = default;

std::unique_ptr<TaskHandler> IncBackupHandler::GetTaskHandler() const {
    return std::make_unique<IncBackupTaskHandler>();
}

std::unique_ptr<ScanHandler> IncBackupHandler::GetScanHandler() const {
    return std::make_unique<IncBackupScanHandler>();
}

std::unique_ptr<RemoveHandler> IncBackupHandler::GetRemoveHandler() const {
    return std::make_unique<IncBackupRemoveHandler>();
}

std::unique_ptr<CreateHandler> IncBackupHandler::GetCreateHandler() const {
    return std::make_unique<IncBackupCreateHandler>();
}

std::unique_ptr<CopyHandler> IncBackupHandler::GetCopyHandler() const {
    return std::make_unique<IncBackupCopyHandler>();
}
