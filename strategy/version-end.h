// What becomes of a version folder: it stays as a good version, or it gets the name of a bad one.
// One way for a run that was broken off, for one that the power or a kill ended, and for a version
// whose removal was broken off.
#pragma once

#include <string>

struct TaskRunInfo;

// Gives the folder its ".Bad" name. 0, or the result of the failed rename (logged).
[[nodiscard]] int MarkVersionBad(const TaskRunInfo& task, const std::string& path);

// The run has ended: its folder is on the disk and a good version.
void EndGoodVersion(const TaskRunInfo& task);
// The run was broken off, or its copies have not reached the disk. On the thread of the run.
void EndBadVersion(const TaskRunInfo& task);

// Settles what a killed daemon has left: the version that a run was filling. What cannot be reached
// at the moment stays on record. Only while no run of the task has begun to copy.
void SettleUnfinishedVersions(const TaskRunInfo& task);
// The same when the task is loaded, and the version whose removal was broken off as well. Not while
// a rotation of the task is under way.
void SettleVersionsAtLoad(const TaskRunInfo& task);
