// Who is at the other end of a domain socket.
#pragma once

#include <sys/types.h>

// True when the process that connected may give orders to this one: it belongs to root or to the
// user of this process. The socket file itself is open to everybody. Logs a refusal.
[[nodiscard]] bool IsTrustedPeer(int descriptor);
// The rule alone.
[[nodiscard]] bool IsTrustedUser(uid_t peer, uid_t own);
