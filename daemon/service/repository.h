// The repository: the folder "@Ferrix" of a volume, with the databases and a folder for each task.
// Threads: one control program at a time. Failures are logged.
#pragma once

#include <string>

// The repository's folder on a volume.
[[nodiscard]] std::string RepositoryPath(const std::string& volume);

// Makes the repository's folders, writable by their owner alone; what is there stays. The volume's
// own folder is never made. 0 or -1.
[[nodiscard]] int MakeRepo(const std::string& volume);

// False (logged) for a path that is longer than the settings can hold.
[[nodiscard]] bool CanBeRegistered(const std::string& volume);

// Names the volume as the repository's, in the settings and for the package manager; an empty path
// names none. 0 or -1: the settings, which count, may have been written.
[[nodiscard]] int RegisterVolume(const std::string& volume);
// Writes the package manager's list anew where it names another volume than the settings do: a
// control program may have been killed between the two.
void UpdateVolumeList(const std::string& volume);
