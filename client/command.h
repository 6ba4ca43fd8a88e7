// The pieces that every command of a client program is put together from.
#pragma once

#include <CLI/CLI.hpp>
#include <string>

// A command below `parent`. Its help is the description, the options and the example; the manual
// page says the same, as it is made from this. A command without commands below it is told by
// `example` how it is used; `example` may hold several lines.
CLI::App* AddCommand(CLI::App& parent, const std::string& name, const std::string& description,
                     const std::string& example);
// The same for a command that only holds others: one of them has to be given.
CLI::App* AddCommandGroup(CLI::App& parent, const std::string& name, const std::string& description,
                          const std::string& example);
// The option "--json" that everything that reads has.
void AddJsonOption(CLI::App& command, bool& as_json);

// Parses the command line and runs the command. Returns the exit status; errors go to standard
// error with the program's name.
[[nodiscard]] int RunProgram(CLI::App& program, int argc, const char* const* argv);
