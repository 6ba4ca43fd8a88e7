// A share is renamed or removed, and the daemon is told before and after, as an appliance tells it:
// its tasks let go of the share before the change.
//
// Threads: belongs to one thread. Errors: CommandError. EXIT_NOT_REACHABLE when the daemon does not
// answer: the tasks could not be told, and so nothing is changed. Whenever something has been
// changed all the same, the text says what.
#pragma once

#include <string>

#include "client/daemon-client.h"

// Returns the new path. A run on the share ends, and the tasks follow to the new name; when the
// change fails they come back to the old one.
std::string RenameShareOfTasks(const DaemonClient& daemon, const std::string& name,
                               const std::string& new_name);

// Returns the path that was a share. Refused when a task uses it, unless `with_tasks`: the tasks
// are then removed before, and a task that comes with the box loses its share and is switched off.
std::string RemoveShareOfTasks(const DaemonClient& daemon, const std::string& name,
                               bool with_tasks);
