// The shell of a removal event: what a removal means is left to each strategy. An entry that the
// task's filter refuses stays where it is.
#pragma once

#include "strategy/file-event-handler.h"

class RemoveHandler : public FileEventHandler {
public:
    // Returns 0 or a negative ErrorCode; "Ignore this error" for an entry that the filter refuses.
    [[nodiscard]] int Handle();

protected:
    [[nodiscard]] virtual int Remove() = 0;
};
