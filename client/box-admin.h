// What a program does to the box itself and not through the daemon: its shares, and the timetables
// that its scheduler keeps. An appliance whose own system manages these refuses all changes.
//
// Threads: belongs to one thread. Errors: CommandError, with a sentence that says what to do;
// EXIT_USAGE for a share that is not there or a name that cannot be one, else EXIT_REFUSED. Nothing
// has been changed then, unless the sentence says so. Tasks know shares by their names: telling the
// daemon, before and after, is the caller's part.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "client/timetable.h"

// Whether it can be told which shares there are: returns, or throws.
void CheckShares();

// The share is named by the last component of its path; a name alone stands for a folder of the
// only volume. The folder is made if it is missing. Returns the path.
std::string AddShare(const std::string& name_or_path);

// The files of a share are never removed; where a share is nothing but a folder, it has to be
// empty. Returns the path that was a share.
std::string RemoveShare(const std::string& name);
// Throws what RemoveShare would throw, as far as that can be told beforehand.
void CheckRemoveShare(const std::string& name);

// The folder keeps its place and gets the new name. Returns the new path.
std::string RenameShare(const std::string& name, const std::string& new_name);
void CheckRenameShare(const std::string& name, const std::string& new_name);

// The timetable of a task, by its "schedule_id"; none when there is no such entry, or it cannot be
// told.
[[nodiscard]] std::optional<Timetable> ReadTimetable(int64_t schedule_id);
