#include "manual/command-tree.h"

#include <CLI/CLI.hpp>
#include <algorithm>

namespace {

constexpr char EXAMPLE_INDENT[] = "  ";

// "{a,b,c}" taken apart; nothing for any other text.
std::vector<std::string> SetMembers(const std::string& text) {
    if (text.size() < 2 || text.front() != '{' || text.back() != '}') return {};
    return CLI::detail::split(text.substr(1, text.size() - 2), ',');
}

std::vector<CLI::Validator*> Checks(CLI::Option& option) {
    std::vector<CLI::Validator*> checks;
    try {
        while (true) checks.push_back(option.get_validator(static_cast<int>(checks.size())));
    } catch (const CLI::OptionNotFound&) {  // there is no other way to learn their number
        return checks;
    }
}

// A check tells its set only in words: it counts when the check itself takes every member.
bool IsSet(const CLI::Validator& check, const std::vector<std::string>& members) {
    return !members.empty() &&
           std::all_of(members.begin(), members.end(),
                       [&check](const std::string& member) { return check(member).empty(); });
}

// The name of the type stands in front of what the checks tell: "TEXT:{a,b}".
void ReadValue(CLI::Option& option, OptionInfo& info) {
    size_t told_by_checks = 0;
    for (const CLI::Validator* check : Checks(option)) {
        const std::string text = check->get_description();
        if (text.empty()) continue;
        told_by_checks += 1 + text.size();
        const std::vector<std::string> members = SetMembers(text);
        if (info.values.empty() && IsSet(*check, members)) {
            info.values = members;
        } else {
            info.rules.push_back(text);
        }
    }
    info.value_name = option.get_type_name();
    info.value_name.resize(info.value_name.size() - told_by_checks);
    if (info.value_name.empty()) info.value_name = "VALUE";
}

std::vector<std::string> Labels(const std::set<CLI::Option*>& options) {
    std::vector<std::string> labels;
    labels.reserve(options.size());
    for (const CLI::Option* option : options) labels.push_back(option->get_name());
    std::sort(labels.begin(), labels.end());  // a set of pointers has no order of its own
    return labels;
}

OptionInfo ReadOption(CLI::Option& option) {
    OptionInfo info;
    for (const std::string& name : option.get_snames()) info.names.push_back("-" + name);
    for (const std::string& name : option.get_lnames()) info.names.push_back("--" + name);
    info.label = option.get_name();
    info.description = option.get_description();
    info.default_text = option.get_default_str();
    info.needs = Labels(option.get_needs());
    info.excludes = Labels(option.get_excludes());
    info.is_required = option.get_required();
    if (option.get_items_expected_max() == 0) return info;  // a flag
    ReadValue(option, info);
    info.is_repeatable = option.get_items_expected_max() > 1;
    info.takes_many = info.is_repeatable && option.get_allow_extra_args();
    return info;
}

// An argument's own name stands for its value.
OptionInfo ReadArgument(CLI::Option& option) {
    OptionInfo info = ReadOption(option);
    info.names.clear();
    info.label = info.value_name = option.get_name(true);
    info.takes_many = info.is_repeatable;
    return info;
}

void ReadFooter(const std::string& footer, CommandInfo& command) {
    for (const std::string& line : CLI::detail::split(footer, '\n')) {
        if (line.starts_with(EXAMPLE_INDENT)) {
            command.examples.push_back(line.substr(std::size(EXAMPLE_INDENT) - 1));
        } else if (line != "Example:" && !line.empty()) {
            command.notes.push_back(line);
        }
    }
}

void ReadInto(CLI::App& app, CommandInfo& command) {
    for (CLI::Option* option : app.get_options()) {
        if (option->get_group().empty()) continue;  // hidden
        if (option->get_positional()) command.arguments.push_back(ReadArgument(*option));
        if (option->nonpositional()) command.options.push_back(ReadOption(*option));
    }
    for (CLI::App* below : app.get_subcommands([](CLI::App*) { return true; })) {
        if (below->get_group().empty() || below->get_disabled()) continue;
        if (below->get_name().empty()) {  // a group of options, no command
            ReadInto(*below, command);
            continue;
        }
        CommandInfo inner;
        inner.name = below->get_name();
        inner.path = command.path + " " + inner.name;
        inner.description = below->get_description();
        ReadFooter(below->get_footer(), inner);
        ReadInto(*below, inner);
        command.commands.push_back(std::move(inner));
    }
}

}  // namespace

CommandInfo ReadCommandTree(CLI::App& program) {
    CommandInfo command;
    command.name = program.get_name();
    command.path = command.name;
    command.description = program.get_description();
    ReadFooter(program.get_footer(), command);
    ReadInto(program, command);
    return command;
}

const CommandInfo* FindCommand(const CommandInfo& program, const std::vector<std::string>& words) {
    const CommandInfo* found = &program;
    for (const std::string& word : words) {
        const CommandInfo* next = nullptr;
        for (const CommandInfo& command : found->commands) {
            if (command.name == word) next = &command;
        }
        if (next == nullptr) return nullptr;
        found = next;
    }
    return found;
}
