// A version task never removes anything below the folder of its run: refuses every removal.
#pragma once

#include "strategy/remove-handler.h"

class VersionRemoveHandler final : public RemoveHandler {
protected:
    [[nodiscard]] int Remove() override;
};
