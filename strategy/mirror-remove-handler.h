// The removal of an entry at the destination of a mirror task, through the recycle bin. Only while
// the device and the share of the task are there.
#pragma once

#include "strategy/remove-handler.h"

class MirrorRemoveHandler final : public RemoveHandler {
protected:
    [[nodiscard]] int Remove() override;
};
