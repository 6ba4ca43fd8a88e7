// The six lists of a task's filter: what is copied, and what is not.
#pragma once

#include <CLI/CLI.hpp>
#include <string>
#include <vector>

class PObject;

// What a command line says about a filter.
struct FilterOptions {
    std::vector<std::string> exclude_names;
    std::vector<std::string> exclude_extensions;
    std::vector<std::string> only_names;
    std::vector<std::string> only_extensions;

    [[nodiscard]] bool IsEmpty() const;
};

// The options "--exclude" and the others that fill `options`, which has to outlive the command.
void AddFilterOptions(CLI::App& command, FilterOptions& options);

// Puts all six lists into the request of a command. A filter that names nothing to copy copies all.
// EXIT_USAGE (CommandError) for a name with "/" in it, which could never match.
void SetFilterLists(const FilterOptions& options, PObject& request);
