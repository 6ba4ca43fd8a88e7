#include "manual/command-tree.h"
#include "manual/completion.h"

namespace {

constexpr char HEAD[] = R"zsh(#compdef @PROGRAM@
# zsh completion for @PROGRAM@, made from the program's own commands

# The path behind "KEY=".
@FUNCTION@__value() {
    compset -P 1 '*='
    _files
}
)zsh";

// The table of "task list" begins each line with the id and the name, two blanks apart.
constexpr char TASKS[] = R"zsh(
# The ids of the tasks that there are, with their names. Silent, and soon back, whatever the daemon
# does.
@FUNCTION@__tasks() {
    local text
    local -a tasks
    for text in ${(f)"$(_call_program tasks timeout 2 ${(q)program} task list 2>/dev/null </dev/null)"}; do
        [[ $text == (#b)(<->)' '#(*) ]] && tasks+=("$match[1]:${match[2]%%  *}")
    done
    _describe -t tasks task tasks
}
)zsh";

constexpr char NO_TASKS[] = R"zsh(
@FUNCTION@__tasks() { _message task }
)zsh";

constexpr char TAIL[] = R"zsh(
if [[ $funcstack[1] == _@PROGRAM@ ]]; then
    _@PROGRAM@ "$@"
else
    compdef _@PROGRAM@ @PROGRAM@
fi
)zsh";

// A text within what zsh is told of an option or argument.
std::string SpecText(std::string text) {
    text = Replaced(std::move(text), "\\", "\\\\");
    for (const char* mark : {"[", "]", ":"}) text = Replaced(text, mark, std::string("\\") + mark);
    return Replaced(text, "\n", " ");
}

// What a value may be: "(a b c)".
std::string Action(const OptionInfo& option) {
    switch (OfferFor(option)) {
        case Offer::WORDS: {
            std::string words;
            for (const std::string& value : option.values) {
                words += (words.empty() ? "" : " ") + Replaced(value, " ", "\\ ");
            }
            return "(" + words + ")";
        }
        case Offer::TASKS:
            return "@FUNCTION@__tasks";
        case Offer::FILES:
            return option.value_name.find('=') == std::string::npos ? "_files"
                                                                    : "@FUNCTION@__value";
        case Offer::NOTHING:
            break;
    }
    return " ";  // says what is wanted, and offers nothing
}

std::string Joined(const std::vector<std::string>& words) {
    std::string text;
    for (const std::string& word : words) text += (text.empty() ? "" : " ") + word;
    return text;
}

// One for each name; an option that is there excludes its other names and what it says it excludes.
std::vector<std::string> OptionSpecs(const OptionInfo& option) {
    std::vector<std::string> excluded = option.excludes;
    if (!option.is_repeatable) {
        excluded.insert(excluded.end(), option.names.begin(), option.names.end());
    }
    std::vector<std::string> specs;
    for (const std::string& name : option.names) {
        std::string spec = excluded.empty() ? "" : "(" + Joined(excluded) + ")";
        if (option.is_repeatable) spec += "*";
        spec += name;
        if (option.HasValue()) spec += name.starts_with("--") ? "=" : "+";
        spec += "[" + SpecText(option.description) + "]";
        if (option.HasValue()) spec += ":" + SpecText(option.value_name) + ":" + Action(option);
        specs.push_back(spec);
    }
    return specs;
}

std::string ArgumentSpec(const OptionInfo& argument, size_t number) {
    std::string spec = argument.takes_many ? "*" : std::to_string(number);
    spec += argument.is_required || argument.takes_many ? ":" : "::";
    return spec + SpecText(argument.value_name) + ":" + Action(argument);
}

void WriteArguments(std::string& script, const CommandInfo& command) {
    std::vector<std::string> specs;
    for (const OptionInfo& option : command.options) {
        for (const std::string& spec : OptionSpecs(option)) specs.push_back(spec);
    }
    if (command.commands.empty()) {
        for (size_t i = 0; i < command.arguments.size(); ++i) {
            specs.push_back(ArgumentSpec(command.arguments[i], i + 1));
        }
    } else {
        specs.push_back("1:command:->command");
        specs.push_back("*::argument:->argument");
    }
    script += command.commands.empty() ? "    _arguments" : "    _arguments -C";
    for (const std::string& spec : specs) script += " \\\n        " + ShellQuoted(spec);
    script += "\n";
}

void WriteChoice(std::string& script, const CommandInfo& command) {
    script +=
        "    case $state in\n"
        "        command)\n"
        "            local -a below=(\n";
    for (const CommandInfo& below : command.commands) {
        const std::string text =
            Replaced(below.name, ":", "\\:") + ":" + Replaced(below.description, "\n", " ");
        script += "                " + ShellQuoted(text) + "\n";
    }
    script +=
        "            )\n"
        "            _describe -t commands command below\n"
        "            ;;\n"
        "        argument)\n"
        "            case $line[1] in\n";
    for (const CommandInfo& below : command.commands) {
        script += "                " + ShellQuoted(below.name) + ") " + FunctionName(below.path) +
                  " ;;\n";
    }
    script +=
        "            esac\n"
        "            ;;\n"
        "    esac\n";
}

void WriteFunction(std::string& script, const CommandInfo& command, bool is_program) {
    for (const CommandInfo& below : command.commands) WriteFunction(script, below, false);
    // The program's own has the name of the file, by which the shell finds it.
    script += "\n" + (is_program ? "_" + command.name : FunctionName(command.path)) + "() {\n";
    // As it was called, so that the tasks are asked of the same one.
    if (is_program) script += "    local program=$words[1]\n";
    if (command.commands.empty()) {
        WriteArguments(script, command);
    } else {
        script +=
            "    local curcontext=$curcontext state state_descr\n"
            "    local -a line\n"
            "    local -A opt_args\n";
        WriteArguments(script, command);
        WriteChoice(script, command);
    }
    script += "}\n";
}

}  // namespace

std::string ZshCompletion(const CommandInfo& program) {
    std::string script = HEAD;
    script += CanListTasks(program) ? TASKS : NO_TASKS;
    WriteFunction(script, program, true);
    script += TAIL;
    return Replaced(Replaced(script, "@FUNCTION@", FunctionName(program.name)), "@PROGRAM@",
                    program.name);
}
