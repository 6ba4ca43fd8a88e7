// Moves the repository's files to another volume.
//
// The daemon must not run. Killed or failed at any moment, the volume that the settings name holds
// a whole repository: they name the new volume once the copy there is complete and on the disk, and
// only then does the old one leave its place.
// Threads: one control program at a time.
#pragma once

#include <string>

// True when the repository lies on `to`, and the settings say so. What lies in its place there is
// kept in the folder "@tmp" of that volume. When the settings name `to` already, as after a move
// that was killed at its end, the repository there is the one in use: then what lies on `from` is
// kept aside on that volume instead.
// False (logged): the repository lies where the settings say, which is where they said before, or
// on `to` when the old one could not be put away whole. One folder under two names is refused.
[[nodiscard]] bool MoveRepoData(const std::string& from, const std::string& to);
