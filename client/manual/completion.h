// Makes the scripts that let a shell complete the words of a command line. Where a fixed set of
// words is known it is offered; for a task the ids that "task list" shows, if the program has that
// command; for anything else, but numbers, files.
#pragma once

#include <string>

struct CommandInfo;
struct OptionInfo;

[[nodiscard]] std::string BashCompletion(const CommandInfo& program);
[[nodiscard]] std::string ZshCompletion(const CommandInfo& program);

// What is offered for the value of an option or for an argument.
enum class Offer { NOTHING, WORDS, TASKS, FILES };
[[nodiscard]] Offer OfferFor(const OptionInfo& option);

// Whether the program can tell which tasks there are.
[[nodiscard]] bool CanListTasks(const CommandInfo& program);

// A text as one word of a shell.
[[nodiscard]] std::string ShellQuoted(const std::string& text);
// The name of a function: "_ferrixctl_task_list" for "ferrixctl task list".
[[nodiscard]] std::string FunctionName(const std::string& path);
// All places of `mark` in `text` replaced.
[[nodiscard]] std::string Replaced(std::string text, const std::string& mark,
                                   const std::string& replacement);
