// The creation of a folder of a version task: lands at the event's path below the folder of the
// run.
#pragma once

#include "strategy/create-handler.h"

class VersionCreateHandler final : public CreateHandler {
protected:
    [[nodiscard]] int SetCreateFullPath() override;
};
