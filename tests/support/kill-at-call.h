// Kills a piece of work at a system call of one's choice, as a crash would.
//
// Counted are the calls that can change something on the disk: killed at any other call, the work
// leaves what it leaves at the next one of these.
//
// The work runs in a child that is traced; the child has one thread, so no other thread of the test
// may hold a lock that the work needs.
#pragma once

#include <functional>

enum class KillResult { KILLED, DONE, FAILED, CANNOT_TRACE };

// Kills the child when it enters its nth such call (1 is the first): that call is not made. DONE
// when the work ended before, FAILED when it then had another result than 0.
[[nodiscard]] KillResult KillAtCall(int nth, const std::function<int()>& work);
