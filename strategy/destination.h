// What copies and new folders have in common at the destination: their owner, and what becomes of
// an entry that is in the way. Threads: any.
#pragma once

#include <string>

struct TaskRunInfo;

// Owner and group of everything that is created.
inline constexpr int DESTINATION_OWNER = 1024;
inline constexpr int DESTINATION_GROUP = 100;

// Moves what is in the way aside under a name that tells the reason. Returns `code`, with which the
// event runs again; a failed rename shows in the log alone, and then in the next attempt.
[[nodiscard]] int RenameConflict(const std::string& path, const char* reason, int code);

// Clears the way of an entry of another type: removes what is there with the policy "overwrite"
// (through the recycle bin, and only while the roots of the task stand), else moves it aside.
// Returns "Destination file type conflict", with which the event runs again, or another code.
[[nodiscard]] int ClearTypeConflict(const TaskRunInfo& task, const std::string& path, bool is_dir,
                                    bool is_overwrite);

// Renames an entry to another spelling of its own name, where both find it. 0; -1 on failure, and
// the entry has its old name, or after a second failure one that the log tells.
[[nodiscard]] int RespellEntry(const std::string& from, const std::string& to);

// Whether something stands under the path that has another name in its folder, or lies in a folder
// that has: a file system that ignores case, or keeps short names, finds one file under several
// names. `root` is a folder above, whose own name is taken as it is. True also when that cannot be
// told. The folders are listed: not for every file.
[[nodiscard]] bool IsSpelledOtherwise(const std::string& root, const std::string& path);
