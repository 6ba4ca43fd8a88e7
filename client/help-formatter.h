// How "--help" looks: no line is wider than a terminal, and lists of commands show the first
// sentence of each.
#pragma once

#include <CLI/CLI.hpp>

// Sets it for the program and all its commands.
void UseHelpFormatter(CLI::App& program);
