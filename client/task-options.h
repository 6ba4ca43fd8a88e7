// The settings of a task as command-line options: what "task add" and "task set" have in common.
#pragma once

#include <CLI/CLI.hpp>
#include <cstdint>
#include <optional>
#include <string>

class PObject;

// What was said; the rest is empty.
struct TaskOptions {
    std::string name;
    std::string conflict;  // "rename" or "overwrite"
    std::string rotation;  // "smart" or "oldest"
    std::optional<uint64_t> versions;
    std::optional<bool> keeps_all_versions;
    std::optional<bool> keeps_folders;
    std::optional<bool> uses_date_folders;
    std::optional<bool> renames;
    std::optional<bool> moves;
};

// Adds them to a command; `options` has to outlive it.
void AddTaskOptions(CLI::App& command, TaskOptions& options);

// Puts what was said into the request, under the keys of the daemon. Files that go into folders by
// date or get new names do not keep the folders of the source: the one turns the other off, and
// both at once are refused (CommandError, EXIT_USAGE). Who names a rotation wants one: it is
// switched on.
void SetTaskKeys(const TaskOptions& options, PObject& request);

// Refuses what a task of this strategy (CopyStrategy) would pass over in silence: CommandError,
// EXIT_USAGE.
void CheckStrategy(const TaskOptions& options, int strategy);

// A pair of options "--NAME" and "--no-NAME" that exclude each other.
void AddSwitch(CLI::App& command, const std::string& name, const std::string& opposite,
               std::optional<bool>& value, const std::string& description,
               const std::string& opposite_description);
