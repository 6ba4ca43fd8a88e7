// The run of a version task: makes the folder of the run, and leaves a mark of it until the run has
// ended, so that a run that is killed leaves no folder that looks like a good version.
#pragma once

#include "strategy/task-handler.h"

class VersionTaskHandler : public TaskHandler {
protected:
    [[nodiscard]] int PreHandle() override;
};
