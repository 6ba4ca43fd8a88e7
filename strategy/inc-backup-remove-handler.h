// The removal of an incremental task: forgets an entry and what lies below it. The copies stay.
#pragma once

#include "strategy/remove-handler.h"

class IncBackupRemoveHandler final : public RemoveHandler {
protected:
    [[nodiscard]] int Remove() override;
};
