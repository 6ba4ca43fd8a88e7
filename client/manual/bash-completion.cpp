#include "manual/command-tree.h"
#include "manual/completion.h"

namespace {

// Two tables, written from the tree, and this walk through the words, the same for all programs.
// Bash takes a word apart at "=" and ":" before it asks, so the walk puts it together again; what
// is answered is only the part behind them. Names of files are left to bash, which knows how to
// quote.
constexpr char WALK[] = R"bash(
@FUNCTION@() {
    local commands options arguments endless kind values many
    local level='@PROGRAM@' option='' ending='' glue='' before='' current='' place='' word
    local -i argument=0
    local -a line=() offers=()
    local IFS=$' \t\n'
    COMPREPLY=()

    for word in "${COMP_WORDS[@]:0:COMP_CWORD+1}"; do
        if [[ ${#line[@]} -gt 1 && ( -n $glue || $word =~ ^[=:]+$ ) ]]; then
            line[${#line[@]}-1]+=$word
        else
            line+=("$word")
        fi
        glue=''
        [[ $word =~ ^[=:]+$ ]] && glue=1
    done
    current=${line[${#line[@]}-1]}
    word=${COMP_WORDS[COMP_CWORD]}
    [[ -n $glue ]] && word=''
    before=${current:0:${#current}-${#word}}

    @FUNCTION@__level "$level"
    for word in "${line[@]:1:${#line[@]}-2}"; do
        if [[ -n $option && ( -z $many || $word != -* ) ]]; then
            [[ -n $many ]] || option=''
        elif [[ -z $ending && $word == -- ]]; then
            ending=1 option=''
        elif [[ -z $ending && $word == -* ]]; then
            @FUNCTION@__place "$level ${word%%=*}"
            option=''
            [[ -n $kind && ( -n $many || $word != *=* ) ]] && option=${word%%=*}
        elif [[ " $commands " == *" $word "* ]]; then
            level+=" $word"
            argument=0
            @FUNCTION@__level "$level"
        else
            argument+=1
        fi
    done

    word=''
    if [[ -n $option && ( -z $many || $current != -* ) ]]; then
        place="$level $option"
    elif [[ -z $ending && $current == --*=* ]]; then
        place="$level ${current%%=*}"
        word="${current%%=*}="
        current=${current#*=}
    elif [[ -z $ending && $current == -* ]]; then
        read -r -a offers <<<"$options"
    elif [[ -n $commands ]]; then
        read -r -a offers <<<"$commands"
    else
        argument+=1
        [[ -n $endless && argument -gt arguments ]] && argument=arguments
        place="$level $argument"
    fi
    if [[ -n $place ]]; then
        @FUNCTION@__place "$place"
        case $kind in
            words) read -r -a offers <<<"$values" ;;
            tasks) @FUNCTION@__tasks ;;
            files) compopt -o bashdefault -o default 2>/dev/null ;;
        esac
    fi
    for option in "${offers[@]}"; do
        [[ $option == "$current"* ]] || continue
        option=$word$option
        COMPREPLY+=("${option#"$before"}")
    done
}
complete -F @FUNCTION@ @PROGRAM@
)bash";

constexpr char TASKS[] = R"bash(
# The ids of the tasks that there are. Silent, and soon back, whatever the daemon does.
@FUNCTION@__tasks() {
    local id rest
    while read -r id rest; do
        [[ $id =~ ^[0-9]+$ ]] && offers+=("$id")
    done < <(timeout 2 "${COMP_WORDS[0]}" task list 2>/dev/null </dev/null)
}
)bash";

constexpr char NO_TASKS[] = R"bash(
@FUNCTION@__tasks() { :; }
)bash";

std::string Words(const std::vector<std::string>& words) {
    std::string text;
    for (const std::string& word : words) text += (text.empty() ? "" : " ") + word;
    return ShellQuoted(text);
}

void WriteLevel(std::string& script, const CommandInfo& command) {
    std::vector<std::string> commands;
    for (const CommandInfo& below : command.commands) commands.push_back(below.name);
    std::vector<std::string> options;
    for (const OptionInfo& option : command.options) {
        options.insert(options.end(), option.names.begin(), option.names.end());
    }
    script += "        " + ShellQuoted(command.path) + ")\n";
    if (!commands.empty()) script += "            commands=" + Words(commands) + "\n";
    script += "            options=" + Words(options) + "\n";
    if (!command.arguments.empty()) {
        script += "            arguments=" + std::to_string(command.arguments.size());
        script += command.arguments.back().takes_many ? " endless=1\n" : "\n";
    }
    script += "            ;;\n";
    for (const CommandInfo& below : command.commands) WriteLevel(script, below);
}

const char* KindWord(Offer offer) {
    switch (offer) {
        case Offer::WORDS:
            return "words";
        case Offer::TASKS:
            return "tasks";
        case Offer::FILES:
            return "files";
        case Offer::NOTHING:
            break;
    }
    return "nothing";
}

void WritePlace(std::string& script, const std::string& places, const OptionInfo& option) {
    script += "        " + places + ")\n            kind=" + KindWord(OfferFor(option));
    if (option.takes_many && !option.names.empty()) script += " many=1";
    if (!option.values.empty()) script += "\n            values=" + Words(option.values);
    script += "\n            ;;\n";
}

void WritePlaces(std::string& script, const CommandInfo& command) {
    for (const OptionInfo& option : command.options) {
        if (!option.HasValue()) continue;
        std::string places;
        for (const std::string& name : option.names) {
            places += (places.empty() ? "" : " | ") + ShellQuoted(command.path + " " + name);
        }
        WritePlace(script, places, option);
    }
    for (size_t i = 0; i < command.arguments.size(); ++i) {
        WritePlace(script, ShellQuoted(command.path + " " + std::to_string(i + 1)),
                   command.arguments[i]);
    }
    for (const CommandInfo& below : command.commands) WritePlaces(script, below);
}

}  // namespace

std::string BashCompletion(const CommandInfo& program) {
    std::string script =
        "# bash completion for @PROGRAM@, made from the program's own commands\n\n"
        "# What can stand on a level.\n"
        "@FUNCTION@__level() {\n"
        "    commands='' options='' arguments=0 endless=''\n"
        "    case $1 in\n";
    WriteLevel(script, program);
    script +=
        "    esac\n}\n\n"
        "# What can stand behind an option of a level, or as an argument of it.\n"
        "@FUNCTION@__place() {\n"
        "    kind='' values='' many=''\n"
        "    case $1 in\n";
    WritePlaces(script, program);
    script += "    esac\n}\n";
    script += CanListTasks(program) ? TASKS : NO_TASKS;
    script += WALK;
    return Replaced(Replaced(script, "@FUNCTION@", FunctionName(program.name)), "@PROGRAM@",
                    program.name);
}
