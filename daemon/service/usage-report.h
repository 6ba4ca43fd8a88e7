// The usage report of the appliance: how many devices and tasks there are, and how they are set.
// It holds no names of tasks, folders or shares.
#pragma once

// Prints the report to standard output. 0 or -1 (logged, and nothing printed), as when there is no
// repository yet. Waits for the operation of another control program, since an upgrade puts another
// database in place of the one that it would read; the daemon may run.
[[nodiscard]] int PrintUsageReport();
