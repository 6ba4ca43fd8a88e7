// The copy of a file of a version task: lands at the event's path below the folder of the run.
#pragma once

#include "strategy/copy-handler.h"

class VersionCopyHandler final : public CopyHandler {
protected:
    [[nodiscard]] int SetCopyToFullPath() override;
};
