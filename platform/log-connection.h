// The connection to the log daemon: one datagram socket that stays open.
//
// Threads: every operation may be called from any thread. Lines of several threads that are sent at
// the same moment may arrive in either order.
#pragma once

#include <sys/uio.h>

#include <cstddef>

// Opens the connection if it is not open. Without it the first line does.
void LogConnectionOpen();
// Closes it; the next line opens it again.
void LogConnectionClose();
// Before the connection is opened: another socket than /dev/log, for tests.
void SetLogSocketForTest(const char* path);

// Sends each buffer as one datagram, in order. Lines are lost when there is no log daemon, or when
// one that is behind does not catch up within LOG_STALL_MS; after such a stall lines go out only if
// the log daemon takes them at once, for a few seconds. A line then tells how many were lost.
void LogConnectionSend(const iovec* lines, size_t count);

// The same for the handler of a crash signal: without taking a lock, and on an open connection
// only.
void LogConnectionSendInCrash(const iovec* lines, size_t count);
