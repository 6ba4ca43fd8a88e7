// The copy of a file of a mirror task: lands at the event's own path.
#pragma once

#include "strategy/copy-handler.h"

class MirrorCopyHandler final : public CopyHandler {
protected:
    [[nodiscard]] int SetCopyToFullPath() override;
};
