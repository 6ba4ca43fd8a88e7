// The libraries that a control program stands on report failures in the log. The person at the
// terminal sees them too.
#pragma once

// From now on log lines of this process go to the system log as before, under the program's name
// (a literal), and the errors among them to standard error as well.
void ErrorsToStderr(const char* program);
