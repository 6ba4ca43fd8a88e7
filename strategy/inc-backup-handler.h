// The incremental strategy: copies what its file database has not seen, under names that may be
// built from the time of a file, and removes nothing at the destination.
#pragma once

#include "strategy/copy-strategy-handler.h"

class IncBackupHandler final : public CopyStrategyHandler {
public:
    ~IncBackupHandler() override;

    [[nodiscard]] std::unique_ptr<TaskHandler> GetTaskHandler() const override;
    [[nodiscard]] std::unique_ptr<ScanHandler> GetScanHandler() const override;
    [[nodiscard]] std::unique_ptr<RemoveHandler> GetRemoveHandler() const override;
    [[nodiscard]] std::unique_ptr<CreateHandler> GetCreateHandler() const override;
    [[nodiscard]] std::unique_ptr<CopyHandler> GetCopyHandler() const override;
};
