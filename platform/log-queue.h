// Lines on their way to the log daemon that may wait a little: one queue for all threads. Waking
// the reader is most of what a line costs, and the system call most of the rest, so many go in one
// call.
//
// Threads: every operation may be called from any thread.
#pragma once

#include <cstddef>

// Copies the line; false if it is too long for the queue. A full queue is sent by the caller first,
// so that a slow log daemon slows its writers down, and memory is bounded.
[[nodiscard]] bool LogQueuePut(const char* line, size_t size);

// Sends what is queued; when it returns, all lines that were queued before are sent or lost.
void LogQueueFlush();

// For the handler of a crash signal: sends what is queued without taking a lock.
void LogQueueSendInCrash();
