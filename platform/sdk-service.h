// What the control side of the service asks the platform for: programs, the pid file, the box's own
// event log.
//
// Threads: any; each operation holds the lock of the layer for its platform call.
#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

namespace SDK {

using Arguments = std::vector<std::string>;

constexpr size_t MAX_PROGRAM_ARGUMENTS = 3;

// Runs a program and waits for its end. Its exit status, negative on failure.
[[nodiscard]] int RunProgram(const std::string& path, const Arguments& arguments);
// Starts a program and does not wait. 0, negative on failure.
[[nodiscard]] int StartProgram(const std::string& path, const Arguments& arguments);

// The number in a pid file: above 0, or negative.
[[nodiscard]] pid_t ReadPidFile(const std::string& path);
[[nodiscard]] bool FileExists(const std::string& path);

enum class BoxEvent { SERVICE_STARTED, SERVICE_STOPPED };
// Adds a line to the log that the owner of the box reads. Its result says nothing.
void AddBoxLog(BoxEvent event);

}  // namespace SDK
