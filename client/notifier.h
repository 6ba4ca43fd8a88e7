// ferrix-notifier: what other services of the box call. The scheduler runs a task with it, and a
// mount service or a share service tells the daemon what happens. It says nothing when all went
// well.
#pragma once

#include <CLI/CLI.hpp>
#include <memory>

class DaemonClient;

// The program, ready to be run. `daemon` has to outlive the result.
[[nodiscard]] std::unique_ptr<CLI::App> MakeNotifierProgram(const DaemonClient& daemon);
