// The run of an incremental task: the base's run as it is.
#pragma once

#include "strategy/task-handler.h"

class IncBackupTaskHandler final : public TaskHandler {};
