// What a program understands on its command line, as plain data. Pages and completions are made
// from this; the library that parses command lines is known to command-tree.cpp alone.
#pragma once

#include <string>
#include <vector>

namespace CLI {
class App;
}

// An option, or an argument, which has no names.
struct OptionInfo {
    std::vector<std::string> names;  // "-h", "--help"
    std::string label;               // the most telling name; of an argument what stands for it
    std::string value_name;          // "TYPE"; empty for an option without a value
    std::string description;
    std::string default_text;           // empty: none is told
    std::vector<std::string> values;    // all that can be given; empty: no fixed set
    std::vector<std::string> rules;     // what else is checked: "INT in [1 - 5]"
    std::vector<std::string> needs;     // labels of others
    std::vector<std::string> excludes;  // labels of others
    bool is_required = false;
    bool is_repeatable = false;  // may be given more than once
    bool takes_many = false;     // takes all words up to the next option

    [[nodiscard]] bool HasValue() const { return !value_name.empty(); }
};

// A program, or a command of it.
struct CommandInfo {
    std::string path;  // "ferrixctl task add"
    std::string name;  // "add"
    std::string description;
    std::vector<std::string> notes;     // lines below its help that are no examples
    std::vector<std::string> examples;  // lines
    std::vector<OptionInfo> options;
    std::vector<OptionInfo> arguments;  // in their order
    std::vector<CommandInfo> commands;
};

// Everything that "--help" shows, in its order; what is hidden there is left out.
[[nodiscard]] CommandInfo ReadCommandTree(CLI::App& program);

// The command at these words below `program`, or null: {"task", "list"}.
[[nodiscard]] const CommandInfo* FindCommand(const CommandInfo& program,
                                             const std::vector<std::string>& words);
