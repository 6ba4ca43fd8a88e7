// Flushes the destination of a run, through one descriptor that is open from before its first copy.
//
// The system tells an error of writing back to those who have the file system open, and to one who
// opens it later only as long as nobody has been told. So a flush through a fresh descriptor may be
// good although bytes that it should cover are lost: another task on the same disk was told.
//
// Threads: the functions may be called from any thread; the lock inside is a leaf, not held while
// the disk is waited for.
#pragma once

#include <cstdint>

struct TaskRunInfo;

// While one lives, the flushes of its task go through its descriptor: one for each run.
class DestinationFlush {
public:
    // Opens the destination, or the nearest folder above it as long as it has not been made.
    explicit DestinationFlush(const TaskRunInfo& task);
    // The descriptor must not outlive the run: it holds a device that is to be unmounted.
    ~DestinationFlush();
    DestinationFlush(const DestinationFlush&) = delete;
    DestinationFlush& operator=(const DestinationFlush&) = delete;

private:
    const uint64_t m_task_id;
};

// Flushes the file system of the destination. 0; -1 on failure (logged). A flush that is reported
// good says nothing when the destination is gone.
[[nodiscard]] int FlushDestination(const TaskRunInfo& task);
