// Runs programs for the platform: without a shell, without our descriptors, for a limited time.
// Threads: any.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace keld_host {

// No program may hold the daemon up for longer. It is killed, with the programs that it started in
// the same session, a little earlier, so that its end is seen in time.
constexpr int RUN_LIMIT_MS = 10000;

struct Program {
    std::string path;                    // absolute; also its own name, as its first argument
    std::vector<std::string> arguments;  // what follows that name
    // Added to the daemon's environment, or put in the place of what stands there.
    std::vector<std::pair<std::string, std::string>> environment;
};

// Runs and waits. The program is killed when the thread that waits for it ends, as the thread of a
// killed process does; what it has left in the background is not. Returns the exit status, 0 to
// 255; or negative with errno: ETIMEDOUT when it was killed for its time, ECANCELED when a signal
// ended it, else why it could not be started.
[[nodiscard]] int RunProgram(const Program& program, int limitMs = RUN_LIMIT_MS);

// Starts and does not wait. The program is a child of init. Returns 0, or negative with errno.
[[nodiscard]] int StartProgram(const Program& program);

// Runs each executable of a folder in the order of their names, one after the other; a failure of
// one is logged and does not keep the others from running. `program` holds all but the path.
// Programs that others than their owner could have put there or changed are refused.
// Returns how many failed; a missing folder is an empty one.
int RunFolder(const std::string& folder, Program program, int limitMs = RUN_LIMIT_MS);

}  // namespace keld_host
