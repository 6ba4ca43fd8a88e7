// Waiting for a descriptor.
#pragma once

#include <sys/time.h>

// Waits until the descriptor can be read or written, or something is wrong with it.
// 1: ready; 0: timeout, or a wake without a cause; -1: failure, in errno (EINTR: a signal).
[[nodiscard]] int WaitReady(int descriptor, bool for_writing, const timeval& timeout);

// The same, signals passed over: they do not lengthen the wait.
[[nodiscard]] int WaitDespiteSignals(int descriptor, bool for_writing, const timeval& timeout);

// The same for a transport of Channel: 0 when it is ready, else, logged, ERR_CONNECTION_TIMEOUT or
// ERR_IO.
[[nodiscard]] int WaitForSocket(int descriptor, bool for_writing, const timeval& timeout);
