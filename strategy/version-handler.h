// The version strategy: each run makes a complete copy of the source in a new dated folder; old
// versions are thinned by rotation (strategy/rotation-handler.h).
#pragma once

#include "strategy/copy-strategy-handler.h"

class VersionHandler final : public CopyStrategyHandler {
public:
    ~VersionHandler() override;

    [[nodiscard]] std::unique_ptr<TaskHandler> GetTaskHandler() const override;
    [[nodiscard]] std::unique_ptr<ScanHandler> GetScanHandler() const override;
    [[nodiscard]] std::unique_ptr<RemoveHandler> GetRemoveHandler() const override;
    [[nodiscard]] std::unique_ptr<CreateHandler> GetCreateHandler() const override;
    [[nodiscard]] std::unique_ptr<CopyHandler> GetCopyHandler() const override;
};
