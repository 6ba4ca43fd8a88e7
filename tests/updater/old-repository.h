// A repository as the release with version 1 wrote it, in a scratch folder, with its content known:
//
//   device 1 "uuid-one"   task 1 "Mirror" (mirror), task 2 "It's 100%" (incremental)
//   device 2 "uuid-two"   task 4 "Photos" (incremental); task 9 was removed
#pragma once

#include <string>
#include <vector>

// Fails the running test when a file cannot be written.
void MakeOldRepository(const std::string& repository);

// Everything in the task database, and in the database of a task: the schema and the rows as text.
// The file is not changed by asking.
std::string DumpDatabase(const std::string& path);
// The databases of the repository, by their path in it.
std::vector<std::string> DatabasesOf(const std::string& repository);
// All files of a folder, relative and sorted.
std::vector<std::string> FilesIn(const std::string& folder);
