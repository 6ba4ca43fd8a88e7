// The mirror strategy: makes the destination folder equal to the source. What is new or changed is
// copied, what has gone is removed, through the recycle bin where the share has one.
#pragma once

#include "strategy/copy-strategy-handler.h"

class MirrorHandler final : public CopyStrategyHandler {
public:
    ~MirrorHandler() override;

    [[nodiscard]] std::unique_ptr<TaskHandler> GetTaskHandler() const override;
    [[nodiscard]] std::unique_ptr<ScanHandler> GetScanHandler() const override;
    [[nodiscard]] std::unique_ptr<RemoveHandler> GetRemoveHandler() const override;
    [[nodiscard]] std::unique_ptr<CreateHandler> GetCreateHandler() const override;
    [[nodiscard]] std::unique_ptr<CopyHandler> GetCopyHandler() const override;
};
