// The run of a mirror task: the base's run as it is.
#pragma once

#include "strategy/task-handler.h"

class MirrorTaskHandler final : public TaskHandler {};
