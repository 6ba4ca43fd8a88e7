#include "strategy/version-handler.h"

#include "strategy/version-copy-handler.h"
#include "strategy/version-create-handler.h"
#include "strategy/version-remove-handler.h"
#include "strategy/version-scan-handler.h"
#include "strategy/version-task-handler.h"

VersionHandler::~VersionHandler() = default;

std::unique_ptr<TaskHandler> VersionHandler::GetTaskHandler() const {
    return std::make_unique<VersionTaskHandler>();
}

std::unique_ptr<ScanHandler> VersionHandler::GetScanHandler() const {
    return std::make_unique<VersionScanHandler>();
}

std::unique_ptr<RemoveHandler> VersionHandler::GetRemoveHandler() const {
    return std::make_unique<VersionRemoveHandler>();
}

std::unique_ptr<CreateHandler> VersionHandler::GetCreateHandler() const {
    return std::make_unique<VersionCreateHandler>();
}

std::unique_ptr<CopyHandler> VersionHandler::GetCopyHandler() const {
    return std::make_unique<VersionCopyHandler>();
}
