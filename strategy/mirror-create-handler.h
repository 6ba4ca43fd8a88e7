// The creation of a folder of a mirror task: lands at the event's own path.
#pragma once

#include "strategy/create-handler.h"

class MirrorCreateHandler final : public CreateHandler {
protected:
    [[nodiscard]] int SetCreateFullPath() override;
};
