// Whether both roots of a task still stand where they stood when it was loaded. Nothing is removed
// on the word of a folder that lists empty because its device is gone: asked after a listing and
// before what follows from it, and again before each removal.
//
// Threads: any. The device is asked for itself (by its identity), the share for being mounted.
#pragma once

struct TaskRunInfo;

// 0; "Source root folder is miss" or "Destination root folder is miss" when the device, or the
// folder on the source side, is gone; "Share not mounted" when the share is. Logged.
[[nodiscard]] int CheckTaskRoots(const TaskRunInfo& task);

// The same for the destination's side alone, whatever has become of the source: 0, "Destination
// root folder is miss" or "Share not mounted". Asked after a flush, and where only the destination
// matters: the first root that is missing says nothing about the other.
[[nodiscard]] int CheckTaskDestination(const TaskRunInfo& task);
