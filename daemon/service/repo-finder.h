// Where the repository is when the service starts: on the volume of the settings, or on another
// that takes its place. Threads: one control program at a time.
#pragma once

#include <string>

// 1 with the volume, which is registered; 0 when no volume can be used; -1 (logged) when the
// volumes cannot be told, or a repository that is still there cannot be brought along: the settings
// name the volume that has it.
[[nodiscard]] int FindRepository(std::string& volume);
