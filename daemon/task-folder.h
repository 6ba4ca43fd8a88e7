// Where a task keeps its files: a folder of its own in the repository, named by the task's id.
//
// Threads: any. The repository's volume is read from the settings at each call; while it is not
// known every path is empty, so that nothing is made or removed in a wrong place.
#pragma once

#include <cstdint>
#include <string>

[[nodiscard]] std::string TaskFolderPath(uint64_t task_id);
// Makes the task's folder and those that it lies in, writable by their owner alone. 0 or -1.
[[nodiscard]] int MakeTaskFolder(uint64_t task_id);
// What the user named himself; for the client's display alone.
[[nodiscard]] std::string UserConfigPath(uint64_t task_id);
// What an incremental task has copied.
[[nodiscard]] std::string FileDBPath(uint64_t task_id);
// The lists that the task's filter applies.
[[nodiscard]] std::string BlackListPath(uint64_t task_id);
[[nodiscard]] std::string WhiteListPath(uint64_t task_id);

// True for a folder of a task that cannot lead out of what it is a folder of: empty, or with a
// leading "/" and without a component "..". Symbolic links are the file layer's to refuse.
[[nodiscard]] bool IsInnerFolder(const std::string& folder);
