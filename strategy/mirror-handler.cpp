#include "strategy/mirror-handler.h"

#include "strategy/mirror-copy-handler.h"
#include "strategy/mirror-create-handler.h"
#include "strategy/mirror-remove-handler.h"
#include "strategy/mirror-scan-handler.h"
#include "strategy/mirror-task-handler.h"

MirrorHandler::~MirrorHandler() = default;

std::unique_ptr<TaskHandler> MirrorHandler::GetTaskHandler() const {
    return std::make_unique<MirrorTaskHandler>();
}

std::unique_ptr<ScanHandler> MirrorHandler::GetScanHandler() const {
    return std::make_unique<MirrorScanHandler>();
}

std::unique_ptr<RemoveHandler> MirrorHandler::GetRemoveHandler() const {
    return std::make_unique<MirrorRemoveHandler>();
}

std::unique_ptr<CreateHandler> MirrorHandler::GetCreateHandler() const {
    return std::make_unique<MirrorCreateHandler>();
}

std::unique_ptr<CopyHandler> MirrorHandler::GetCopyHandler() const {
    return std::make_unique<MirrorCopyHandler>();
}
